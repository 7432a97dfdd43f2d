// ReplaceFile; what stands on it is in json_file_test.cpp.
#include "replace_file.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <climits>
#include <filesystem>
#include <functional>
#include <set>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "file_io.h"
#include "support/child_checks.h"
#include "support/child_process.h"
#include "support/log_capture.h"
#include "support/syscall_faults.h"
#include "support/temp_dir.h"
#include "support/test_files.h"

namespace {

using OrvaDRCore::FileDescriptor;
using OrvaDRCore::ReplaceFile;
using ::testing::ElementsAre;
using ::testing::UnorderedElementsAre;

// How many writers of one file there may be at once.
constexpr std::size_t MaxWriters = 64;

constexpr const char* Name = "doc";
constexpr const char* FirstTemporary = "doc.orvadr-tmp0";

// Takes the lock by which the file of a living writer is known.
bool TakeLock(int fd)
{
    struct flock whole {};
    whole.l_type = F_WRLCK;
    whole.l_whence = SEEK_SET;
    return ::fcntl(fd, F_OFD_SETLK, &whole) == 0;
}

// Nothing here logs: the fixture fails on every line.
class ReplaceFileTest : public LoggedTest {
  protected:
    ReplaceFileTest() : LoggedTest("replace_file.cpp") {}

    std::string Temporary(std::size_t writer) const
    {
        return path + ".orvadr-tmp" + std::to_string(writer);
    }

    TempDir dir;
    SyscallFaults faults;
    std::string path = dir.File(Name);
};

// Writes three bytes at a time.
ssize_t WriteThreeBytes(int fd, const void* buffer, std::size_t size)
{
    return RealWrite(fd, buffer, std::min<std::size_t>(size, 3));
}

// Answers the first call with an error and leaves all others to `rest`.
template <class Function>
auto FailingOnce(int error, Function rest)
{
    return [error, rest, first = true](auto... arguments) mutable {
        if (!std::exchange(first, false)) return rest(arguments...);
        errno = error;
        return decltype(rest(arguments...)){-1};
    };
}

TEST_F(ReplaceFileTest, WritesTheTextByteForByte)
{
    const std::vector<std::string> texts = {"", "x", "two\nlines", Bytes("a\0b\xff\0"),
                                            std::string(3'000'000, 'z')};
    for (const std::string& text : texts) {
        EXPECT_TRUE(ReplaceFile(path, text));
        EXPECT_TRUE(ReadFile(path) == text) << text.size() << " bytes";
        EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name));
    }
}

TEST_F(ReplaceFileTest, TheOldFileIsReplacedWholeAndNotWrittenTo)
{
    WriteFile(path, "the old text");
    const std::string secondName = dir.File("second name");
    std::filesystem::create_hard_link(path, secondName);
    const ino_t inode = InodeOf(path);

    EXPECT_TRUE(ReplaceFile(path, "new"));

    EXPECT_NE(InodeOf(path), inode);
    EXPECT_EQ(InodeOf(secondName), inode);
    EXPECT_EQ(ReadFile(path), "new");
    EXPECT_EQ(ReadFile(secondName), "the old text");
}

TEST_F(ReplaceFileTest, TheOldFileStandsUntilTheNewOneIsOnDisk)
{
    WriteFile(path, "old");
    std::vector<std::string> steps;
    ino_t flushed = 0;
    faults.write = [&](int fd, const void* buffer, std::size_t size) {
        steps.push_back("write, " + ReadFile(path));
        return WriteThreeBytes(fd, buffer, size);
    };
    faults.fsync = [&](int fd) {
        steps.push_back("flush, " + ReadFile(path));
        struct stat status {};
        EXPECT_EQ(::fstat(fd, &status), 0);
        flushed = status.st_ino;
        return RealFsync(fd);
    };
    faults.rename = [&](const char* from, const char* to) {
        steps.push_back("rename, " + ReadFile(path));
        return RealRename(from, to);
    };
    EXPECT_TRUE(ReplaceFile(path, "newer"));
    EXPECT_THAT(steps, ElementsAre("write, old", "write, old", "flush, old", "rename, old"));
    EXPECT_EQ(ReadFile(path), "newer");
    EXPECT_EQ(InodeOf(path), flushed);
}

