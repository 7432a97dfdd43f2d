// File::Read of "key=value" files that are large: their lines are sorted before they are put into the
// map. The result is that of reading line by line.
#include <orvadrcore/file.h>

#include <gmock/gmock.h>

#include <algorithm>
#include <map>
#include <random>
#include <string>
#include <vector>

#include "support/fixtures/log_capture.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"

namespace {

using OrvaDRCore::File;
using ::testing::IsEmpty;

constexpr std::size_t Large = 20'000;  // bytes, well above what counts as large

template <class Value>
using Pairs = std::map<std::string, Value>;

std::string Joined(const std::vector<std::string>& lines)
{
    std::string text;
    for (const std::string& line : lines) text += line + "\n";
    return text;
}

// What the lines hold, read one by one: of equal keys the first counts.
template <class Value>
Pairs<Value> ReadOneByOne(const std::vector<std::string>& lines)
{
    Pairs<Value> pairs;
    for (const std::string& line : lines) {
        const std::size_t at = line.find('=');
        std::string key;
        Value value{};
        const bool isPair = at != std::string::npos &&
                            File::toType(line.substr(0, at), key, std::string()) &&
                            File::toType(line.substr(at + 1), value, Value());
        if (isPair) pairs.emplace(key, value);
    }
    return pairs;
}

class FileKeyValueLargeTest : public LoggedTest {
  protected:
    FileKeyValueLargeTest() : LoggedTest("file.cpp") {}

    template <class Value>
    Pairs<Value> Read()
    {
        Pairs<Value> pairs{{"old", Value{}}};
        const int count = File::Read(path, pairs);
        EXPECT_EQ(count, static_cast<int>(pairs.size()));
        return pairs;
    }

    // Reads the lines, which are all pairs, as values of each type.
    void ExpectReadAsOneByOne(const std::vector<std::string>& lines)
    {
        WriteFile(path, Joined(lines));
        EXPECT_TRUE(Read<std::string>() == ReadOneByOne<std::string>(lines));
        EXPECT_TRUE(Read<int>() == ReadOneByOne<int>(lines));
        EXPECT_TRUE(Read<double>() == ReadOneByOne<double>(lines));
    }

    // Likewise, in several orders. Some of the lines are repeated until the file is large.
    void ExpectReadInEveryOrder(std::vector<std::string> lines)
    {
        ASSERT_FALSE(lines.empty());
        while (Joined(lines).size() < Large) lines.push_back(lines[random_() % lines.size()]);
        ExpectReadAsOneByOne(lines);
        std::sort(lines.begin(), lines.end());
        ExpectReadAsOneByOne(lines);
        std::reverse(lines.begin(), lines.end());
        ExpectReadAsOneByOne(lines);
        std::shuffle(lines.begin(), lines.end(), random_);
        ExpectReadAsOneByOne(lines);
    }

    TempDir dir;
    std::string path = dir.File("limits.conf");
    std::mt19937 random_{20'211};  // NOLINT: the same order in each run
};

TEST_F(FileKeyValueLargeTest, ReadsKeysInAnyOrder)
{
    std::vector<std::string> lines;
    for (int number = 0; number < 3000; ++number) {
        lines.push_back("key_" + std::to_string(number) + "=" + std::to_string(number * 7) + ".5");
    }
    ExpectReadInEveryOrder(lines);
}

TEST_F(FileKeyValueLargeTest, TheFirstOfManyLinesWithAKeyCounts)
{
    std::vector<std::string> lines;
    for (int number = 0; number < 5000; ++number) {
        lines.push_back("k" + std::to_string(random_() % 7) + "=" + std::to_string(number));
    }
    ExpectReadAsOneByOne(lines);
    std::sort(lines.begin(), lines.end());
    ExpectReadAsOneByOne(lines);
    EXPECT_EQ(Read<int>().size(), 7U);
}

// Keys that differ late, in length only, or in bytes above 0x7f and zero bytes.
TEST_F(FileKeyValueLargeTest, OrdersKeysOfAnyBytesAsTheMapDoes)
{
    std::vector<std::string> keys{"",
                                  "a",
                                  "aa",
                                  "12345678",
                                  "1234567",
                                  "123456789",
                                  "1234567\x7f",
                                  "1234567\x80",
                                  "\xff\xfe",
                                  "\x80",
                                  "\x7f",
                                  "\x01",
                                  "ABCDEFGH",
                                  "abcdefgh1",
                                  "abcdefgh10",
                                  "abcdefgh2",
                                  "key",
                                  Bytes("\0"),
                                  Bytes("a\0"),
                                  Bytes("a\0\0"),
                                  Bytes("a\0b"),
                                  Bytes("1234567\0"),
                                  Bytes("1234567\0x")};
    std::vector<std::string> lines;
    for (const std::string& key : keys) {
        for (const char* value : {"1", "2", "3"}) lines.push_back(" " + key + "\t=" + value);
    }
    ExpectReadInEveryOrder(lines);
}

TEST_F(FileKeyValueLargeTest, ReadsTheFirstWordsAndTheLeadingNumbers)
{
    std::vector<std::string> lines;
    for (const char* value : {"v", " some words", "y=z", "=", "   ", "12abc", "-7", "+5", "1.5e3",
                              "99999999999", "1e999", "nan", "1,5", "\xff", "\r", "0x10"}) {
        for (const char* key : {"k", " k ", "two words", "#", "\t", "k\r"}) {
            lines.push_back(std::string(key) + std::to_string(lines.size()) + "=" + value);
            lines.push_back(std::string(key) + "=" + value);
        }
    }
    ExpectReadInEveryOrder(lines);
}

TEST_F(FileKeyValueLargeTest, LogsEachBadLineInTheOrderOfTheFile)
{
    std::vector<std::string> lines(2000, "b=1");
    lines[0] = "zz";
    lines[500] = "";
    lines[1000] = "=5";
    lines[1500] = "k=";
    lines[1999] = "aa";
    WriteFile(path, Joined(lines));
    EXPECT_EQ(Read<int>(), (Pairs<int>{{"b", 1}}));
    const auto notParsed = [this](const std::string& line) {
        return Notice("Read", "Failed to parse line[" + line + "] from file [" + path + "]");
    };
    const auto noSeparator = [](const std::string& line) {
        return Notice("parseLineKeyValue", "Cannot find separator[=] in line[" + line + "]");
    };
    ExpectLines({noSeparator("zz"), notParsed("zz"), Warn("parseLineKeyValue", "Bad Parameter."),
                 notParsed(""), notParsed("=5"), notParsed("k="), noSeparator("aa"),
                 notParsed("aa")});
}

// On both sides of the size at which lines are sorted, and at every other small size.
TEST_F(FileKeyValueLargeTest, ReadsFilesOfAllSizesAlike)
{
    std::vector<std::string> lines;
    std::size_t size = 0;
    while (size < Large) {
        lines.push_back(std::to_string(random_() % 1000) + "=" + std::to_string(lines.size()));
        size += lines.back().size() + 1;
        if (lines.size() % 20 > 0) continue;
        WriteFile(path, Joined(lines));
        EXPECT_TRUE(Read<int>() == ReadOneByOne<int>(lines)) << size;
    }
}

TEST_F(FileKeyValueLargeTest, AFileWithoutAPairEmptiesTheMap)
{
    WriteFile(path, std::string(Large, '='));
    EXPECT_THAT(Read<std::string>(), IsEmpty());
    ExpectLines({Notice(
        "Read", "Failed to parse line[" + std::string(Large, '=') + "] from file [" + path + "]")});
}

}  // namespace
