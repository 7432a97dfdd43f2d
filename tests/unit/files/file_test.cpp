#include <orvadrcore/file.h>

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/file.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <climits>
#include <filesystem>
#include <string>
#include <utility>
#include <vector>

#include "base/json_helpers.h"
#include "support/fakes/syscall_faults.h"
#include "support/fixtures/log_capture.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"
#include "support/processes/child_process.h"

namespace {

using OrvaDRCore::File;
using OrvaDRCore::toString;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

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

Json::Value DocumentOfTenMegabytes()
{
    Json::Value document;
    document["text"] = TenMegabytes();
    return document;
}

class FileTest : public LoggedTest {
  protected:
    FileTest() : LoggedTest("file.cpp") {}

    // Records the programs that are started, with their arguments.
    void NotePrograms()
    {
        faults.spawn = [&](const SpawnCall& call) {
            programs.push_back(call.Arguments());
            return RealSpawn(call);
        };
    }

    // From now on another thread gets the results of all children.
    void LoseResults()
    {
        faults.waitpid = [](pid_t pid, int* status, int options) {
            RealWaitpid(pid, status, options);
            return Failing(ECHILD)();
        };
    }

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

    TempDir dir;
    SyscallFaults faults;
    std::string path = dir.File("doc.json");
    std::vector<std::vector<std::string>> programs;
};

class FileReadPathTest : public FileTest {};
class FileReadDescriptorTest : public FileTest {};
class FileWritePathTest : public FileTest {};
class FileWriteDescriptorTest : public FileTest {};
class FileCreateDirTest : public FileTest {};
class FileRemoveDirTest : public FileTest {};

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
        const auto offset = reinterpret_cast<off_t>(begin);
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

// ------------------------------------------------------------------------------------- Write(path)

Json::Value SomeDocument()
{
    Json::Value document;
    document["list"].append(1);
    document["list"].append("\xc3\xa4");
    document["percent"] = "%s %n %m";
    return document;
}
constexpr const char* SomeText = "{\"list\":[1,\"\xc3\xa4\"],\"percent\":\"%s %n %m\"}";

TEST_F(FileWritePathTest, WritesTheTextAndANewline)
{
    EXPECT_TRUE(File::Write(path, SomeDocument()));
    EXPECT_EQ(ReadFile(path), std::string(SomeText) + "\n");
    EXPECT_TRUE(File::Write(path, Json::nullValue));
    EXPECT_EQ(ReadFile(path), "null\n");
    EXPECT_TRUE(File::Write(path, "two\nlines"));
    EXPECT_EQ(ReadFile(path), "\"two\\nlines\"\n");
}

TEST_F(FileWritePathTest, ADocumentCanBeReadAsItWasWritten)
{
    for (const Json::Value& document : {SomeDocument(), DocumentOfTenMegabytes()}) {
        EXPECT_TRUE(File::Write(path, document));
        Json::Value value;
        EXPECT_TRUE(File::Read(path, value));
        EXPECT_TRUE(value == document);
    }
}

TEST_F(FileWritePathTest, TruncatesAnOldFileAndWritesInPlace)
{
    WriteFile(path, std::string(1000, 'x'));
    ASSERT_EQ(::chmod(path.c_str(), 0640), 0);
    const ino_t inode = InodeOf(path);
    EXPECT_TRUE(File::Write(path, 1));
    EXPECT_EQ(ReadFile(path), "1\n");
    EXPECT_EQ(InodeOf(path), inode);
    EXPECT_EQ(ModeOf(path), 0640U);
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("doc.json"));
}

TEST_F(FileWritePathTest, FollowsASymbolicLink)
{
    std::filesystem::create_symlink(dir.File("target"), path);
    EXPECT_TRUE(File::Write(path, 1));
    EXPECT_EQ(ReadFile(dir.File("target")), "1\n");
    EXPECT_TRUE(std::filesystem::is_symlink(path));
}

TEST_F(FileWritePathTest, ANewFileGetsMode0666LessTheUmask)
{
    for (const mode_t mask : {0U, 0022U, 0077U}) {
        const Umask umask(mask);
        EXPECT_TRUE(File::Write(path, 1));
        EXPECT_EQ(ModeOf(path), 0666U & ~mask);
        std::filesystem::remove(path);
    }
}

