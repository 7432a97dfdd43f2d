// File::Write, to a path and to a descriptor.
#include <orvadrcore/file.h>

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <filesystem>
#include <string>
#include <utility>

#include "base/json_helpers.h"
#include "support/fixtures/file_fixture.h"
#include "support/processes/child_checks.h"

namespace {

using OrvaDRCore::File;
using OrvaDRCore::toString;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class FileWritePathTest : public FileFixture {};
class FileWriteDescriptorTest : public FileFixture {};

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

}  // namespace
