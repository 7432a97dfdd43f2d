// Locks in a directory of their user, and locks of both kinds that are waited for.
#include <orvadrcore/file_lock.h>

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "support/fakes/pauses.h"
#include "support/fakes/syscall_faults.h"
#include "support/fixtures/log_capture.h"
#include "support/fixtures/special_file.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"
#include "support/processes/child_process.h"

namespace {

using OrvaDRCore::FileLock;
using OrvaDRCore::FileLockState;
using std::chrono::milliseconds;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr int Exclusive = LOCK_EX | LOCK_NB;
constexpr milliseconds NoTime{0};
constexpr milliseconds Long{60'000};

class FileLockDirTest : public LoggedTest {
  protected:
    FileLockDirTest() : LoggedTest("file_lock.cpp") {}

    FileLock Own(const std::string& name = "a") const { return {name, dir.Path()}; }

    // Whether another object of this process could take the lock.
    bool CanTake(int operation = Exclusive) const { return Own().lock(operation, 0); }

    TempDir dir;
};

// ----------------------------------------------------------------------------- directory and file

TEST_F(FileLockDirTest, TheLockFileIsTheNameInTheDirectory)
{
    FileLock lock("a b%s", dir.Path());
    EXPECT_THAT(NamesIn(dir.Path()), IsEmpty());
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("a b%s"));
    EXPECT_TRUE(IsLocked(dir.File("a b%s")));
}

TEST_F(FileLockDirTest, ANewFileHasMode0600LessTheUmask)
{
    for (const mode_t mask : {0U, 0022U, 0077U, 0277U}) {
        const Umask umask(mask);
        EXPECT_TRUE(Own().openLockedFile());
        EXPECT_EQ(ModeOf(dir.File("a")), 0600U & ~mask);
        std::filesystem::remove(dir.File("a"));
    }
}

TEST_F(FileLockDirTest, MissingDirectoriesAreMadeForTheirOwnerAlone)
{
    const Umask umask(0);
    FileLock lock("a", dir.File("one/two"));
    EXPECT_TRUE(lock.checkLockDir());
    EXPECT_EQ(ModeOf(dir.File("one")), 0700U);
    EXPECT_EQ(ModeOf(dir.File("one/two")), 0700U);
    EXPECT_TRUE(lock.checkLockDir());
    EXPECT_TRUE(lock.lock(Exclusive, 0));
}

TEST_F(FileLockDirTest, ADirectoryThatIsThereKeepsItsMode)
{
    ASSERT_EQ(::chmod(dir.Path().c_str(), 0750), 0);
    EXPECT_TRUE(CanTake());
    EXPECT_EQ(ModeOf(dir.Path()), 0750U);
}

TEST_F(FileLockDirTest, NoProgramIsStartedForTheDirectory)
{
    SyscallFaults faults;
    faults.spawn = FailingToStart(EACCES);
    EXPECT_TRUE(FileLock("a", dir.File("one/two")).lock(Exclusive, 0));
}

TEST_F(FileLockDirTest, ARelativeDirectoryIsOneOfTheWorkingDirectory)
{
    CheckInChild([this] {
        std::filesystem::current_path(dir.Path());
        EXPECT_TRUE(FileLock("a", "locks").lock(Exclusive, 0));
        EXPECT_TRUE(std::filesystem::exists(dir.File("locks/a")));
    });
}

TEST_F(FileLockDirTest, ADirectoryThatCannotBeMadeIsLogged)
{
    WriteFile(dir.File("file"), "");
    for (const std::string& in : {dir.File("file"), dir.File("file/locks")}) {
        FileLock lock("a", in);
        EXPECT_FALSE(lock.lock(Exclusive, 0));
        ExpectLines({Err("checkLockDir", "Failed to create lock dir [" + in + "] in local host"),
                     Err("openLockedFile", "Failed to check lock dir of lock file [" + in + "/a]."),
                     Err("lock", "Bad fd [-1] to lock [" + in + "/a]")});
        EXPECT_EQ(lock.acquire(LOCK_EX, Long), FileLockState::Failed);
        EXPECT_EQ(TakeLines().size(), 3U);
    }
}

TEST_F(FileLockDirTest, NamesAndDirectoriesThatLeadElsewhereAreRefused)
{
    const struct {
        std::string name;
        std::string dir;
    } rows[] = {{"", dir.Path()},
                {".", dir.Path()},
                {"..", dir.Path()},
                {"../a", dir.Path()},
                {"a/b", dir.Path()},
                {"/a", dir.Path()},
                {"a", ""},
                {"a", "/tmp/.orvadr_lock"},
                {"a", "/tmp/.orvadr_lock/"},
                {"a", "/tmp/.orvadr_lock/b"}};
    for (const auto& row : rows) {
        FileLock lock(row.name, row.dir);
        ExpectLines({Err("FileLock", "Bad lock file[" + row.name + "] in dir[" + row.dir + "]")});
        EXPECT_FALSE(lock.lock(Exclusive, 0));
        ExpectLines(
            {Err("openLockedFile", "Bad Lock File"), Err("lock", "Bad fd [-1] to lock []")});
    }
    const FileLock zero(std::string("a\0b", 3), dir.Path());
    EXPECT_EQ(TakeLines().size(), 1U);
    EXPECT_THAT(NamesIn(dir.Path()), IsEmpty());
}

TEST_F(FileLockDirTest, ADirectoryWhoseNameBeginsAsTheSharedOneIsAnother)
{
    const FileLock lock("a", "/tmp/.orvadr_locks");
    ExpectLines({});
}

TEST_F(FileLockDirTest, ASymbolicLinkIsNotFollowed)
{
    std::filesystem::create_symlink(dir.File("elsewhere"), dir.File("a"));
    FileLock lock = Own();
    EXPECT_FALSE(lock.openLockedFile());
    ExpectLines({Err("openLockedFile", "Failed to open lock file[" + dir.File("a") +
                                           "], errno=Too many levels of symbolic links")});
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("a"));
}