TEST_F(FileWritePathTest, RefusesAnEmptyPath)
{
    EXPECT_FALSE(File::Write("", 1));
    ExpectLines({Err("Write", "Empty path to write.")});
}

TEST_F(FileWritePathTest, AFileThatCannotBeOpenedIsRefused)
{
    for (const std::string& place : {dir.File("missing/doc.json"), dir.Path()}) {
        EXPECT_FALSE(File::Write(place, 1));
        ExpectLines({Err("Write", "File [" + place + "] is not opened.")});
    }
    EXPECT_THAT(NamesIn(dir.Path()), IsEmpty());
}

TEST_F(FileWritePathTest, AFileWithoutWritePermissionIsRefused)
{
    CheckAsOrdinaryUser(dir, [&] {
        WriteFile(path, "old");
        ASSERT_EQ(::chmod(path.c_str(), 0444), 0);
        EXPECT_FALSE(File::Write(path, 1));
        ExpectLines({Err("Write", "File [" + path + "] is not opened.")});
        EXPECT_EQ(ReadFile(path), "old");
    });
}

TEST_F(FileWritePathTest, AFullDiskIsLogged)
{
    EXPECT_FALSE(File::Write("/dev/full", SomeDocument()));
    ExpectLines({Err("Write", std::string("Failed to write [") + SomeText + "] to [/dev/full].")});
}

TEST_F(FileWritePathTest, AFailureHalfwayLeavesAPartOfTheDocument)
{
    WriteFile(path, "the old text");
    bool full = false;
    faults.write = [&](int fd, const void* buffer, std::size_t /*size*/) -> ssize_t {
        return std::exchange(full, true) ? Failing(ENOSPC)() : RealWrite(fd, buffer, 4);
    };
    EXPECT_FALSE(File::Write(path, SomeDocument()));
    ExpectLines(
        {Err("Write", std::string("Failed to write [") + SomeText + "] to [" + path + "].")});
    EXPECT_EQ(ReadFile(path), std::string(SomeText, 4));
}

TEST_F(FileWritePathTest, ContinuesAfterShortWritesAndInterruptions)
{
    int calls = 0;
    faults.write = [&](int fd, const void* buffer, std::size_t /*size*/) -> ssize_t {
        return ++calls % 2 != 0 ? Failing(EINTR)() : RealWrite(fd, buffer, 1);
    };
    EXPECT_TRUE(File::Write(path, SomeDocument()));
    EXPECT_EQ(ReadFile(path), std::string(SomeText) + "\n");
}

TEST_F(FileWritePathTest, LeavesNoDescriptorOpen)
{
    const std::size_t before = CountDescriptors();
    EXPECT_TRUE(File::Write(path, 1));
    EXPECT_FALSE(File::Write("/dev/full", 1));
    EXPECT_EQ(CountDescriptors(), before);
    ExpectLines({Err("Write", "Failed to write [1] to [/dev/full].")});
}

// --------------------------------------------------------------------------------------- Write(fd)

TEST_F(FileWriteDescriptorTest, WritesTheTextWithoutANewline)
{
    const int fd = OpenFile(path, O_WRONLY | O_CREAT);
    EXPECT_TRUE(File::Write(fd, SomeDocument()));
    EXPECT_EQ(ReadFile(path), SomeText);
    EXPECT_FALSE(IsDescriptorOpen(fd));
}

TEST_F(FileWriteDescriptorTest, WritesAtTheOffsetOfTheDescriptorWithoutTruncating)
{
    WriteFile(path, "0123456789");
    const int fd = OpenFile(path, O_RDWR);
    ASSERT_EQ(::lseek(fd, 3, SEEK_SET), 3);
    EXPECT_TRUE(File::Write(fd, "ab"));
    EXPECT_EQ(ReadFile(path), "012\"ab\"789");
}

TEST_F(FileWriteDescriptorTest, ADocumentCanBeReadAsItWasWritten)
{
    const Json::Value document = DocumentOfTenMegabytes();
    EXPECT_TRUE(File::Write(OpenFile(path, O_WRONLY | O_CREAT), document));
    Json::Value value;
    EXPECT_TRUE(File::Read(OpenFile(path, O_RDONLY), value));
    EXPECT_TRUE(value == document);
}

