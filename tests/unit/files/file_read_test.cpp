// File::Read of a document, from a path and from a descriptor.
#include <orvadrcore/file.h>

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/file.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <string>
#include <utility>
#include <vector>

#include "base/json_helpers.h"
#include "support/fixtures/file_fixture.h"
#include "support/processes/child_checks.h"
#include "support/processes/child_process.h"

namespace {

using OrvaDRCore::File;
using OrvaDRCore::toString;
using ::testing::ElementsAre;

// A text and its document; null if it is no document, which leaves the value as it was.
struct Parsed {
    std::string text;
    const char* document;
};

// Nests deeper than a document may.
std::string DeepText()
{
    return std::string(100'000, '[') + std::string(100'000, ']');
}

class FileReadTest : public FileFixture {
  protected:
    // Reads a file of `row.text` by `read` and checks the result.
    template <class Read>
    void ExpectParsed(const Parsed& row, Read read)
    {
        SCOPED_TRACE(row.text.substr(0, 60));
        WriteFile(path, row.text);
        Json::Value value("old");
        EXPECT_EQ(read(value), row.document != nullptr);
        EXPECT_EQ(toString(value), row.document != nullptr ? row.document : "\"old\"");
    }
};

class FileReadPathTest : public FileReadTest {};
class FileReadDescriptorTest : public FileReadTest {};

// -------------------------------------------------------------------------------------- Read(path)

TEST_F(FileReadPathTest, AMissingFileIsASuccessThatReadsNothing)
{
    std::filesystem::create_symlink(dir.File("nothing"), dir.File("link"));
    for (const std::string& missing :
         {path, dir.File("missing/doc.json"), dir.File("link"), std::string()}) {
        Json::Value value("old");
        EXPECT_TRUE(File::Read(missing, value)) << missing;
        EXPECT_EQ(value, "old");
    }
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("link"));
}

TEST_F(FileReadPathTest, ADirectoryIsRefusedWithoutALogLine)
{
    Json::Value value("old");
    EXPECT_FALSE(File::Read(dir.Path(), value));
    EXPECT_EQ(value, "old");
}

TEST_F(FileReadPathTest, AFileWithoutReadPermissionIsRefused)
{
    CheckAsOrdinaryUser(dir, [&] {
        WriteFile(path, "1");
        ASSERT_EQ(::chmod(path.c_str(), 0), 0);
        Json::Value value("old");
        EXPECT_FALSE(File::Read(path, value));
        EXPECT_EQ(value, "old");
        ExpectLines({Err("Read", "File[" + path + "] is not opened.")});
    });
}

TEST_F(FileReadPathTest, AFileThatCannotBeOpenedIsRefused)
{
    WriteFile(path, "1");
    Json::Value value("old");
    faults.open = Failing(EMFILE);
    EXPECT_FALSE(File::Read(path, value));
    EXPECT_EQ(value, "old");
    ExpectLines({Err("Read", "File[" + path + "] is not opened.")});
}

TEST_F(FileReadPathTest, AFileHoldsOneDocumentOfAnyType)
{
    const std::vector<Parsed> table = {
        {R"({"a":1})", R"({"a":1})"},
        {"{\"a\":1}\n", R"({"a":1})"},
        {"{\n  \"a\": 1,\n  \"b\": [\n    true\n  ]\n}\n", R"({"a":1,"b":[true]})"},
        {"{\r\n\"a\":\r\n1}\r\n", R"({"a":1})"},
        {"\n\n[1,\n\n\n2]\n\n", "[1,2]"},
        {"null", "null"},
        {"-1.5\n", "-1.5"},
        {"\"\xc3\xa4 \xff\"", "\"\xc3\xa4 \xff\""},
        // The contract: lines are joined with nothing between them.
        {"1\n2\n3", "123"},
        {"\"one\ntext\"", "\"onetext\""},
        {"tr\nue\n", "true"},
        // A carriage return is no end of a line.
        {"1\r2", nullptr},
        {"", nullptr},
        {"\n", nullptr},
        {"  \n", nullptr},
        {"{\"a\":1", nullptr},
        {"{\"a\":1}}", nullptr},
        {"{} {}", nullptr},
        {"{'a':1}", nullptr},
        {"a=1\n", nullptr},
        {Bytes("{\0}"), nullptr},
        {Bytes("1\0"), nullptr},
        {Bytes("1\0\n2"), nullptr},
        {Bytes("\"a\0b\""), nullptr},
        {DeepText(), nullptr},
    };
    for (const Parsed& row : table) {
        ExpectParsed(row, [&](Json::Value& value) { return File::Read(path, value); });
    }
}

TEST_F(FileReadPathTest, APrefixOfADocumentIsRefused)
{
    const std::string text = "{\"a\":[1,{\"b\":\"c d\"},\nnull],\n\"e\":{\"f\":-1.5,\"g\":true}}";
    for (std::size_t size = 0; size < text.size(); ++size) {
        ExpectParsed({text.substr(0, size), nullptr},
                     [&](Json::Value& value) { return File::Read(path, value); });
    }
    ExpectParsed({text, R"({"a":[1,{"b":"c d"},null],"e":{"f":-1.5,"g":true}})"},
                 [&](Json::Value& value) { return File::Read(path, value); });
}

TEST_F(FileReadPathTest, ALineMayBeOfAnyLength)
{
    const Json::Value document = DocumentOfTenMegabytes();
    WriteFile(path, toString(document) + "\n");
    Json::Value value;
    EXPECT_TRUE(File::Read(path, value));
    EXPECT_TRUE(value == document);
}

TEST_F(FileReadPathTest, APipeIsReadToItsEnd)
{
    ASSERT_EQ(::mkfifo(path.c_str(), 0600), 0);
    ChildProcess writer([&](ChildProcess::Link&) {
        WriteFile(path, "{\"a\":\n" + std::string(200'000, ' ') + "1}\n");
    });
    Json::Value value;
    EXPECT_TRUE(File::Read(path, value));
    EXPECT_EQ(toString(value), R"({"a":1})");
    EXPECT_EQ(writer.Join(), 0);
}

// What can be read before a failure, what follows, and the document of the complete lines.
struct Torn {
    std::string readable;
    std::string rest;
    const char* document;
};

std::vector<Torn> TornTexts()
{
    const std::string blanks(2000, ' ');
    return {
        {"12345", "678", nullptr},
        {"12345", "\n", nullptr},  // more digits may follow
        {"[1]\n", "]]]", "[1]"},
        {"[1]\n2", "3", "[1]"},
        {"[1]\n\n", "2", "[1]"},
        {"{\"a\":1}\n12345", "678\n", R"({"a":1})"},
        {"[1]" + blanks, ",2]", nullptr},  // longer than a chunk
        {"[1]\n" + blanks + "2", "3", "[1]"},
        {"[\n1,\n2]", "\n", nullptr},
        {"\n", "1", nullptr},
        {"", "1", nullptr},
    };
}

TEST_F(FileReadPathTest, ALineCutOffByAFailedReadIsIgnored)
{
    for (const Torn& row : TornTexts()) {
        bool failed = false;
        faults.read = [&](int fd, void* buffer, std::size_t size) -> ssize_t {
            if (std::exchange(failed, true)) return Failing(EIO)();
            EXPECT_GE(size, row.readable.size());
            return RealRead(fd, buffer, row.readable.size());
        };
        ExpectParsed({row.readable + row.rest, row.document},
                     [&](Json::Value& value) { return File::Read(path, value); });
        EXPECT_TRUE(failed);
    }
}

TEST_F(FileReadPathTest, LeavesNoDescriptorOpen)
{
    const std::size_t before = CountDescriptors();
    Json::Value value;
    WriteFile(path, "1");
    EXPECT_TRUE(File::Read(path, value));
    WriteFile(path, "{");
    EXPECT_FALSE(File::Read(path, value));
    EXPECT_FALSE(File::Read(dir.Path(), value));
    EXPECT_EQ(CountDescriptors(), before);
}

// ---------------------------------------------------------------------------------------- Read(fd)

TEST_F(FileReadDescriptorTest, AFileHoldsOneDocumentOfAnyType)
{
    const std::string chunk(1023, ' ');
    const std::vector<Parsed> table = {
        {"{\"a\":\n1}\n", R"({"a":1})"},
        {"[\r\n1]\r\n", "[1]"},
        {"null", "null"},
        // Newlines are kept.
        {"\"one\ntext\"", R"("one\ntext")"},
        {"1\n2", nullptr},
        {"tr\nue", nullptr},
        {"", nullptr},
        {"{\"a\":1", nullptr},
        {"{}}", nullptr},
        {DeepText(), nullptr},
        // In each chunk, of 1023 bytes or up to a newline, what follows a zero byte is ignored.
        {Bytes("[1\0 and more\n]"), "[1]"},
        {Bytes("[1]\0 and more"), "[1]"},
        {Bytes("\0nothing\n1"), "1"},
        {Bytes("[\0]"), nullptr},
        {Bytes("1\0\n2"), "12"},
        {"[1" + Bytes("\0") + std::string(1020, 'x') + ",2]", "[1,2]"},
        {"[1" + Bytes("\0") + std::string(1019, 'x') + ",2]", "[12]"},
        {"[1" + chunk + ",2" + Bytes("\0") + "3]\n]", "[1,2]"},
    };
    for (const Parsed& row : table) {
        ExpectParsed(row, [&](Json::Value& value) {
            const int fd = OpenFile(path, O_RDONLY);
            const bool read = File::Read(fd, value);
            EXPECT_FALSE(IsDescriptorOpen(fd));
            return read;
        });
    }
}

TEST_F(FileReadDescriptorTest, APrefixOfADocumentIsRefused)
{
    const std::string text = "{\"a\":[1,{\"b\":\"c d\"},\nnull],\n\"e\":{\"f\":-1.5,\"g\":true}}";
    for (std::size_t size = 0; size < text.size(); ++size) {
        ExpectParsed({text.substr(0, size), nullptr}, [&](Json::Value& value) {
            return File::Read(OpenFile(path, O_RDONLY), value);
        });
    }
}

TEST_F(FileReadDescriptorTest, ReadsFromTheOffsetOfTheDescriptor)
{
    WriteFile(path, "not this [1,2]");
    const int fd = OpenFile(path, O_RDWR);
    ASSERT_EQ(::lseek(fd, 9, SEEK_SET), 9);
    Json::Value value;
    EXPECT_TRUE(File::Read(fd, value));
    EXPECT_EQ(toString(value), "[1,2]");
}

TEST_F(FileReadDescriptorTest, ALineMayBeOfAnyLength)
{
    const Json::Value document = DocumentOfTenMegabytes();
    WriteFile(path, toString(document));
    Json::Value value;
    EXPECT_TRUE(File::Read(OpenFile(path, O_RDONLY), value));
    EXPECT_TRUE(value == document);
}

TEST_F(FileReadDescriptorTest, APipeIsReadToItsEnd)
{
    std::array<int, 2> pipe{};
    ASSERT_EQ(::pipe2(pipe.data(), O_CLOEXEC), 0);
    ASSERT_EQ(::write(pipe[1], "{\"a\":\n1}", 8), 8);
    ::close(pipe[1]);
    Json::Value value;
    EXPECT_TRUE(File::Read(pipe[0], value));
    EXPECT_EQ(toString(value), R"({"a":1})");
    EXPECT_FALSE(IsDescriptorOpen(pipe[0]));
}

// /proc/self/mem: reading fails where nothing is mapped.
TEST_F(FileReadDescriptorTest, ALineCutOffByAFailedReadIsIgnored)
{
    constexpr std::size_t PageSize = 4096;
    void* const pages =
        ::mmap(nullptr, 2 * PageSize, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    ASSERT_NE(pages, MAP_FAILED);
    char* const end = static_cast<char*>(pages) + PageSize;
    ASSERT_EQ(::munmap(end, PageSize), 0);
    for (const Torn& row : TornTexts()) {
        SCOPED_TRACE(row.readable.substr(0, 60));
        char* const begin = end - row.readable.size();
        row.readable.copy(begin, row.readable.size());
        const int fd = OpenFile("/proc/self/mem", O_RDONLY);
        const auto offset = static_cast<off_t>(reinterpret_cast<std::uintptr_t>(begin));
        ASSERT_EQ(::lseek(fd, offset, SEEK_SET), offset);
        Json::Value value("old");
        EXPECT_EQ(File::Read(fd, value), row.document != nullptr);
        EXPECT_EQ(toString(value), row.document != nullptr ? row.document : "\"old\"");
    }
    ::munmap(pages, PageSize);
}

// An interruption is no failure: nothing is lost.
TEST_F(FileReadDescriptorTest, APipeThatIsEmptyForAMomentIsReadToItsEnd)
{
    std::array<int, 2> pipe{};
    ASSERT_EQ(::pipe2(pipe.data(), O_CLOEXEC | O_NONBLOCK), 0);
    ASSERT_EQ(::write(pipe[1], "[1,", 3), 3);
    faults.fdopen = [&](int fd, const char* mode) {
        FILE* const stream = RealFdopen(fd, mode);
        std::array<char, 8> text{};
        EXPECT_STREQ(std::fgets(text.data(), text.size(), stream), "[1,");
        EXPECT_NE(std::ferror(stream), 0);
        EXPECT_EQ(::write(pipe[1], "[2]", 3), 3);
        ::close(pipe[1]);
        return stream;
    };
    Json::Value value;
    EXPECT_TRUE(File::Read(pipe[0], value));
    EXPECT_EQ(toString(value), "[2]");
}

TEST_F(FileReadDescriptorTest, ADirectoryIsRefusedWithoutALogLine)
{
    const int fd = OpenFile(dir.Path(), O_RDONLY);
    Json::Value value("old");
    EXPECT_FALSE(File::Read(fd, value));
    EXPECT_EQ(value, "old");
    EXPECT_FALSE(IsDescriptorOpen(fd));
}

TEST_F(FileReadDescriptorTest, ADescriptorThatCannotBeReadStaysOpen)
{
    const int fd = OpenFile(path, O_WRONLY | O_CREAT);
    Json::Value value("old");
    EXPECT_FALSE(File::Read(fd, value));
    EXPECT_EQ(value, "old");
    ExpectLines({Err("Read", "Failed to open file descriptor [" + std::to_string(fd) + "]")});
    EXPECT_TRUE(IsDescriptorOpen(fd));
    ::close(fd);
}

TEST_F(FileReadDescriptorTest, ADescriptorThatIsNotOpenIsRefused)
{
    const int closed = OpenFile(path, O_RDWR | O_CREAT);
    ::close(closed);
    for (const int fd : {closed, -1}) {
        Json::Value value("old");
        EXPECT_FALSE(File::Read(fd, value));
        EXPECT_EQ(value, "old");
        ExpectLines({Err("Read", "Failed to open file descriptor [" + std::to_string(fd) + "]")});
    }
}

TEST_F(FileReadDescriptorTest, EndsALockThatIsHeldThroughTheDescriptor)
{
    WriteFile(path, "1");
    const int fd = OpenFile(path, O_RDONLY);
    ASSERT_EQ(::flock(fd, LOCK_EX | LOCK_NB), 0);
    ASSERT_TRUE(IsLocked(path));
    Json::Value value;
    EXPECT_TRUE(File::Read(fd, value));
    EXPECT_FALSE(IsLocked(path));
}

}  // namespace