TEST_F(FileLockDirTest, WhatIsNoRegularFileIsRefusedWithoutWaiting)
{
    for (const SpecialFile::Kind kind : {SpecialFile::Kind::Pipe, SpecialFile::Kind::FullPipe,
                                         SpecialFile::Kind::Socket, SpecialFile::Kind::Directory}) {
        const SpecialFile special(kind, dir.File("a"), "text");
        const std::size_t before = CountDescriptors();
        EXPECT_FALSE(Own().openLockedFile()) << kind;
        EXPECT_EQ(TakeLines().size(), 1U);
        EXPECT_EQ(CountDescriptors(), before);
    }
    const SpecialFile pipe(SpecialFile::Kind::Pipe, dir.File("a"), "");
    EXPECT_FALSE(Own().openLockedFile());
    ExpectLines({Err("openLockedFile",
                     "Failed to open lock file[" + dir.File("a") + "], errno=Invalid argument")});
}

TEST_F(FileLockDirTest, ProgramsDoNotInheritTheLock)
{
    SyscallFaults faults;
    int fd = -1;
    faults.open = [&](const char* path, int flags, mode_t mode) {
        fd = RealOpen(path, flags, mode);
        return fd;
    };
    FileLock lock = Own();
    ASSERT_TRUE(lock.openLockedFile());
    EXPECT_NE(::fcntl(fd, F_GETFD) & FD_CLOEXEC, 0);
}

TEST_F(FileLockDirTest, AnOrdinaryUserTakesItsLockAgainAndAgain)
{
    CheckAsOrdinaryUser(dir, [&] {
        FileLock first = Own();
        EXPECT_TRUE(first.lock(Exclusive, 0));
        FileLock second = Own();
        EXPECT_FALSE(second.lock(Exclusive, 0));
        EXPECT_EQ(second.acquire(LOCK_EX, NoTime), FileLockState::Held);
        first.unlock();
        EXPECT_TRUE(second.lock(Exclusive, 0));
        EXPECT_FALSE(first.tryLock(LOCK_SH | LOCK_NB));
        second.unlock();
        EXPECT_EQ(first.acquire(LOCK_SH, NoTime), FileLockState::Taken);
    });
}