TEST_F(ReplaceFileTest, ShortWritesAndInterruptionsAreGoneOnFrom)
{
    WriteFile(path, "old");
    faults.write = FailingOnce(EINTR, WriteThreeBytes);
    EXPECT_TRUE(ReplaceFile(path, "0123456789"));
    EXPECT_EQ(ReadFile(path), "0123456789");
}

TEST_F(ReplaceFileTest, ANewFileGetsReadAndWriteForAllLessTheUmask)
{
    for (const mode_t mask : {0U, 0022U, 0077U, 0777U}) {
        const Umask umask(mask);
        EXPECT_TRUE(ReplaceFile(path, "text"));
        EXPECT_EQ(ModeOf(path), 0666U & ~mask);
        std::filesystem::remove(path);
    }
}

TEST_F(ReplaceFileTest, TheBitsOfTheOldFileStayWhateverTheUmask)
{
    // As an ordinary user, too: the kernel then takes the set-user-id bit off what is written to.
    const auto check = [&] {
        for (const mode_t mask : {0U, 0022U, 0077U, 0777U}) {
            for (const mode_t mode : {0600U, 0644U, 0444U, 0666U, 0777U, 01640U, 04755U, 0U}) {
                const std::string place =
                    dir.File(std::to_string(mask) + " " + std::to_string(mode));
                WriteFile(place, "old");
                ASSERT_EQ(::chmod(place.c_str(), mode), 0);
                const Umask umask(mask);
                EXPECT_TRUE(ReplaceFile(place, "new"));
                EXPECT_EQ(ModeOf(place), mode) << std::oct << "umask " << mask;
            }
        }
    };
    check();
    for (const std::string& name : NamesIn(dir.Path())) std::filesystem::remove(dir.File(name));
    CheckAsOrdinaryUser(dir, check);
}

TEST_F(ReplaceFileTest, AModeThatIsGivenIsExactAndGoesBeforeTheOldOne)
{
    for (const mode_t mask : {0U, 0077U}) {
        for (const mode_t mode : {0600U, 0644U, 0666U, 04755U, 0U}) {
            const Umask umask(mask);
            std::filesystem::remove(path);
            EXPECT_TRUE(ReplaceFile(path, "new file", mode));
            EXPECT_EQ(ModeOf(path), mode);
            ASSERT_EQ(::chmod(path.c_str(), 0640), 0);
            EXPECT_TRUE(ReplaceFile(path, "over an old one", mode));
            EXPECT_EQ(ModeOf(path), mode);
        }
    }
}

TEST_F(ReplaceFileTest, ASecretIsAtNoTimeReadableByOthers)
{
    WriteFile(path, "old secret");
    ASSERT_EQ(::chmod(path.c_str(), 0600), 0);
    const Umask umask(0);
    std::vector<mode_t> modes;
    const auto note = [&](int fd) {
        struct stat status {};
        EXPECT_EQ(::fstat(fd, &status), 0);
        modes.push_back(status.st_mode & 07777);
    };
    faults.fcntl = [&](int fd, int command, void* argument) {
        note(fd);
        return RealFcntl(fd, command, argument);
    };
    faults.write = [&](int fd, const void* buffer, std::size_t size) {
        note(fd);
        return RealWrite(fd, buffer, size);
    };
    EXPECT_TRUE(ReplaceFile(path, "new secret"));
    EXPECT_THAT(modes, ElementsAre(0600, 0600));
}

TEST_F(ReplaceFileTest, AFileThatCannotBeWrittenIsReplaced)
{
    CheckAsOrdinaryUser(dir, [&] {
        WriteFile(path, "old");
        ASSERT_EQ(::chmod(path.c_str(), 0444), 0);
        EXPECT_TRUE(ReplaceFile(path, "new"));
        EXPECT_EQ(ReadFile(path), "new");
    });
}

TEST_F(ReplaceFileTest, ALinkInThePlaceOfTheFileIsReplacedAndNotFollowed)
{
    const std::string target = dir.File("target");
    const auto check = [&] {
        EXPECT_TRUE(ReplaceFile(path, "new"));
        EXPECT_FALSE(std::filesystem::is_symlink(path));
        EXPECT_EQ(ReadFile(path), "new");
    };
    std::filesystem::create_symlink(target, path);
    check();
    EXPECT_FALSE(std::filesystem::exists(target));

    WriteFile(target, "the target's");
    std::filesystem::remove(path);
    std::filesystem::create_symlink(target, path);
    check();
    EXPECT_EQ(ReadFile(target), "the target's");
}

