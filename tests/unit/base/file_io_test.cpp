// FileDescriptor, ReadAll, ReadRegularFile and WriteAll.
#include "base/file_io.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <utility>

#include "support/fakes/syscall_faults.h"
#include "support/fixtures/log_capture.h"
#include "support/fixtures/special_file.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"

namespace {

using OrvaDRCore::FileDescriptor;
using OrvaDRCore::ReadAll;
using OrvaDRCore::ReadRegularFile;
using OrvaDRCore::WriteAll;

// Nothing here logs: the fixture fails on any line.
class FileIoTest : public LoggedTest {
  protected:
    FileIoTest() : LoggedTest("file_io.cpp") {}

    TempDir dir;
    SyscallFaults faults;
    std::string path = dir.File("doc");
};

class FileDescriptorTest : public FileIoTest {};
class ReadAllTest : public FileIoTest {};
class ReadRegularFileTest : public FileIoTest {};
class WriteAllTest : public FileIoTest {};

// Writes three bytes at a time.
ssize_t WriteThreeBytes(int fd, const void* buffer, std::size_t size)
{
    return RealWrite(fd, buffer, std::min<std::size_t>(size, 3));
}

// --------------------------------------------------------------------------------- FileDescriptor

TEST_F(FileDescriptorTest, IsNotOpenByDefault)
{
    const FileDescriptor owner;
    EXPECT_FALSE(owner.IsOpen());
    EXPECT_EQ(owner.Get(), -1);
}

TEST_F(FileDescriptorTest, IsClosedByItsOwner)
{
    int fd = -1;
    {
        const FileDescriptor owner(path, O_WRONLY | O_CREAT, 0600);
        ASSERT_TRUE(owner.IsOpen());
        fd = owner.Get();
        EXPECT_TRUE(IsDescriptorOpen(fd));
    }
    EXPECT_FALSE(IsDescriptorOpen(fd));
}

TEST_F(FileDescriptorTest, IsNotInheritedByPrograms)
{
    const FileDescriptor owner(path, O_WRONLY | O_CREAT, 0600);
    EXPECT_EQ(::fcntl(owner.Get(), F_GETFD), FD_CLOEXEC);
}

TEST_F(FileDescriptorTest, IsOpenedWithTheCallersFlagsAndMode)
{
    const Umask mask(0);
    const FileDescriptor owner(path, O_RDWR | O_CREAT | O_APPEND, 0640);
    EXPECT_EQ(::fcntl(owner.Get(), F_GETFL) & (O_ACCMODE | O_APPEND), O_RDWR | O_APPEND);
    EXPECT_EQ(ModeOf(path), 0640U);
}

TEST_F(FileDescriptorTest, IsNotOpenAndSetsErrnoWhenTheFileCannotBeOpened)
{
    errno = 0;
    const FileDescriptor owner(dir.File("missing/doc"), O_WRONLY | O_CREAT, 0600);
    EXPECT_EQ(errno, ENOENT);
    EXPECT_FALSE(owner.IsOpen());
}

TEST_F(FileDescriptorTest, IsHandedOverByAMove)
{
    const std::size_t before = CountDescriptors();
    {
        FileDescriptor first(path, O_WRONLY | O_CREAT, 0600);
        const int fd = first.Get();
        const FileDescriptor second(std::move(first));
        // What is left behind is the point: NOLINTNEXTLINE(*-use-after-move,*-cplusplus.Move)
        EXPECT_FALSE(first.IsOpen());
        EXPECT_EQ(second.Get(), fd);
        EXPECT_EQ(CountDescriptors(), before + 1);
    }
    EXPECT_EQ(CountDescriptors(), before);
}

TEST_F(FileDescriptorTest, KeepsErrnoWhenItIsClosed)
{
    {
        const FileDescriptor owner(path, O_WRONLY | O_CREAT, 0600);
        ::close(owner.Get());  // so the destructor's close fails
        errno = ENOSPC;
    }
    EXPECT_EQ(errno, ENOSPC);
}

// ---------------------------------------------------------------------------------------- ReadAll

TEST_F(ReadAllTest, ReadsFilesOfAnySize)
{
    for (const std::size_t size : {0U, 1U, 65535U, 65536U, 65537U, 98304U, 131072U, 5'000'000U}) {
        std::string content(size, 'x');
        for (std::size_t i = 0; i < size; ++i) content[i] = static_cast<char>(i * 31 / 7);
        WriteFile(path, content);
        const FileDescriptor owner(path, O_RDONLY);
        std::string text;
        EXPECT_TRUE(ReadAll(owner.Get(), text));
        EXPECT_TRUE(text == content) << size << " bytes";
    }
}

TEST_F(ReadAllTest, AppendsFromTheOffsetOfTheDescriptor)
{
    WriteFile(path, "0123456789");
    const FileDescriptor owner(path, O_RDONLY);
    ASSERT_EQ(::lseek(owner.Get(), 7, SEEK_SET), 7);
    std::string text = "before ";
    EXPECT_TRUE(ReadAll(owner.Get(), text));
    EXPECT_EQ(text, "before 789");
}

TEST_F(ReadAllTest, ContinuesAfterInterruptionsAndShortReads)
{
    WriteFile(path, "0123456789");
    int calls = 0;
    faults.read = [&](int fd, void* buffer, std::size_t size) -> ssize_t {
        if (++calls % 2 == 0) return Failing(EINTR)();
        return RealRead(fd, buffer, std::min<std::size_t>(size, 4));
    };
    const FileDescriptor owner(path, O_RDONLY);
    std::string text;
    EXPECT_TRUE(ReadAll(owner.Get(), text));
    EXPECT_EQ(text, "0123456789");
    EXPECT_EQ(calls, 7);  // three parts and the end, and an interruption before all but the first
}

TEST_F(ReadAllTest, KeepsWhatWasReadBeforeAFailure)
{
    WriteFile(path, "0123456789");
    int calls = 0;
    faults.read = [&](int fd, void* buffer, std::size_t /*size*/) -> ssize_t {
        return ++calls == 1 ? RealRead(fd, buffer, 4) : Failing(EIO)();
    };
    const FileDescriptor owner(path, O_RDONLY);
    std::string text = "before ";
    errno = 0;
    EXPECT_FALSE(ReadAll(owner.Get(), text));
    EXPECT_EQ(errno, EIO);
    EXPECT_EQ(text, "before 0123");
}

TEST_F(ReadAllTest, RefusesADirectory)
{
    const FileDescriptor owner(dir.Path(), O_RDONLY);
    std::string text;
    errno = 0;
    EXPECT_FALSE(ReadAll(owner.Get(), text));
    EXPECT_EQ(errno, EISDIR);
    EXPECT_EQ(text, "");
}

TEST_F(ReadAllTest, ReadsNoMoreThanTheLimit)
{
    WriteFile(path, "0123456789");
    for (const std::size_t most : {0U, 1U, 7U, 10U, 11U}) {
        for (const std::size_t piece : {3U, 100U}) {
            faults.read = [&](int fd, void* buffer, std::size_t size) {
                return RealRead(fd, buffer, std::min(size, piece));
            };
            const FileDescriptor owner(path, O_RDONLY);
            std::string text = "before ";
            EXPECT_TRUE(ReadAll(owner.Get(), text, most));
            EXPECT_EQ(text, "before " + std::string("0123456789").substr(0, most));
            EXPECT_EQ(::lseek(owner.Get(), 0, SEEK_CUR),
                      std::min<off_t>(static_cast<off_t>(most), 10));
        }
    }
}

// -------------------------------------------------------------------------------- ReadRegularFile

TEST_F(ReadRegularFileTest, AppendsTheFileUpToTheLimit)
{
    WriteFile(path, Bytes("a\0b\n"));
    std::string text = "before ";
    EXPECT_TRUE(ReadRegularFile(path, text));
    EXPECT_EQ(text, Bytes("before a\0b\n"));
    text.clear();
    EXPECT_TRUE(ReadRegularFile(path, text, 2));
    EXPECT_EQ(text, Bytes("a\0"));
    std::filesystem::create_symlink(path, dir.File("link"));
    EXPECT_TRUE(ReadRegularFile(dir.File("link"), text));
}

TEST_F(ReadRegularFileTest, FailsWithTheErrnoOfTheCallThatFails)
{
    std::string text;
    errno = 0;
    EXPECT_FALSE(ReadRegularFile(dir.File("missing"), text));
    EXPECT_EQ(errno, ENOENT);
    WriteFile(path, "0123456789");
    faults.fstat = Failing(EIO);
    EXPECT_FALSE(ReadRegularFile(path, text));
    EXPECT_EQ(errno, EIO);
    faults.fstat = nullptr;
    faults.read = Failing(EISDIR);
    EXPECT_FALSE(ReadRegularFile(path, text));
    EXPECT_EQ(errno, EISDIR);
    EXPECT_EQ(text, "");
}

TEST_F(ReadRegularFileTest, RefusesToReadTwoGigabytesAsAWhole)
{
    constexpr std::array<std::int64_t, 4> Sizes{0x7fff'ffffLL + 1, 3LL << 30U, 1LL << 32U,
                                                (1LL << 32U) + 4};
    for (const std::int64_t size : Sizes) {
        WriteFile(path, "0123");
        Lengthen(path, size);
        std::string text;
        errno = 0;
        EXPECT_FALSE(ReadRegularFile(path, text)) << size;
        EXPECT_EQ(errno, EFBIG);
        EXPECT_EQ(text, "");
        EXPECT_TRUE(ReadRegularFile(path, text, 4));
        EXPECT_EQ(text, "0123");
    }
}

TEST_F(ReadRegularFileTest, NeitherReadsNorWaitsForWhatIsNoRegularFile)
{
    faults.read = [](int /*fd*/, void* /*buffer*/, std::size_t /*size*/) -> ssize_t {
        ADD_FAILURE() << "it is read from";
        return 0;
    };
    for (const SpecialFile::Kind kind : SpecialFile::Kinds()) {
        const SpecialFile special(kind, path, "text");
        CheckInChild([&] {
            std::string text;
            EXPECT_FALSE(ReadRegularFile(path, text)) << kind;
        });
    }
}

TEST_F(ReadRegularFileTest, ATerminalDoesNotBecomeTheControllingOne)
{
    const int master = ::posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC);
    std::array<char, 100> terminal{};
    ASSERT_TRUE(::grantpt(master) == 0 && ::unlockpt(master) == 0);
    ASSERT_EQ(::ptsname_r(master, terminal.data(), terminal.size()), 0);
    CheckInChild([&] {
        ASSERT_GT(::setsid(), 0);  // a session without a controlling terminal
        std::string text;
        EXPECT_FALSE(ReadRegularFile(terminal.data(), text));
        EXPECT_EQ(::open("/dev/tty", O_RDWR | O_CLOEXEC), -1);
    });
    ::close(master);
}