// Short documents, too: with a buffered stream only the close would fail.
TEST_F(FileWriteDescriptorTest, AFullDiskIsLoggedForDocumentsOfAnySize)
{
    for (const std::size_t size : {1U, 10U, 1024U, 4096U, 100'000U}) {
        const Json::Value document(std::string(size - 1, 'x') + "y");
        const int fd = OpenFile("/dev/full", O_WRONLY);
        EXPECT_FALSE(File::Write(fd, document));
        ExpectLines({Err("Write", "Failed to write [" + toString(document) + "] to fd[" +
                                      std::to_string(fd) + "]")});
        EXPECT_FALSE(IsDescriptorOpen(fd));
    }
}

TEST_F(FileWriteDescriptorTest, APipeWithoutAReaderIsLogged)
{
    CheckInChild([&] {
        std::array<int, 2> pipe{};
        ASSERT_EQ(::pipe2(pipe.data(), O_CLOEXEC), 0);
        ::close(pipe[0]);
        EXPECT_FALSE(File::Write(pipe[1], 1));
        ExpectLines({Err("Write", "Failed to write [1] to fd[" + std::to_string(pipe[1]) + "]")});
        EXPECT_FALSE(IsDescriptorOpen(pipe[1]));
    });
}

TEST_F(FileWriteDescriptorTest, ADescriptorThatCannotBeWrittenStaysOpen)
{
    WriteFile(path, "old");
    const int fd = OpenFile(path, O_RDONLY);
    EXPECT_FALSE(File::Write(fd, 1));
    ExpectLines({Err("Write", "Failed to open file descriptor [" + std::to_string(fd) + "]")});
    EXPECT_TRUE(IsDescriptorOpen(fd));
    ::close(fd);
    EXPECT_EQ(ReadFile(path), "old");
}

TEST_F(FileWriteDescriptorTest, ADescriptorThatIsNotOpenIsRefused)
{
    const int closed = OpenFile(path, O_RDWR | O_CREAT);
    ::close(closed);
    for (const int fd : {closed, -1}) {
        EXPECT_FALSE(File::Write(fd, 1));
        ExpectLines({Err("Write", "Failed to open file descriptor [" + std::to_string(fd) + "]")});
    }
}

TEST_F(FileWriteDescriptorTest, EndsALockThatIsHeldThroughTheDescriptor)
{
    const int fd = OpenFile(path, O_WRONLY | O_CREAT);
    ASSERT_EQ(::flock(fd, LOCK_EX | LOCK_NB), 0);
    ASSERT_TRUE(IsLocked(path));
    EXPECT_TRUE(File::Write(fd, 1));
    EXPECT_FALSE(IsLocked(path));
}

// --------------------------------------------------------------------------------------- CreateDir

TEST_F(FileCreateDirTest, MakesADirectoryOfTheModeWhateverTheUmask)
{
    for (const mode_t mask : {0U, 0022U, 0077U}) {
        for (const int mode : {0, 01, 0700, 0750, 0755, 0777}) {
            const Umask umask(mask);
            const std::string made = dir.File(std::to_string(mask) + " " + std::to_string(mode));
            EXPECT_TRUE(File::CreateDir(made, mode));
            EXPECT_EQ(ModeOf(made), static_cast<mode_t>(mode));
            ASSERT_EQ(::rmdir(made.c_str()), 0);
        }
    }
}

TEST_F(FileCreateDirTest, RunsMkdirWithTheModeInOctal)
{
    NotePrograms();
    EXPECT_TRUE(File::CreateDir(dir.File("a"), 0755));
    EXPECT_TRUE(File::CreateDir(dir.File("b"), 0));
    EXPECT_THAT(programs, ElementsAre(ElementsAre("/bin/mkdir", "-p", dir.File("a"), "-m", "755"),
                                      ElementsAre("/bin/mkdir", "-p", dir.File("b"), "-m", "0")));
    ASSERT_EQ(::rmdir(dir.File("b").c_str()), 0);
}

TEST_F(FileCreateDirTest, MakesParentsWithTheUsualMode)
{
    const Umask umask(0022);
    EXPECT_TRUE(File::CreateDir(dir.File("a/b/c"), 0700));
    EXPECT_EQ(ModeOf(dir.File("a")), 0755U);
    EXPECT_EQ(ModeOf(dir.File("a/b")), 0755U);
    EXPECT_EQ(ModeOf(dir.File("a/b/c")), 0700U);
}

TEST_F(FileCreateDirTest, AnExistingDirectoryStaysAsItIs)
{
    const std::string there = dir.File("there");
    std::filesystem::create_directory(there);
    std::filesystem::create_directory_symlink(there, dir.File("link"));
    ASSERT_EQ(::chmod(there.c_str(), 0711), 0);
    NotePrograms();
    for (const int mode : {0, 0755, 01000, -1}) {
        EXPECT_TRUE(File::CreateDir(there, mode));
        EXPECT_TRUE(File::CreateDir(dir.File("link"), mode));
    }
    EXPECT_EQ(ModeOf(there), 0711U);
    EXPECT_THAT(programs, IsEmpty());
}

TEST_F(FileCreateDirTest, RefusesAnEmptyPathWithoutALogLine)
{
    NotePrograms();
    for (const int mode : {0755, 01000, -1}) EXPECT_FALSE(File::CreateDir("", mode));
    EXPECT_THAT(programs, IsEmpty());
}

TEST_F(FileCreateDirTest, RefusesInvalidModes)
{
    struct Row {
        int mode;
        const char* line;
    };
    const std::vector<Row> table = {
        {01000, "Directory mode error: 1000"},
        {01777, "Directory mode error: 1777"},
        {04755, "Directory mode error: 4755"},
        {INT_MAX, "Directory mode error: 17777777777"},
        {-1, "snprintf error with mode [37777777777]"},
        {-0755, "snprintf error with mode [37777777023]"},
        {INT_MIN, "snprintf error with mode [20000000000]"},
    };
    NotePrograms();
    for (const Row& row : table) {
        EXPECT_FALSE(File::CreateDir(dir.File("new"), row.mode));
        ExpectLines({Err("CreateDir", row.line)});
    }
    EXPECT_THAT(programs, IsEmpty());
    EXPECT_THAT(NamesIn(dir.Path()), IsEmpty());
}

TEST_F(FileCreateDirTest, AFileInTheWayIsLogged)
{
    WriteFile(dir.File("file"), "stays");
    for (const std::string& place : {dir.File("file"), dir.File("file/below")}) {
        EXPECT_FALSE(File::CreateDir(place, 0755));
        ExpectLines({Err("CreateDir", "Failed to create dir [" + place + "] with mode [755]")});
    }
    EXPECT_EQ(ReadFile(dir.File("file")), "stays");
}

TEST_F(FileCreateDirTest, AProgramThatCannotBeStartedIsLogged)
{
    faults.spawn = FailingToStart(ENOENT);
    EXPECT_FALSE(File::CreateDir(dir.File("new"), 0));
    ExpectLines({Err("CreateDir", "Failed to create dir [" + dir.File("new") + "] with mode [0]")});
}

TEST_F(FileCreateDirTest, IfTheResultIsLostTheDirectoryTellsWhetherItWasMade)
{
    LoseResults();
    EXPECT_TRUE(File::CreateDir(dir.File("new"), 0755));
    WriteFile(dir.File("file"), "");
    EXPECT_FALSE(File::CreateDir(dir.File("file"), 0755));
    ExpectLines(
        {Err("CreateDir", "Failed to create dir [" + dir.File("file") + "] with mode [755]")});
}

TEST_F(FileCreateDirTest, PassesThePathUnchanged)
{
    for (const char* name : {"a b", "$HOME", "a;b", "*", "'", "\"", "\\", "a\nb", "\xff"}) {
        EXPECT_TRUE(File::CreateDir(dir.File(name), 0755));
        EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(name));
        EXPECT_TRUE(File::RemoveDir(dir.File(name)));
        EXPECT_THAT(NamesIn(dir.Path()), IsEmpty());
    }
}