// -------------------------------------------------------------------- ReplaceFile: temporary files

struct Planted {
    const char* what;
    std::function<void(const std::string& name)> plant;
};

TEST_F(ReplaceFileTest, NothingPlantedUnderTheTemporarysNameIsWrittenThrough)
{
    const std::string target = dir.File("target");
    const std::vector<Planted> table = {
        {"a link to a file", [&](auto& name) { std::filesystem::create_symlink(target, name); }},
        {"a link to the file itself",
         [&](auto& name) { std::filesystem::create_symlink(path, name); }},
        {"a link to nothing",
         [&](auto& name) { std::filesystem::create_symlink(dir.File("nothing"), name); }},
        {"a link to a directory",
         [&](auto& name) { std::filesystem::create_symlink(dir.Path(), name); }},
        {"a directory", [&](auto& name) { std::filesystem::create_directory(name); }},
    };
    WriteFile(target, "the target's");
    for (const Planted& row : table) {
        SCOPED_TRACE(row.what);
        WriteFile(path, "old");
        row.plant(Temporary(0));
        std::string used;
        faults.rename = [&](const char* from, const char* to) {
            used = from;
            return RealRename(from, to);
        };
        EXPECT_TRUE(ReplaceFile(path, "new"));
        EXPECT_EQ(used, Temporary(1));
        EXPECT_EQ(ReadFile(path), "new");
        EXPECT_FALSE(std::filesystem::is_symlink(path));
        EXPECT_EQ(ReadFile(target), "the target's");
        EXPECT_THAT(NamesIn(dir.Path()), UnorderedElementsAre(Name, "target", FirstTemporary));
        std::filesystem::remove(Temporary(0));
    }
}

TEST_F(ReplaceFileTest, APipeUnderTheTemporarysNameIsNotWaitedFor)
{
    ASSERT_EQ(::mkfifo(Temporary(0).c_str(), 0600), 0);
    EXPECT_TRUE(ReplaceFile(path, "new"));
    EXPECT_EQ(ReadFile(path), "new");
}

TEST_F(ReplaceFileTest, WhatADeadWriterLeftIsRemovedByTheNext)
{
    struct Step {
        const char* name;
        std::function<void(const std::function<void()>& halt)> haltAt;
    };
    const std::vector<Step> table = {
        {"write",
         [&](auto& halt) {
             faults.write = [&](int fd, const void* buffer, std::size_t size) {
                 if (size == 8) halt();  // three of the eleven bytes are written
                 return WriteThreeBytes(fd, buffer, size);
             };
         }},
        {"fchmod",
         [&](auto& halt) {
             faults.fchmod = [&](int fd, mode_t mode) {
                 halt();
                 return RealFchmod(fd, mode);
             };
         }},
        {"fsync",
         [&](auto& halt) {
             faults.fsync = [&](int fd) {
                 halt();
                 return RealFsync(fd);
             };
         }},
        {"rename",
         [&](auto& halt) {
             faults.rename = [&](const char* from, const char* to) {
                 halt();
                 return RealRename(from, to);
             };
         }},
    };
    for (const Step& step : table) {
        SCOPED_TRACE(step.name);
        WriteFile(path, "old");
        ChildProcess writer([&](ChildProcess::Link& link) {
            const std::function<void()> halt = [&] {
                link.Tell();
                link.Await();
            };
            step.haltAt(halt);
            ReplaceFile(path, "of the dead");
        });
        ASSERT_TRUE(writer.Await());
        writer.Kill(SIGKILL);
        EXPECT_EQ(writer.Join(), 128 + SIGKILL);
        EXPECT_EQ(ReadFile(path), "old");
        EXPECT_THAT(NamesIn(dir.Path()), UnorderedElementsAre(Name, FirstTemporary));

        EXPECT_TRUE(ReplaceFile(path, "of the living"));
        EXPECT_EQ(ReadFile(path), "of the living");
        EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name));
    }
}