TEST_F(FileLockDirTest, SettingANameMakesItANamedLock)
{
    FileLock lock = Own();
    EXPECT_TRUE(lock.setLockFile("a"));
    EXPECT_FALSE(lock.setLockFile(""));
    ExpectLines({Err("setLockFile", "Failed to set lock path []")});
    FileLock open = Own();
    ASSERT_TRUE(open.openLockedFile());
    EXPECT_FALSE(open.setLockFile("a"));
    ExpectLines({Err("setLockFile", "File [" + dir.File("a") +
                                        "] has been open, can not set file path to "
                                        "[/tmp/.orvadr_lock/a]")});
}

// ---------------------------------------------------------------------------------------- acquire

TEST_F(FileLockDirTest, AFreeLockIsAcquiredAtOnce)
{
    for (const int operation : {LOCK_EX, LOCK_SH, LOCK_EX | LOCK_NB, LOCK_SH | LOCK_NB}) {
        for (const milliseconds patience :
             {milliseconds::min(), milliseconds(-1), NoTime, Long, milliseconds::max()}) {
            FileLock lock = Own();
            EXPECT_EQ(lock.acquire(operation, patience), FileLockState::Taken);
            EXPECT_FALSE(CanTake());
            EXPECT_EQ(CanTake(LOCK_SH | LOCK_NB), (operation & ~LOCK_NB) == LOCK_SH);
            EXPECT_EQ(lock.acquire(operation, patience), FileLockState::Taken);
        }
    }
}

TEST_F(FileLockDirTest, AHeldLockIsWaitedForUntilTheTimeIsUp)
{
    FileLock holder = Own();
    ASSERT_TRUE(holder.lock(Exclusive, 0));
    for (const milliseconds patience : {milliseconds(-1), NoTime, milliseconds(30)}) {
        const auto begin = std::chrono::steady_clock::now();
        EXPECT_EQ(Own().acquire(LOCK_EX, patience), FileLockState::Held);
        EXPECT_GE(std::chrono::steady_clock::now() - begin, patience);
    }
}