// --------------------------------------------------------------------------------------- RemoveDir

TEST_F(FileRemoveDirTest, RemovesATreeByRm)
{
    std::filesystem::create_directories(dir.File("tree/a/b"));
    WriteFile(dir.File("tree/a/file"), "text");
    WriteFile(dir.File("other"), "text");
    NotePrograms();
    EXPECT_TRUE(File::RemoveDir(dir.File("tree")));
    EXPECT_THAT(programs, ElementsAre(ElementsAre("/bin/rm", "-rf", dir.File("tree"))));
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("other"));
}

TEST_F(FileRemoveDirTest, LeavesWhatIsNoDirectoryAndSucceeds)
{
    WriteFile(path, "text");
    NotePrograms();
    EXPECT_TRUE(File::RemoveDir(dir.File("missing")));
    EXPECT_TRUE(File::RemoveDir(path));
    EXPECT_TRUE(File::RemoveDir(""));
    EXPECT_THAT(programs, IsEmpty());
    EXPECT_EQ(ReadFile(path), "text");
}

TEST_F(FileRemoveDirTest, RemovesASymbolicLinkAndNotItsTarget)
{
    std::filesystem::create_directory(dir.File("target"));
    WriteFile(dir.File("target/file"), "text");
    std::filesystem::create_directory_symlink(dir.File("target"), dir.File("link"));
    EXPECT_TRUE(File::RemoveDir(dir.File("link")));
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("target"));
    EXPECT_EQ(ReadFile(dir.File("target/file")), "text");
}