TEST_F(ReplaceFileTest, ALiveWritersTemporaryIsLeftAlone)
{
    ChildProcess first([&](ChildProcess::Link& link) {
        faults.fsync = [&](int fd) {
            link.Tell();
            if (!link.Await()) return -1;
            return RealFsync(fd);
        };
        if (!ReplaceFile(path, "first")) throw std::runtime_error("not replaced");
    });
    ASSERT_TRUE(first.Await());
    std::string used;
    faults.rename = [&](const char* from, const char* to) {
        used = from;
        return RealRename(from, to);
    };
    EXPECT_TRUE(ReplaceFile(path, "second"));
    EXPECT_EQ(used, Temporary(1));
    EXPECT_EQ(ReadFile(path), "second");
    EXPECT_EQ(ReadFile(Temporary(0)), "first");

    first.Tell();
    EXPECT_EQ(first.Join(), 0);
    EXPECT_EQ(ReadFile(path), "first");
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name));
}

TEST_F(ReplaceFileTest, TooManyLiveWritersRefuseTheNext)
{
    WriteFile(path, "old");
    std::vector<FileDescriptor> live;
    for (std::size_t writer = 0; writer < MaxWriters; ++writer) {
        live.emplace_back(Temporary(writer), O_WRONLY | O_CREAT, 0600);
        ASSERT_TRUE(TakeLock(live.back().Get()));
    }
    errno = 0;
    EXPECT_FALSE(ReplaceFile(path, "new"));
    EXPECT_EQ(errno, EAGAIN);
    EXPECT_EQ(ReadFile(path), "old");
    EXPECT_EQ(NamesIn(dir.Path()).size(), MaxWriters + 1);

    live.pop_back();  // dead now, its file still there
    EXPECT_TRUE(ReplaceFile(path, "new"));
    EXPECT_EQ(ReadFile(path), "new");
    EXPECT_EQ(NamesIn(dir.Path()).size(), MaxWriters);
}

// The temporary file is made first and locked then. In between it looks like a left-over.
TEST_F(ReplaceFileTest, AWriterWhoseTemporaryIsTakenForALeftOverTakesAnother)
{
    bool raced = false;
    faults.fcntl = [&](int fd, int command, void* argument) {
        if (!std::exchange(raced, true)) {
            EXPECT_EQ(::unlink(Temporary(0).c_str()), 0);
        }
        return RealFcntl(fd, command, argument);
    };
    EXPECT_TRUE(ReplaceFile(path, "text"));
    EXPECT_TRUE(raced);
    EXPECT_EQ(ReadFile(path), "text");
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name));
}

TEST_F(ReplaceFileTest, AWriterWhoseTemporaryIsBeingRemovedTakesAnother)
{
    int remover = -1;
    std::string used;
    faults.fcntl = [&](int fd, int command, void* argument) {
        if (remover < 0) {
            remover = OpenFile(Temporary(0), O_WRONLY);
            EXPECT_TRUE(TakeLock(remover));
        }
        return RealFcntl(fd, command, argument);
    };
    faults.rename = [&](const char* from, const char* to) {
        used = from;
        return RealRename(from, to);
    };
    EXPECT_TRUE(ReplaceFile(path, "text"));
    EXPECT_EQ(used, Temporary(1));
    EXPECT_EQ(ReadFile(path), "text");
    EXPECT_EQ(ReadFile(Temporary(0)), "");  // the remover's to remove
    ::close(remover);
}

TEST_F(ReplaceFileTest, ALeftOverWhoseNameALiveWriterHasTakenMeanwhileIsNotRemoved)
{
    WriteFile(Temporary(0), "left over");
    WriteFile(dir.File("live"), "live");
    bool raced = false;
    faults.fcntl = [&](int fd, int command, void* argument) {
        if (!std::exchange(raced, true)) {
            EXPECT_EQ(::rename(dir.File("live").c_str(), Temporary(0).c_str()), 0);
        }
        return RealFcntl(fd, command, argument);
    };
    EXPECT_TRUE(ReplaceFile(path, "text"));
    EXPECT_TRUE(raced);
    EXPECT_EQ(ReadFile(Temporary(0)), "live");
    EXPECT_EQ(ReadFile(path), "text");
}