// --------------------------------------------------------------------------------------- WriteAll

TEST_F(WriteAllTest, ContinuesAfterInterruptionsAndShortWrites)
{
    int calls = 0;
    faults.write = [&](int fd, const void* buffer, std::size_t size) -> ssize_t {
        return ++calls % 2 != 0 ? Failing(EINTR)() : WriteThreeBytes(fd, buffer, size);
    };
    const FileDescriptor owner(path, O_WRONLY | O_CREAT, 0600);
    EXPECT_TRUE(WriteAll(owner.Get(), "0123456789"));
    faults.write = nullptr;
    EXPECT_EQ(ReadFile(path), "0123456789");
    EXPECT_EQ(calls, 8);
}

TEST_F(WriteAllTest, AnEmptyTextTakesNoWrite)
{
    faults.write = Failing(EIO);
    EXPECT_TRUE(WriteAll(-1, ""));
}

TEST_F(WriteAllTest, AWriteOfZeroBytesIsAFailure)
{
    int calls = 0;
    faults.write = [&](int /*fd*/, const void* /*buffer*/, std::size_t /*size*/) -> ssize_t {
        errno = EINTR;  // left by an earlier call
        return ++calls == 1 ? 0 : 4;
    };
    EXPECT_FALSE(WriteAll(-1, "text"));
    EXPECT_EQ(calls, 1);
}

TEST_F(WriteAllTest, FailsWithTheErrnoOfTheWrite)
{
    const FileDescriptor owner("/dev/full", O_WRONLY);
    errno = 0;
    EXPECT_FALSE(WriteAll(owner.Get(), "text"));
    EXPECT_EQ(errno, ENOSPC);
}

}  // namespace