TEST_F(FileRemoveDirTest, IfTheResultIsLostTheDirectoryTellsWhetherItIsGone)
{
    LoseResults();
    std::filesystem::create_directories(dir.File("tree/below"));
    EXPECT_TRUE(File::RemoveDir(dir.File("tree")));
    std::filesystem::create_directories(dir.File("tree"));
    faults.spawn = [](SpawnCall call) {  // another program, which removes nothing
        call.path = "/bin/true";
        return RealSpawn(call);
    };
    EXPECT_FALSE(File::RemoveDir(dir.File("tree")));
}

TEST_F(FileRemoveDirTest, AFailureIsNotLogged)
{
    CheckAsOrdinaryUser(dir, [&] {
        std::filesystem::create_directories(dir.File("locked/below"));
        ASSERT_EQ(::chmod(dir.File("locked").c_str(), 0500), 0);
        EXPECT_FALSE(File::RemoveDir(dir.File("locked/below")));
        ASSERT_EQ(::chmod(dir.File("locked").c_str(), 0700), 0);
        ExpectLines({});
    });
    std::filesystem::create_directories(dir.File("tree"));
    faults.spawn = FailingToStart(ENOENT);
    EXPECT_FALSE(File::RemoveDir(dir.File("tree")));
}

// --------------------------------------------------------------------- GetParentDir, IsRegularFile

TEST_F(FileTest, TheParentDirectoryIsTheTextBeforeTheLastSlash)
{
    struct Row {
        const char* path;
        const char* parent;
    };
    const std::vector<Row> table = {
        {"a/b/c", "a/b"}, {"/a/b/c", "/a/b"}, {"/a/b/", "/a/b"}, {"a/", "a"},        {"abc", "abc"},
        {"/abc", ""},     {"/", ""},          {"", ""},          {"//", "/"},        {"//a", "/"},
        {"a//b", "a/"},   {"./a", "."},       {"../", ".."},     {"a/../b", "a/.."},
    };
    for (const Row& row : table) EXPECT_EQ(File::GetParentDir(row.path), row.parent) << row.path;
}

TEST_F(FileTest, IsRegularFileOnlyForARegularFile)
{
    struct Row {
        std::string name;
        bool isRegular;
    };
    WriteFile(path, "");
    std::filesystem::create_symlink(path, dir.File("link"));
    ASSERT_EQ(::mkfifo(dir.File("pipe").c_str(), 0600), 0);
    const std::vector<Row> table = {{path, true},
                                    {dir.File("link"), true},
                                    {dir.Path(), false},
                                    {dir.File("pipe"), false},
                                    {"/dev/null", false}};
    for (const Row& row : table) {
        const int fd = OpenFile(row.name, O_RDONLY | O_NONBLOCK);
        EXPECT_EQ(File::IsRegularFile(fd), row.isRegular) << row.name;
        ::close(fd);
        EXPECT_FALSE(File::IsRegularFile(fd)) << row.name;
    }
    EXPECT_FALSE(File::IsRegularFile(-1));
}

}  // namespace