TEST_F(ReplaceFileTest, WhatIsToldOfTheNewFileIsTrueOfItAlsoWhenItsNameIsAnothersByNow)
{
    struct stat made {};
    ino_t inode = 0;
    faults.rename = [&](const char* from, const char* to) {
        inode = InodeOf(from);
        const int result = RealRename(from, to);
        WriteFile(dir.File("another"), "another's");
        EXPECT_EQ(RealRename(dir.File("another").c_str(), to), 0);
        return result;
    };
    EXPECT_TRUE(ReplaceFile(path, "new", 0640, &made));
    EXPECT_EQ(made.st_ino, inode);
    EXPECT_EQ(made.st_size, 3);
    EXPECT_EQ(made.st_mode & 07777, 0640U);
    EXPECT_NE(InodeOf(path), inode);
}

// --------------------------------------------------------------------------- ReplaceFile: failures

struct Fault {
    const char* what;
    int error;
    std::function<void(SyscallFaults&)> provoke;
};

std::vector<Fault> Faults()
{
    return {
        {"no descriptor is free", EMFILE, [](auto& faults) { faults.open = Failing(EMFILE); }},
        {"the disk is full", ENOSPC, [](auto& faults) { faults.write = Failing(ENOSPC); }},
        {"the disk fills up halfway", ENOSPC,
         [](auto& faults) {
             faults.write = [](int fd, const void* buffer, std::size_t size) -> ssize_t {
                 return size > 3 ? WriteThreeBytes(fd, buffer, size) : Failing(ENOSPC)();
             };
         }},
        {"the bits cannot be set", EPERM, [](auto& faults) { faults.fchmod = Failing(EPERM); }},
        {"the disk does not take it", EIO, [](auto& faults) { faults.fsync = Failing(EIO); }},
        {"the name cannot be taken", EROFS, [](auto& faults) { faults.rename = Failing(EROFS); }},
    };
}

TEST_F(ReplaceFileTest, AFailureLeavesTheOldFileAndNoTemporary)
{
    WriteFile(path, "old");
    ASSERT_EQ(::chmod(path.c_str(), 0640), 0);
    const ino_t inode = InodeOf(path);
    for (const Fault& row : Faults()) {
        SCOPED_TRACE(row.what);
        const std::size_t descriptors = CountDescriptors();
        row.provoke(faults);
        errno = 0;
        const bool replaced = ReplaceFile(path, "the new text");
        const int error = errno;
        faults.Clear();

        EXPECT_FALSE(replaced);
        EXPECT_EQ(error, row.error);
        EXPECT_EQ(ReadFile(path), "old");
        EXPECT_EQ(InodeOf(path), inode);
        EXPECT_EQ(ModeOf(path), 0640U);
        EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name));
        EXPECT_EQ(CountDescriptors(), descriptors);
    }
    EXPECT_TRUE(ReplaceFile(path, "the new text"));
    EXPECT_EQ(ReadFile(path), "the new text");
}

// Left-overs cannot be told from the files of living writers then, and stay.
TEST_F(ReplaceFileTest, AFileSystemWithoutLocksServesAllTheSame)
{
    WriteFile(path, "old");
    WriteFile(Temporary(0), "of somebody, dead or alive");
    faults.fcntl = Failing(ENOLCK);
    EXPECT_TRUE(ReplaceFile(path, "new"));
    EXPECT_EQ(ReadFile(path), "new");
    EXPECT_EQ(ReadFile(Temporary(0)), "of somebody, dead or alive");
    EXPECT_EQ(NamesIn(dir.Path()).size(), 2U);
}

// The locks of lock files are others: who counts or refuses those does not meet these.
TEST_F(ReplaceFileTest, NoFlockIsTaken)
{
    faults.flock = [](int /*fd*/, int /*operation*/) {
        ADD_FAILURE();
        return Failing(ENOLCK)();
    };
    EXPECT_TRUE(ReplaceFile(path, "text"));
    EXPECT_EQ(ReadFile(path), "text");
}

TEST_F(ReplaceFileTest, ANameOfFullLengthIsReplaced)
{
    const std::string longest = dir.File(std::string(NAME_MAX, 'n'));
    EXPECT_TRUE(ReplaceFile(longest, "old"));
    EXPECT_TRUE(ReplaceFile(longest, "new"));
    EXPECT_EQ(ReadFile(longest), "new");
    EXPECT_EQ(NamesIn(dir.Path()).size(), 1U);
}

