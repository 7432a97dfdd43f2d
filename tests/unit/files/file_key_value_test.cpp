// Files of "key=value" lines: the template File::Read<K, V> and File::toType.
#include <orvadrcore/file.h>

#include <gmock/gmock.h>
#include <sys/stat.h>

#include <cfloat>
#include <climits>
#include <cstdint>
#include <map>
#include <random>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "support/fakes/global_locale.h"
#include "support/fakes/syscall_faults.h"
#include "support/fixtures/log_capture.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"

namespace {

using OrvaDRCore::File;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;

template <class Value>
using Pairs = std::map<std::string, Value>;

// What a stream reads from a text in the current locale.
template <class Value>
Value Extracted(const std::string& text)
{
    Value value{};
    std::istringstream(text) >> value;
    return value;
}

class FileKeyValueTest : public LoggedTest {
  protected:
    FileKeyValueTest() : LoggedTest("file.cpp") {}

    // Reads a file of this content into a map that is not empty.
    template <class Value>
    Pairs<Value> Read(const std::string& content)
    {
        WriteFile(path, content);
        Pairs<Value> pairs{{"old", Value{}}};
        const int count = File::Read(path, pairs);
        EXPECT_EQ(count, static_cast<int>(pairs.size()));
        return pairs;
    }

    LogLine NotParsed(const std::string& line) const
    {
        return Notice("Read", "Failed to parse line[" + line + "] from file [" + path + "]");
    }

    static LogLine NoSeparator(const std::string& line)
    {
        return Notice("parseLineKeyValue", "Cannot find separator[=] in line[" + line + "]");
    }