TEST_F(FileLockDirTest, ALockIsAskedForEveryFewMilliseconds)
{
    Pauses pauses;
    std::optional<FileLock> holder;
    holder.emplace("a", dir.Path());
    ASSERT_TRUE(holder->lock(Exclusive, 0));
    pauses.OnWait([&](std::size_t count) {
        if (count == 30) holder.reset();
    });
    EXPECT_EQ(Own().acquire(LOCK_EX, Long), FileLockState::Taken);
    EXPECT_EQ(pauses.Waits().size(), 30U);
    for (const unsigned int pause : pauses.Waits()) {
        EXPECT_GE(pause, 1'000U);
        EXPECT_LE(pause, 10'000U);
    }
}

TEST_F(FileLockDirTest, WithoutPatienceThereIsOneAttempt)
{
    SyscallFaults faults;
    int attempts = 0;
    faults.flock = [&](int, int) {
        ++attempts;
        errno = EWOULDBLOCK;
        return -1;
    };
    EXPECT_EQ(Own().acquire(LOCK_EX, NoTime), FileLockState::Held);
    EXPECT_EQ(attempts, 1);
}

TEST_F(FileLockDirTest, ALockThatAnotherProcessFreesIsAcquired)
{
    ChildProcess holder([this](ChildProcess::Link& link) {
        FileLock lock = Own();
        if (lock.lock(Exclusive, 0)) link.Tell();
        link.Await();
    });
    ASSERT_TRUE(holder.Await());
    FileLock lock = Own();
    EXPECT_EQ(lock.acquire(LOCK_SH, NoTime), FileLockState::Held);
    holder.Tell();
    EXPECT_EQ(lock.acquire(LOCK_SH, Long), FileLockState::Taken);
    EXPECT_EQ(holder.Join(), 0);
}

TEST_F(FileLockDirTest, ChangingTheKindInVainFreesTheLock)
{
    FileLock first = Own();
    FileLock second = Own();
    ASSERT_EQ(first.acquire(LOCK_SH, NoTime), FileLockState::Taken);
    ASSERT_EQ(second.acquire(LOCK_SH, NoTime), FileLockState::Taken);
    EXPECT_EQ(first.acquire(LOCK_EX, NoTime), FileLockState::Held);
    EXPECT_EQ(second.acquire(LOCK_EX, NoTime), FileLockState::Taken);
}

TEST_F(FileLockDirTest, WhatIsNoOperationFails)
{
    for (const int operation : {0, LOCK_NB, LOCK_UN, LOCK_SH | LOCK_EX, 64, -1}) {
        FileLock lock = Own();
        EXPECT_EQ(lock.acquire(operation, Long), FileLockState::Failed);
        ExpectLines({Err("acquire", "Bad operation [" + std::to_string(operation) + "] to lock [" +
                                        dir.File("a") + "]")});
    }
    EXPECT_THAT(NamesIn(dir.Path()), IsEmpty());
}

TEST_F(FileLockDirTest, AFileThatCannotBeOpenedFailsAtOnce)
{
    std::filesystem::create_directory(dir.File("a"));
    EXPECT_EQ(Own().acquire(LOCK_EX, Long), FileLockState::Failed);
    ExpectLines({Err("openLockedFile",
                     "Failed to open lock file[" + dir.File("a") + "], errno=Is a directory"),
                 Err("acquire", "Bad fd [-1] to lock [" + dir.File("a") + "]")});
    FileLock nameless;
    EXPECT_EQ(nameless.acquire(LOCK_EX, Long), FileLockState::Failed);
    ExpectLines({Err("openLockedFile", "Bad Lock File"), Err("acquire", "Bad fd [-1] to lock []")});
}

TEST_F(FileLockDirTest, AKernelThatRefusesTheLockFailsAtOnce)
{
    SyscallFaults faults;
    int fd = -1;
    faults.flock = [&](int descriptor, int) {
        fd = descriptor;
        errno = ENOLCK;
        return -1;
    };
    EXPECT_EQ(Own().acquire(LOCK_EX, Long), FileLockState::Failed);
    ExpectLines({Err("acquire", "Failed to lock [" + dir.File("a") + "] with fd [" +
                                    std::to_string(fd) + "], errno=[No locks available]")});
}

TEST_F(FileLockDirTest, AnInterruptedAttemptIsRepeated)
{
    SyscallFaults faults;
    int attempts = 0;
    faults.flock = [&](int fd, int operation) {
        if (++attempts > 3) return RealFlock(fd, operation);
        errno = EINTR;
        return -1;
    };
    EXPECT_EQ(Own().acquire(LOCK_EX, NoTime), FileLockState::Taken);
    EXPECT_EQ(attempts, 4);
}

TEST_F(FileLockDirTest, ANamedLockIsAcquiredLikeTheOthers)
{
    SyscallFaults faults;
    const std::string shared = "/tmp/.orvadr_lock";
    const auto place = [&](const std::string& path) {
        return path.compare(0, shared.size(), shared) == 0 ? dir.Path() + path.substr(shared.size())
                                                           : path;
    };
    faults.open = [&](const char* path, int flags, mode_t mode) {
        return RealOpen(place(path).c_str(), flags, mode);
    };
    faults.stat = [&](const char* path, struct stat* status) {
        return RealStat(place(path).c_str(), status);
    };
    WriteFile(dir.File("named"), "");
    FileLock first("named");
    FileLock second("named");
    EXPECT_EQ(first.acquire(LOCK_EX, NoTime), FileLockState::Taken);
    EXPECT_EQ(second.acquire(LOCK_EX, milliseconds(5)), FileLockState::Held);
    first.unlock();
    EXPECT_EQ(second.acquire(LOCK_EX, NoTime), FileLockState::Taken);
}

}  // namespace