// Each writer begins while the one before it writes.
TEST_F(ReplaceFileTest, ANameOfFullLengthServesAsManyWritersAsAnyOther)
{
    const std::string longest = dir.File(std::string(NAME_MAX, 'n'));
    std::size_t writers = 0;
    faults.write = [&](int fd, const void* buffer, std::size_t size) {
        if (++writers < MaxWriters) {
            EXPECT_TRUE(ReplaceFile(longest, "text"));
        }
        return RealWrite(fd, buffer, size);
    };
    EXPECT_TRUE(ReplaceFile(longest, "text"));
    EXPECT_EQ(writers, MaxWriters);
    EXPECT_EQ(ReadFile(longest), "text");
    EXPECT_EQ(NamesIn(dir.Path()).size(), 1U);
}

TEST_F(ReplaceFileTest, ANameWithRoomForTheTemporarysSuffixIsNotCut)
{
    const std::size_t room = std::string(".orvadr-tmp63").size();
    const std::string longest = dir.File(std::string(NAME_MAX - room, 'n'));
    std::string used;
    faults.rename = [&](const char* from, const char* to) {
        used = from;
        return RealRename(from, to);
    };
    EXPECT_TRUE(ReplaceFile(longest, "text"));
    EXPECT_EQ(used, longest + ".orvadr-tmp0");
}

TEST_F(ReplaceFileTest, AFailureMakesNoFileWhereNoneWas)
{
    faults.write = Failing(ENOSPC);
    EXPECT_FALSE(ReplaceFile(path, "text"));
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre());
}

TEST_F(ReplaceFileTest, ErrnoIsTheFailuresAlsoWhenCleaningUpFails)
{
    faults.rename = [](const char* from, const char* /*to*/) {
        EXPECT_EQ(::unlink(from), 0);
        return Failing(EROFS)();
    };
    errno = 0;
    EXPECT_FALSE(ReplaceFile(path, "text"));
    EXPECT_EQ(errno, EROFS);
}

TEST_F(ReplaceFileTest, PlacesWhereNoFileCanBeAreRefused)
{
    std::filesystem::create_directory(dir.File("dir"));
    WriteFile(dir.File("file"), "a file");
    WriteFile(dir.File(std::string(250, 'n')), "old");
    const std::set<std::string> names = NamesIn(dir.Path());
    struct Row {
        std::string name;
        int error;
    };
    const std::vector<Row> table = {
        {"missing/doc", ENOENT},
        {"dir", EISDIR},
        {"file/doc", ENOTDIR},
        {std::string(300, 'n'), ENAMETOOLONG},
    };
    for (const Row& row : table) {
        errno = 0;
        EXPECT_FALSE(ReplaceFile(dir.File(row.name), "new")) << row.name;
        EXPECT_EQ(errno, row.error) << row.name;
        EXPECT_EQ(NamesIn(dir.Path()), names);
    }
    EXPECT_THAT(NamesIn(dir.File("dir")), ElementsAre());
    EXPECT_EQ(ReadFile(dir.File("file")), "a file");
    EXPECT_EQ(ReadFile(dir.File(std::string(250, 'n'))), "old");
}

TEST_F(ReplaceFileTest, AnEmptyPathIsRefused)
{
    CheckInChild([&] {
        ASSERT_EQ(::chdir(dir.Path().c_str()), 0);
        errno = 0;
        EXPECT_FALSE(ReplaceFile("", "text"));
        EXPECT_EQ(errno, ENOENT);
        EXPECT_THAT(NamesIn("."), ElementsAre());
    });
}

TEST_F(ReplaceFileTest, ADirectoryThatCannotBeWrittenIsRefused)
{
    CheckAsOrdinaryUser(dir, [&] {
        WriteFile(path, "old");
        ASSERT_EQ(::chmod(dir.Path().c_str(), 0500), 0);
        errno = 0;
        EXPECT_FALSE(ReplaceFile(path, "new"));
        EXPECT_EQ(errno, EACCES);
        EXPECT_EQ(ReadFile(path), "old");
        EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name));
        ASSERT_EQ(::chmod(dir.Path().c_str(), 0700), 0);
    });
}

}  // namespace