    TempDir dir;
    SyscallFaults faults;
    std::string path = dir.File("limits.conf");
};

// Numbers are read from the beginning of the text, as streams do.
template <class Value>
struct NumberRow {
    const char* text;
    Value value;
};

// ------------------------------------------------------------------------------------------- lines

TEST_F(FileKeyValueTest, TheFirstLineWithAKeyCounts)
{
    EXPECT_THAT(Read<std::string>("a=1\nb=2\na=3\n"), ElementsAre(Pair("a", "1"), Pair("b", "2")));
    EXPECT_THAT(Read<int>("a=1\nb=2\na=3\n"), ElementsAre(Pair("a", 1), Pair("b", 2)));
    EXPECT_THAT(Read<double>("a=1\nb=2\na=3\n"), ElementsAre(Pair("a", 1.0), Pair("b", 2.0)));
}

TEST_F(FileKeyValueTest, TheFirstWordOfKeyAndValueCounts)
{
    struct Row {
        std::string line;
        std::string key;
        std::string value;
    };
    const std::vector<Row> table = {
        {"k=v", "k", "v"},
        {"k = some words", "k", "some"},
        {"\t two words \v=\f v \t", "two", "v"},
        {"x=y=z", "x", "y=z"},
        {"x==", "x", "="},
        {"x= =y", "x", "=y"},
        {"k=\xff\xc3", "k", "\xff\xc3"},
        {Bytes("a\0b=c\0d"), Bytes("a\0b"), Bytes("c\0d")},
        // There are no comments.
        {"#a=1", "#a", "1"},
        {"# a=1", "#", "1"},
        {";a=1", ";a", "1"},
        {"[a]=1", "[a]", "1"},
        // Blanks are not empty: the line counts.
        {"k=   ", "k", ""},
        {"k=\t", "k", ""},
        {"  =v", "", "v"},
        {" = ", "", ""},
    };
    for (const Row& row : table) {
        EXPECT_THAT(Read<std::string>(row.line), ElementsAre(Pair(row.key, row.value))) << row.line;
    }
}

TEST_F(FileKeyValueTest, ACarriageReturnIsABlank)
{
    EXPECT_THAT(Read<std::string>("a=1\r\nb=\r\nc=3"),
                ElementsAre(Pair("a", "1"), Pair("b", ""), Pair("c", "3")));
    EXPECT_THAT(Read<int>("a=1\r\n\r\nb=2\r\n"), ElementsAre(Pair("a", 1), Pair("b", 2)));
    ExpectLines({NoSeparator("\r"), NotParsed("\r")});
}

TEST_F(FileKeyValueTest, TheLastLineNeedsNoNewline)
{
    EXPECT_THAT(Read<int>("a=1\nb=2"), ElementsAre(Pair("a", 1), Pair("b", 2)));
}

TEST_F(FileKeyValueTest, ALineWithoutKeyOrValueIsIgnored)
{
    EXPECT_THAT(Read<std::string>("=5\nk=\n=\na=1\n"), ElementsAre(Pair("a", "1")));
    ExpectLines({NotParsed("=5"), NotParsed("k="), NotParsed("=")});
    EXPECT_THAT(Read<int>("=5\nk=\n=\na=1\n"), ElementsAre(Pair("a", 1)));
    ExpectLines({NotParsed("=5"), NotParsed("k="), NotParsed("=")});
    EXPECT_THAT(Read<double>("=5\nk=\n=\na=1\n"), ElementsAre(Pair("a", 1.0)));
    ExpectLines({NotParsed("=5"), NotParsed("k="), NotParsed("=")});
}

TEST_F(FileKeyValueTest, AnEmptyLineIsIgnored)
{
    EXPECT_THAT(Read<std::string>("\na=1\n\nb=2\n"), ElementsAre(Pair("a", "1"), Pair("b", "2")));
    const LogLine bad = Warn("parseLineKeyValue", "Bad Parameter.");
    ExpectLines({bad, NotParsed(""), bad, NotParsed("")});
}

TEST_F(FileKeyValueTest, ALineWithoutSeparatorIsIgnored)
{
    EXPECT_THAT(Read<std::string>("# comment\na=1\n \n%s%n"), ElementsAre(Pair("a", "1")));
    ExpectLines({NoSeparator("# comment"), NotParsed("# comment"), NoSeparator(" "), NotParsed(" "),
                 NoSeparator("%s%n"), NotParsed("%s%n")});
}

TEST_F(FileKeyValueTest, TheLogLineEndsAtAZeroByteOfTheData)
{
    EXPECT_THAT(Read<std::string>(Bytes("ab\0cd\na=1\n")), ElementsAre(Pair("a", "1")));
    ExpectLines({NoSeparator("ab"), NotParsed("ab")});
}

TEST_F(FileKeyValueTest, ALineMayBeOfAnyLength)
{
    const std::string word = TenMegabytes();
    EXPECT_TRUE(Read<std::string>("a=" + word + "\nb=2\n") ==
                (Pairs<std::string>{{"a", word}, {"b", "2"}}));
    EXPECT_TRUE(Read<std::string>(word + "=1") == (Pairs<std::string>{{word, "1"}}));
    EXPECT_THAT(Read<std::string>(word), IsEmpty());
    ExpectLines({NoSeparator(word), NotParsed(word)});
}

// ----------------------------------------------------------------------------------------- numbers

TEST_F(FileKeyValueTest, AnIntegerIsReadFromTheBeginningOfTheText)
{
    const std::vector<NumberRow<int>> table = {
        {"42", 42},
        {" 42 ", 42},
        {"-7", -7},
        {"+5", 5},
        {"12abc", 12},
        {"1 2", 1},
        {"1.9", 1},
        {"1e3", 1},
        {"010", 10},
        {"0x10", 0},
        {"1,234", 1},
        {"5=6", 5},
        {"2147483647", INT_MAX},
        {"-2147483648", INT_MIN},
        // A text without a number is 0, blanks are 0, and what does not fit is the nearest number.
        // All of these lines count.
        {"abc", 0},
        {"-", 0},
        {"- 5", 0},
        {"   ", 0},
        {"2147483648", INT_MAX},
        {"-2147483649", INT_MIN},
        {"99999999999999999999999", INT_MAX},
    };
    for (const NumberRow<int>& row : table) {
        EXPECT_THAT(Read<int>(std::string("n=") + row.text), ElementsAre(Pair("n", row.value)))
            << row.text;
        EXPECT_EQ(row.value, Extracted<int>(row.text)) << row.text;
    }
}

TEST_F(FileKeyValueTest, AFloatingPointNumberIsReadFromTheBeginningOfTheText)
{
    const std::vector<NumberRow<double>> table = {
        {"1.5", 1.5},       {" -2.5e3 ", -2500},
        {".5", 0.5},        {"5.", 5},
        {"+1", 1},          {"1e-3", 0.001},
        {"12abc", 12},      {"1,5", 1},
        {"1.5.5", 1.5},     {"1.5 2", 1.5},
        {"0x10", 0},        {"1e308", 1e308},
        {"5e-324", 5e-324}, {"abc", 0},
        {"nan", 0},         {"inf", 0},
        {"1e", 0},          {"-", 0},
        {"  ", 0},          {"1e-999", 0},
        {"1e999", DBL_MAX}, {"-1e999", -DBL_MAX},
    };
    for (const NumberRow<double>& row : table) {
        EXPECT_THAT(Read<double>(std::string("n=") + row.text), ElementsAre(Pair("n", row.value)))
            << row.text;
        EXPECT_EQ(row.value, Extracted<double>(row.text)) << row.text;
    }
}

TEST_F(FileKeyValueTest, NumbersAreReadInTheProgramsLocale)
{
    const std::vector<const char*> texts = {"1,5",   "1.5",    "1.234", "1.234,5",      "1234",
                                            "12.34", "1,5,5",  "-0,25", "1e3",          "abc",
                                            "1e999", "1.234x", ",5",    "2.147.483.648"};
    const GlobalLocale locale(new CommaDecimals);
    EXPECT_THAT(Read<double>("n=1.234,5"), ElementsAre(Pair("n", 1234.5)));
    EXPECT_THAT(Read<int>("n=1.234"), ElementsAre(Pair("n", 1234)));
    EXPECT_THAT(Read<std::string>("n=1.234,5"), ElementsAre(Pair("n", "1.234,5")));
    for (const char* text : texts) {
        const std::string line = std::string("n=") + text;
        EXPECT_THAT(Read<double>(line), ElementsAre(Pair("n", Extracted<double>(text)))) << text;
        EXPECT_THAT(Read<int>(line), ElementsAre(Pair("n", Extracted<int>(text)))) << text;
    }
}

// Keys in any order, repeated, odd or missing: the map is what toType gives line by line.
TEST_F(FileKeyValueTest, ManyLinesAreReadAsToTypeReadsEach)
{
    const std::vector<std::string> pieces = {"a", "b",  "key_1", "key_10", "=",     "=",  "=5",
                                             " ", "\t", "-",     "1.5e3",  "12abc", "1,5"};
    std::mt19937 random(20'211);  // the same lines in each run
    std::uniform_int_distribution<std::size_t> piece(0, pieces.size() - 1);
    std::string content;
    Pairs<double> expected;
    std::vector<LogLine> lines;
    for (int count = 0; count < 5000; ++count) {
        std::string line;
        for (std::size_t left = 2 + piece(random) % 4; left > 0; --left) {
            line += pieces[piece(random)];
        }
        content += line + "\n";
        const std::size_t at = line.find('=');
        std::string key;
        double value = 0;
        if (at == std::string::npos) {
            lines.insert(lines.end(), {NoSeparator(line), NotParsed(line)});
        } else if (File::toType(line.substr(0, at), key, std::string()) &&
                   File::toType(line.substr(at + 1), value, 0.0)) {
            expected.emplace(key, value);
        } else {
            lines.push_back(NotParsed(line));
        }
    }
    EXPECT_EQ(Read<double>(content), expected);
    ExpectLines(lines);
}

// ------------------------------------------------------------------------------------------- files

TEST_F(FileKeyValueTest, AMissingFileIsASuccessAndKeepsTheMap)
{
    Pairs<std::string> texts{{"old", "kept"}};
    Pairs<int> integers{{"old", 1}};
    Pairs<double> doubles{{"old", 1.5}};
    for (const std::string& missing : {path, dir.File("missing/limits.conf"), std::string()}) {
        EXPECT_EQ(File::Read(missing, texts), 0);
        EXPECT_EQ(File::Read(missing, integers), 0);
        EXPECT_EQ(File::Read(missing, doubles), 0);
    }
    EXPECT_THAT(texts, ElementsAre(Pair("old", "kept")));
    EXPECT_THAT(integers, ElementsAre(Pair("old", 1)));
    EXPECT_THAT(doubles, ElementsAre(Pair("old", 1.5)));
}

TEST_F(FileKeyValueTest, AnExistingFileEmptiesTheMapFirst)
{
    EXPECT_THAT(Read<std::string>(""), IsEmpty());
    EXPECT_THAT(Read<int>(""), IsEmpty());
    EXPECT_THAT(Read<double>("old=2"), ElementsAre(Pair("old", 2.0)));
    EXPECT_THAT(Read<int>("new=3"), ElementsAre(Pair("new", 3)));
}

TEST_F(FileKeyValueTest, ADirectoryReadsAsAnEmptyFile)
{
    Pairs<int> pairs{{"old", 1}};
    EXPECT_EQ(File::Read(dir.Path(), pairs), 0);
    EXPECT_THAT(pairs, IsEmpty());
}

TEST_F(FileKeyValueTest, AFileWithoutReadPermissionKeepsTheMap)
{
    CheckAsOrdinaryUser(dir, [&] {
        WriteFile(path, "a=1");
        ASSERT_EQ(::chmod(path.c_str(), 0), 0);
        Pairs<int> pairs{{"old", 1}};
        EXPECT_EQ(File::Read(path, pairs), -1);
        EXPECT_THAT(pairs, ElementsAre(Pair("old", 1)));
        ExpectLines({Warn("Read", "File[" + path + "] is not opened.")});
    });
}

TEST_F(FileKeyValueTest, AFileThatCannotBeOpenedKeepsTheMap)
{
    WriteFile(path, "a=1");
    faults.open = Failing(EMFILE);
    const LogLine line = Warn("Read", "File[" + path + "] is not opened.");
    Pairs<std::string> texts{{"old", "kept"}};
    Pairs<int> integers{{"old", 1}};
    Pairs<double> doubles{{"old", 1.5}};
    EXPECT_EQ(File::Read(path, texts), -1);
    EXPECT_EQ(File::Read(path, integers), -1);
    EXPECT_EQ(File::Read(path, doubles), -1);
    EXPECT_THAT(texts, ElementsAre(Pair("old", "kept")));
    EXPECT_THAT(integers, ElementsAre(Pair("old", 1)));
    EXPECT_THAT(doubles, ElementsAre(Pair("old", 1.5)));
    ExpectLines({line, line, line});
}

TEST_F(FileKeyValueTest, ALineCutOffByAFailedReadIsIgnored)
{
    const std::string text = "port=5001\ntimeout=30000\nlast=1\n";
    const std::size_t second = text.find('\n') + 1;
    const std::size_t third = text.find('\n', second) + 1;
    for (std::size_t readable = 0; readable < text.size(); ++readable) {
        SCOPED_TRACE(readable);
        bool failed = false;
        faults.read = [&](int fd, void* buffer, std::size_t /*size*/) -> ssize_t {
            if (std::exchange(failed, true)) return Failing(EIO)();
            return readable > 0 ? RealRead(fd, buffer, readable) : Failing(EIO)();
        };
        Pairs<int> expected;
        if (readable >= second) expected["port"] = 5001;
        if (readable >= third) expected["timeout"] = 30000;
        EXPECT_EQ(Read<int>(text), expected);
        faults.read = nullptr;
    }
}

TEST_F(FileKeyValueTest, LeavesNoDescriptorOpen)
{
    const std::size_t before = CountDescriptors();
    EXPECT_EQ(Read<int>("a=1").size(), 1U);
    Pairs<int> pairs;
    EXPECT_EQ(File::Read(dir.Path(), pairs), 0);
    EXPECT_EQ(CountDescriptors(), before);
}

// ------------------------------------------------------------------------------------------ toType

TEST_F(FileKeyValueTest, AnEmptyTextGivesTheFallback)
{
    const std::string empty;
    std::string text = "old";
    int integer = 1;
    double number = 1.5;
    EXPECT_FALSE(File::toType(empty, text, std::string("fallback")));
    EXPECT_FALSE(File::toType(empty, integer, 7));
    EXPECT_FALSE(File::toType(empty, number, 7.5));
    EXPECT_EQ(text, "fallback");
    EXPECT_EQ(integer, 7);
    EXPECT_EQ(number, 7.5);
}

TEST_F(FileKeyValueTest, BlanksLeaveTheValueAndSucceed)
{
    const std::string blanks = " \t\r\n";
    std::string text = "old";
    int integer = 1;
    double number = 1.5;
    EXPECT_TRUE(File::toType(blanks, text, std::string("fallback")));
    EXPECT_TRUE(File::toType(blanks, integer, 7));
    EXPECT_TRUE(File::toType(blanks, number, 7.5));
    EXPECT_EQ(text, "old");
    EXPECT_EQ(integer, 1);
    EXPECT_EQ(number, 1.5);
}

TEST_F(FileKeyValueTest, ATextWithoutANumberGivesZeroAndSucceeds)
{
    const std::string word = " word s";
    std::string text = "old";
    int integer = 1;
    double number = 1.5;
    EXPECT_TRUE(File::toType(word, text, std::string("fallback")));
    EXPECT_TRUE(File::toType(word, integer, 7));
    EXPECT_TRUE(File::toType(word, number, 7.5));
    EXPECT_EQ(text, "word");
    EXPECT_EQ(integer, 0);
    EXPECT_EQ(number, 0.0);
}

TEST_F(FileKeyValueTest, ConvertsEveryTypeThatStreamsWriteAndRead)
{
    std::int64_t large = 0;
    EXPECT_TRUE(File::toType(std::string("4294967297"), large, std::int64_t{0}));
    EXPECT_EQ(large, 4294967297);
    std::string text;
    EXPECT_TRUE(File::toType(12, text, std::string()));
    EXPECT_EQ(text, "12");
    int number = 0;
    EXPECT_TRUE(File::toType("12abc", number, 7));
    EXPECT_EQ(number, 12);
}

}  // namespace
