#include <orvadrcore/file_lock.h>

#include <fcntl.h>
#include <gmock/gmock.h>
#include <orvacore/orvacore.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <filesystem>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "support/fakes/syscall_faults.h"
#include "support/fixtures/log_capture.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"
#include "support/processes/child_process.h"

namespace {

using OrvaDRCore::FileLock;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr int Shared = LOCK_SH | LOCK_NB;
constexpr int Exclusive = LOCK_EX | LOCK_NB;

constexpr std::string_view LockDir = "/tmp/.orvadr_lock";

// Moves the lock directory, which may belong to another user, into a directory of the test: for the
// library in this process, for its children, and for the mkdir that they run.
class FileLockTest : public LoggedTest {
  protected:
    FileLockTest() : LoggedTest("file_lock.cpp")
    {
        faults.open = [&](const char* path, int flags, mode_t mode) {
            opened.push_back({path, flags, mode});
            return RealOpen(Place(path).c_str(), flags, mode);
        };
        faults.stat = [&](const char* path, struct stat* status) {
            return RealStat(Place(path).c_str(), status);
        };
        faults.spawn = [&](SpawnCall call) {
            std::vector<std::string> texts = call.Arguments();
            std::vector<char*> arguments;
            for (std::string& text : texts) {
                text = Place(text);
                arguments.push_back(text.data());
            }
            arguments.push_back(nullptr);
            call.arguments = arguments.data();
            return RealSpawn(call);
        };
        faults.flock = [&](int fd, int operation) {
            attempts.push_back({fd, operation});
            return RealFlock(fd, operation);
        };
        faults.sleep = [&](unsigned int seconds) {
            sleeps.push_back(seconds);
            return 0U;
        };
    }

    // Where a path in the lock directory is moved.
    std::string Place(const std::string& path) const
    {
        const bool below = path.compare(0, LockDir.size(), LockDir) == 0;
        return below ? dir.Path() + path.substr(LockDir.size()) : path;
    }

    // A lock file that an ordinary user can open, too, unlike one that the library makes.
    std::string MakeLockFile(const std::string& name) const
    {
        WriteFile(dir.File(name), "");
        return dir.File(name);
    }

    struct Opened {
        std::string path;
        int flags;
        mode_t mode;
    };
    struct Attempt {
        int fd;
        int operation;
    };

    TempDir dir;
    SyscallFaults faults;
    std::vector<Opened> opened;
    std::vector<Attempt> attempts;
    std::vector<unsigned int> sleeps;

  private:
};

// Whether another object of this process could take the lock.
bool CanTake(const std::string& name, int operation = Exclusive)
{
    return FileLock(name).lock(operation, 0);
}

// A process that holds a lock until it is told to end.
ChildProcess Holder(const std::string& name, int operation = Exclusive)
{
    return ChildProcess([=](ChildProcess::Link& link) {
        FileLock lock(name);
        if (lock.lock(operation, 0)) link.Tell();
        link.Await();
    });
}

// ------------------------------------------------------------------------------------------- names

TEST_F(FileLockTest, TheLockFileIsTheNameInTheLockDirectory)
{
    EXPECT_EQ(FileLock::getLockFilePath("a"), "/tmp/.orvadr_lock/a");
    EXPECT_EQ(FileLock::getLockFilePath("a/b"), "/tmp/.orvadr_lock/a/b");
    EXPECT_EQ(FileLock::getLockFilePath("/a/b"), "/tmp/.orvadr_lock//a/b");
    EXPECT_EQ(FileLock::getLockFilePath("../a b%s"), "/tmp/.orvadr_lock/../a b%s");
    EXPECT_EQ(FileLock::getLockFilePath("/"), "/tmp/.orvadr_lock//");
}

TEST_F(FileLockTest, AnEmptyNameHasNoLockFile)
{
    EXPECT_EQ(FileLock::getLockFilePath(""), "");
    ExpectLines({Err("getLockFilePath", "Bad lock file[]")});

    FileLock lock("");
    ExpectLines({Err("getLockFilePath", "Bad lock file[]")});
    EXPECT_FALSE(lock.lock(Exclusive, 3));
    ExpectLines({Err("openLockedFile", "Bad Lock File"), Err("lock", "Bad fd [-1] to lock []")});
    EXPECT_THAT(sleeps, IsEmpty());
}

TEST_F(FileLockTest, WithoutANameNothingCanBeLocked)
{
    FileLock lock;
    EXPECT_FALSE(lock.checkLockDir());
    ExpectLines({});
    EXPECT_FALSE(lock.openLockedFile());
    ExpectLines({Err("openLockedFile", "Bad Lock File")});
    for (const bool taken : {lock.lock(Exclusive, 0), lock.tryLock(Shared)}) {
        EXPECT_FALSE(taken);
    }
    ExpectLines({Err("openLockedFile", "Bad Lock File"), Err("lock", "Bad fd [-1] to lock []"),
                 Err("openLockedFile", "Bad Lock File"), Err("lock", "Bad fd [-1] to lock []")});
    lock.unlock();
    EXPECT_THAT(attempts, IsEmpty());
}

// --------------------------------------------------------------------------- directory and file

TEST_F(FileLockTest, MakesNothingBeforeTheFirstUse)
{
    FileLock lock("a/b");
    EXPECT_TRUE(lock.setLockFile("c/d"));
    EXPECT_THAT(NamesIn(dir.Path()), IsEmpty());
    EXPECT_THAT(opened, IsEmpty());
}

TEST_F(FileLockTest, TheFirstLockMakesDirectoryAndFile)
{
    const Umask umask(0077);
    FileLock lock("a/b");
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    EXPECT_EQ(ModeOf(dir.File("a")), 0755U);
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("a"));
    EXPECT_THAT(NamesIn(dir.File("a")), ElementsAre("b"));
}

TEST_F(FileLockTest, AnAbsoluteNameMakesItsDirectories)
{
    FileLock lock("/a/b/c");
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    EXPECT_TRUE(std::filesystem::is_regular_file(dir.File("a/b/c")));
    ASSERT_EQ(opened.size(), 1U);
    EXPECT_EQ(opened[0].path, "/tmp/.orvadr_lock//a/b/c");
}

TEST_F(FileLockTest, MakesTheLockDirectory)
{
    std::filesystem::remove(dir.Path());
    FileLock lock("a");
    EXPECT_TRUE(lock.checkLockDir());
    EXPECT_EQ(ModeOf(dir.Path()), 0755U);
    EXPECT_TRUE(lock.checkLockDir());
    EXPECT_THAT(NamesIn(dir.Path()), IsEmpty());
}

TEST_F(FileLockTest, TheFileStaysAfterUse)
{
    {
        FileLock lock("a");
        EXPECT_TRUE(lock.tryLock(Exclusive));
    }
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("a"));
}

// The contract: 644 is a decimal number.
TEST_F(FileLockTest, ANewFileHasTheBitsOfDecimal644LessTheUmask)
{
    for (const mode_t mask : {0U, 0022U, 0077U}) {
        const Umask umask(mask);
        FileLock lock("a");
        EXPECT_TRUE(lock.openLockedFile());
        EXPECT_EQ(ModeOf(dir.File("a")), 01204U & ~mask);
        std::filesystem::remove(dir.File("a"));
    }
}

TEST_F(FileLockTest, TheFileIsOpenedForReading)
{
    FileLock lock("a");
    EXPECT_TRUE(lock.openLockedFile());
    ASSERT_EQ(opened.size(), 1U);
    EXPECT_EQ(opened[0].flags & ~O_LARGEFILE, O_RDONLY | O_CREAT);
    EXPECT_EQ(opened[0].mode, 644U);
    EXPECT_THAT(attempts, IsEmpty());
}

TEST_F(FileLockTest, AnOrdinaryUserCannotOpenItsOwnLockFileAgain)
{
    CheckAsOrdinaryUser(dir, [&] {
        FileLock first("a");
        EXPECT_TRUE(first.lock(Exclusive, 0));
        FileLock second("a");
        EXPECT_FALSE(second.lock(Exclusive, 0));
        ExpectLines({Err("openLockedFile",
                         "Failed to open lock file[/tmp/.orvadr_lock/a], errno=Permission denied"),
                     Err("lock", "Bad fd [-1] to lock [/tmp/.orvadr_lock/a]")});
    });
}

TEST_F(FileLockTest, AFileThatCannotBeOpenedIsLogged)
{
    struct Row {
        std::string name;
        const char* error;
    };
    const std::vector<Row> table = {{"a", "Is a directory"},
                                    {"a/", "Is a directory"},
                                    {std::string(300, 'n'), "File name too long"},
                                    {"loop", "Too many levels of symbolic links"}};
    std::filesystem::create_directory(dir.File("a"));
    std::filesystem::create_symlink("loop", dir.File("loop"));
    for (const Row& row : table) {
        FileLock lock(row.name);
        errno = 0;
        EXPECT_FALSE(lock.lock(Exclusive, 3));
        ExpectLines({Err("openLockedFile", "Failed to open lock file[/tmp/.orvadr_lock/" +
                                               row.name + "], errno=" + row.error),
                     Err("lock", "Bad fd [-1] to lock [/tmp/.orvadr_lock/" + row.name + "]")});
        EXPECT_FALSE(lock.tryLock(Shared));
        EXPECT_EQ(TakeLines().size(), 2U);
    }
    EXPECT_THAT(attempts, IsEmpty());
    EXPECT_THAT(sleeps, IsEmpty());
}

TEST_F(FileLockTest, ANamedPipeIsRefusedWithoutWaiting)
{
    ASSERT_EQ(::mkfifo(dir.File("pipe").c_str(), 0600), 0);
    std::filesystem::create_symlink("pipe", dir.File("link"));
    for (const std::string name : {"pipe", "link"}) {
        CheckInChild([&] {
            FileLock lock(name);
            errno = 0;
            EXPECT_FALSE(lock.lock(Exclusive, 3));
            ExpectLines({Err("openLockedFile", "Failed to open lock file[/tmp/.orvadr_lock/" +
                                                   name + "], errno=Invalid argument"),
                         Err("lock", "Bad fd [-1] to lock [/tmp/.orvadr_lock/" + name + "]")});
            EXPECT_THAT(opened, IsEmpty());
            EXPECT_THAT(sleeps, IsEmpty());

            // The object works once the pipe is gone.
            std::filesystem::remove(dir.File("pipe"));
            MakeLockFile("pipe");
            EXPECT_TRUE(lock.lock(Exclusive, 0));
            std::filesystem::remove(dir.File("pipe"));
            ASSERT_EQ(::mkfifo(dir.File("pipe").c_str(), 0600), 0);
        });
    }
}

TEST_F(FileLockTest, ADirectoryThatCannotBeMadeIsLogged)
{
    WriteFile(dir.File("a"), "in the way");
    FileLock lock("a/b/c");
    EXPECT_FALSE(lock.checkLockDir());
    const std::vector<LogLine> lines = {
        Err("CreateDir", "Failed to create dir [/tmp/.orvadr_lock/a/b] with mode [755]")
            .In("file.cpp"),
        Err("checkLockDir", "Failed to create lock dir [/tmp/.orvadr_lock/a/b] in local host"),
        Err("openLockedFile", "Failed to check lock dir of lock file [/tmp/.orvadr_lock/a/b/c]."),
        Err("lock", "Bad fd [-1] to lock [/tmp/.orvadr_lock/a/b/c]")};
    ExpectLines({lines[0], lines[1]});
    EXPECT_FALSE(lock.openLockedFile());
    ExpectLines({lines[0], lines[1], lines[2]});
    EXPECT_FALSE(lock.lock(Exclusive, 3));
    ExpectLines(lines);
    EXPECT_FALSE(lock.tryLock(Exclusive));
    ExpectLines(lines);
    EXPECT_THAT(opened, IsEmpty());
    EXPECT_THAT(sleeps, IsEmpty());
    EXPECT_EQ(ReadFile(dir.File("a")), "in the way");
}

TEST_F(FileLockTest, TheFileIsOpenedOnce)
{
    FileLock lock("a");
    for (int round = 0; round < 3; ++round) {
        EXPECT_TRUE(lock.openLockedFile());
        EXPECT_TRUE(lock.lock(Exclusive, 0));
        EXPECT_TRUE(lock.tryLock(Shared));
        lock.unlock();
    }
    EXPECT_EQ(opened.size(), 1U);
}

TEST_F(FileLockTest, ReopensWhatIsNoRegularFileEachTime)
{
    std::filesystem::create_symlink("/dev/null", dir.File("a"));
    const std::size_t before = CountDescriptors();
    FileLock lock("a");
    EXPECT_TRUE(lock.openLockedFile());
    EXPECT_TRUE(lock.openLockedFile());
    EXPECT_EQ(opened.size(), 2U);
    EXPECT_EQ(CountDescriptors(), before + 1);
}

// Every lock checks for the directory, even when the file is open.
TEST_F(FileLockTest, FailsWhenTheDirectoryOfAnOpenFileCannotBeMadeAgain)
{
    FileLock lock("a/b");
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    ASSERT_EQ(attempts.size(), 1U);
    std::filesystem::remove_all(dir.File("a"));
    WriteFile(dir.File("a"), "in the way");
    EXPECT_FALSE(lock.lock(Exclusive, 0));
    ExpectLines(
        {Err("CreateDir", "Failed to create dir [/tmp/.orvadr_lock/a] with mode [755]")
             .In("file.cpp"),
         Err("checkLockDir", "Failed to create lock dir [/tmp/.orvadr_lock/a] in local host"),
         Err("openLockedFile", "Failed to check lock dir of lock file [/tmp/.orvadr_lock/a/b]."),
         Err("lock",
             "Bad fd [" + std::to_string(attempts[0].fd) + "] to lock [/tmp/.orvadr_lock/a/b]")});
}

// ------------------------------------------------------------------------------------- excluding

TEST_F(FileLockTest, TwoObjectsOfOneProcessExcludeEachOther)
{
    MakeLockFile("a");
    FileLock first("a");
    FileLock second("a");
    EXPECT_TRUE(first.lock(Exclusive, 0));
    EXPECT_FALSE(second.lock(Exclusive, 0));
    EXPECT_FALSE(second.lock(Shared, 0));
    first.unlock();
    EXPECT_TRUE(second.lock(Exclusive, 0));
    EXPECT_FALSE(first.lock(Exclusive, 0));
}

TEST_F(FileLockTest, LocksWithDifferentNamesAreIndependent)
{
    FileLock first("a");
    FileLock second("b");
    EXPECT_TRUE(first.lock(Exclusive, 0));
    EXPECT_TRUE(second.lock(Exclusive, 0));
}

TEST_F(FileLockTest, ASharedLockExcludesOnlyExclusiveOnes)
{
    MakeLockFile("a");
    FileLock first("a");
    FileLock second("a");
    FileLock third("a");
    EXPECT_TRUE(first.lock(Shared, 0));
    EXPECT_TRUE(second.lock(Shared, 0));
    EXPECT_FALSE(third.lock(Exclusive, 0));
    first.unlock();
    EXPECT_FALSE(third.lock(Exclusive, 0));
    second.unlock();
    EXPECT_TRUE(third.lock(Exclusive, 0));
}

TEST_F(FileLockTest, TheSameObjectMayLockAgain)
{
    MakeLockFile("a");
    FileLock lock("a");
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    EXPECT_TRUE(lock.lock(Shared, 0));  // changes the kind
    EXPECT_TRUE(CanTake("a", Shared));
    EXPECT_FALSE(CanTake("a", Exclusive));
}

TEST_F(FileLockTest, AnotherProcessExcludesThisOne)
{
    MakeLockFile("a");
    ChildProcess holder = Holder("a");
    ASSERT_TRUE(holder.Await());
    FileLock lock("a");
    EXPECT_FALSE(lock.lock(Exclusive, 0));
    EXPECT_FALSE(lock.tryLock(Shared));
    holder.Tell();
    EXPECT_EQ(holder.Join(), 0);
    EXPECT_TRUE(lock.lock(Exclusive, 0));
}

TEST_F(FileLockTest, AKilledProcessLeavesNoLock)
{
    MakeLockFile("a");
    ChildProcess holder = Holder("a");
    ASSERT_TRUE(holder.Await());
    EXPECT_FALSE(CanTake("a"));
    holder.Kill(SIGKILL);
    EXPECT_EQ(holder.Join(), 128 + SIGKILL);
    EXPECT_TRUE(CanTake("a"));
}

TEST_F(FileLockTest, AForkedChildSharesTheLock)
{
    MakeLockFile("a");
    FileLock lock("a");
    ASSERT_TRUE(lock.lock(Exclusive, 0));
    CheckInChild([&] {
        EXPECT_FALSE(CanTake("a"));
        EXPECT_TRUE(lock.lock(Exclusive, 0));
    });
    EXPECT_FALSE(CanTake("a"));  // the end of the child freed nothing
    CheckInChild([&] { lock.unlock(); });
    EXPECT_TRUE(CanTake("a"));
}

TEST_F(FileLockTest, ALockEndsOnlyWhenParentAndChildHaveClosedIt)
{
    MakeLockFile("a");
    std::optional<FileLock> lock;
    lock.emplace("a");
    ASSERT_TRUE(lock->lock(Exclusive, 0));
    ChildProcess child([](ChildProcess::Link& link) { link.Await(); });
    lock.reset();
    EXPECT_FALSE(CanTake("a"));
    child.Tell();
    EXPECT_EQ(child.Join(), 0);
    EXPECT_TRUE(CanTake("a"));
}

TEST_F(FileLockTest, ExcludesTheFlockProgram)
{
    const std::string lockFile = MakeLockFile("a");
    const auto flockCanTake = [&] {
        return CoreLibExec("/usr/bin/flock", "-n", lockFile.c_str(), "/bin/true", nullptr) == 0;
    };
    FileLock lock("a");
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    EXPECT_FALSE(flockCanTake());
    lock.unlock();
    EXPECT_TRUE(flockCanTake());
}

TEST_F(FileLockTest, IsExcludedByTheFlockProgram)
{
    const std::string lockFile = MakeLockFile("a");
    const std::string end = dir.File("end");
    ASSERT_EQ(::mkfifo(end.c_str(), 0600), 0);
    FILE* holder = CoreLibPopen("/usr/bin/flock", "r", lockFile.c_str(), "/bin/sh", "-c",
                                "echo held; read line <\"$0\"", end.c_str(), nullptr);
    ASSERT_NE(holder, nullptr);
    std::array<char, 16> line{};
    EXPECT_NE(std::fgets(line.data(), line.size(), holder), nullptr);
    EXPECT_STREQ(line.data(), "held\n");
    EXPECT_FALSE(CanTake("a"));
    EXPECT_FALSE(CanTake("a", Shared));
    WriteFile(end, "\n");
    EXPECT_EQ(CoreLibPclose(holder), 0);
    EXPECT_TRUE(CanTake("a"));
}

// ---------------------------------------------------------------------------------- lock, tryLock

TEST_F(FileLockTest, PassesTheOperationToFlockUnchanged)
{
    FileLock lock("a");
    std::vector<int> operations;
    faults.flock = [&](int /*fd*/, int operation) {
        operations.push_back(operation);
        return 0;
    };
    EXPECT_TRUE(lock.lock(LOCK_SH, 0));
    EXPECT_TRUE(lock.lock(LOCK_EX | LOCK_NB, 0));
    EXPECT_TRUE(lock.lock(1234, 0));
    EXPECT_TRUE(lock.tryLock(LOCK_EX));
    lock.unlock();
    EXPECT_THAT(operations,
                ElementsAre(LOCK_SH, LOCK_EX | LOCK_NB, 1234, LOCK_EX, LOCK_UN, LOCK_UN));
}

TEST_F(FileLockTest, PausesASecondBetweenAttemptsAndNotAfterTheLast)
{
    MakeLockFile("a");
    ChildProcess holder = Holder("a");
    ASSERT_TRUE(holder.Await());
    for (const unsigned int retries : {0U, 1U, 3U}) {
        attempts.clear();
        sleeps.clear();
        EXPECT_FALSE(FileLock("a").lock(Exclusive, retries));
        EXPECT_EQ(attempts.size(), retries + 1);
        EXPECT_EQ(sleeps, std::vector<unsigned int>(retries, 1));
    }
}

TEST_F(FileLockTest, TheNextAttemptTakesALockThatHasBecomeFree)
{
    MakeLockFile("a");
    ChildProcess holder = Holder("a");
    ASSERT_TRUE(holder.Await());
    faults.sleep = [&](unsigned int seconds) {
        sleeps.push_back(seconds);
        if (sleeps.size() == 2) {
            holder.Tell();
            EXPECT_EQ(holder.Join(), 0);
        }
        return 0U;
    };
    FileLock lock("a");
    EXPECT_TRUE(lock.lock(Exclusive, 5));
    EXPECT_EQ(attempts.size(), 3U);
    EXPECT_THAT(sleeps, ElementsAre(1, 1));
    EXPECT_FALSE(CanTake("a"));
}

TEST_F(FileLockTest, WithoutLockNbOneAttemptWaits)
{
    const std::string lockFile = MakeLockFile("a");
    ChildProcess holder([&](ChildProcess::Link& link) {
        FileLock lock("a");
        if (lock.lock(Exclusive, 0)) link.Tell();
        link.Await();
        WriteFile(lockFile, "was here");  // before the lock becomes free
    });
    ASSERT_TRUE(holder.Await());
    faults.flock = [&](int fd, int operation) {
        attempts.push_back({fd, operation});
        holder.Tell();
        return RealFlock(fd, operation);
    };
    FileLock lock("a");
    EXPECT_TRUE(lock.lock(LOCK_EX, 0));
    EXPECT_EQ(ReadFile(lockFile), "was here");
    EXPECT_EQ(attempts.size(), 1U);
    EXPECT_EQ(holder.Join(), 0);
}

TEST_F(FileLockTest, AnInterruptedWaitCountsAsAFailedAttempt)
{
    faults.flock = [&](int fd, int operation) {
        attempts.push_back({fd, operation});
        return attempts.size() < 3 ? Failing(EINTR)() : RealFlock(fd, operation);
    };
    EXPECT_FALSE(FileLock("a").lock(LOCK_EX, 1));
    EXPECT_THAT(sleeps, ElementsAre(1));
    std::filesystem::remove(dir.File("a"));
    EXPECT_TRUE(FileLock("a").lock(LOCK_EX, 0));
}

TEST_F(FileLockTest, TryLockLeavesTheLockFree)
{
    MakeLockFile("a");
    FileLock lock("a");
    EXPECT_TRUE(lock.tryLock(Exclusive));
    EXPECT_TRUE(CanTake("a"));
    EXPECT_TRUE(lock.tryLock(Shared));
    EXPECT_TRUE(CanTake("a"));
}

// It is a probe, which never leaves the lock held.
TEST_F(FileLockTest, TryLockFreesALockThatWasHeldBefore)
{
    MakeLockFile("a");
    FileLock lock("a");
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    EXPECT_TRUE(lock.tryLock(Exclusive));
    EXPECT_TRUE(CanTake("a"));
}

TEST_F(FileLockTest, TryLockMakesOneAttemptWithoutAPause)
{
    MakeLockFile("a");
    ChildProcess holder = Holder("a");
    ASSERT_TRUE(holder.Await());
    FileLock lock("a");
    EXPECT_FALSE(lock.tryLock(Exclusive));
    EXPECT_EQ(attempts.size(), 1U);
    EXPECT_THAT(sleeps, IsEmpty());
}

TEST_F(FileLockTest, TryLockTellsWhetherALockOfThatKindIsFree)
{
    MakeLockFile("a");
    ChildProcess holder = Holder("a", Shared);
    ASSERT_TRUE(holder.Await());
    FileLock lock("a");
    EXPECT_TRUE(lock.tryLock(Shared));
    EXPECT_FALSE(lock.tryLock(Exclusive));
}

// ----------------------------------------------------------------------------------------- unlock

TEST_F(FileLockTest, UnlockFreesTheLockAndKeepsTheFileOpen)
{
    MakeLockFile("a");
    const std::size_t before = CountDescriptors();
    FileLock lock("a");
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    lock.unlock();
    EXPECT_TRUE(CanTake("a"));
    EXPECT_EQ(CountDescriptors(), before + 1);
    lock.unlock();  // no failure, though the lock is free
}

TEST_F(FileLockTest, UnlockBeforeTheFirstUseDoesNothing)
{
    const FileLock lock("a");
    lock.unlock();
    EXPECT_THAT(attempts, IsEmpty());
    EXPECT_THAT(opened, IsEmpty());
}

TEST_F(FileLockTest, AFailedUnlockIsLogged)
{
    FileLock lock("a");
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    ASSERT_EQ(attempts.size(), 1U);
    faults.flock = Failing(ENOLCK);
    lock.unlock();
    ExpectLines(
        {Err("unlock", "Failed to unlock [/tmp/.orvadr_lock/a] with fd [" +
                           std::to_string(attempts[0].fd) + "], errno=[No locks available]")});
}

TEST_F(FileLockTest, TryLockSucceedsEvenIfTheLockCannotBeFreed)
{
    FileLock lock("a");
    int held = -1;
    faults.flock = [&](int fd, int operation) {
        held = fd;
        return operation == LOCK_UN ? Failing(EINVAL)() : RealFlock(fd, operation);
    };
    EXPECT_TRUE(lock.tryLock(Exclusive));
    ExpectLines({Err("unlock", "Failed to unlock [/tmp/.orvadr_lock/a] with fd [" +
                                   std::to_string(held) + "], errno=[Invalid argument]")});
}

TEST_F(FileLockTest, DestructionFreesTheLockAndClosesTheFile)
{
    MakeLockFile("a");
    const std::size_t before = CountDescriptors();
    {
        FileLock lock("a");
        EXPECT_TRUE(lock.lock(Exclusive, 0));
        attempts.clear();
    }
    EXPECT_THAT(attempts, IsEmpty());  // closing frees it
    EXPECT_EQ(CountDescriptors(), before);
    EXPECT_TRUE(CanTake("a"));
}

// The contract: unlock() ignores descriptor 0, all others do not.
TEST_F(FileLockTest, UnlockOfDescriptorZeroDoesNothing)
{
    MakeLockFile("a");
    CheckInChild([&] {
        ::close(STDIN_FILENO);
        {
            FileLock lock("a");
            ASSERT_TRUE(lock.lock(Exclusive, 0));
            ASSERT_EQ(attempts.size(), 1U);
            ASSERT_EQ(attempts[0].fd, STDIN_FILENO);
            lock.unlock();
            EXPECT_EQ(attempts.size(), 1U);
            EXPECT_FALSE(CanTake("a"));

            EXPECT_TRUE(lock.lock(Exclusive, 0));
            EXPECT_EQ(opened.size(), 2U);  // by CanTake() and by the first lock()
            EXPECT_FALSE(lock.setLockFile("b"));
        }
        EXPECT_FALSE(IsDescriptorOpen(STDIN_FILENO));
        EXPECT_TRUE(CanTake("a"));
        ExpectLines({Err("setLockFile",
                         "File [/tmp/.orvadr_lock/a] has been open, can not set "
                         "file path to [/tmp/.orvadr_lock/b]")});
    });
}

TEST_F(FileLockTest, ReopensAFileThatSomebodyElseHasClosed)
{
    MakeLockFile("a");
    CheckInChild([&] {
        ::close(STDIN_FILENO);
        FileLock lock("a");
        ASSERT_TRUE(lock.openLockedFile());
        ::close(STDIN_FILENO);
        EXPECT_TRUE(lock.lock(Exclusive, 0));
        EXPECT_EQ(opened.size(), 2U);
        EXPECT_FALSE(CanTake("a"));
        ExpectLines({});
    });
}

// ------------------------------------------------------------------------------------ setLockFile

TEST_F(FileLockTest, TheNameMayChangeUntilTheFileIsOpen)
{
    FileLock lock;
    EXPECT_TRUE(lock.setLockFile("a"));
    EXPECT_TRUE(lock.setLockFile("b"));
    EXPECT_TRUE(lock.setLockFile("b"));
    EXPECT_TRUE(lock.openLockedFile());
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("b"));

    EXPECT_TRUE(lock.setLockFile("b"));
    EXPECT_FALSE(lock.setLockFile("c"));
    ExpectLines({Err("setLockFile",
                     "File [/tmp/.orvadr_lock/b] has been open, can not set file "
                     "path to [/tmp/.orvadr_lock/c]")});
    EXPECT_FALSE(lock.setLockFile("/b"));  // another name of the same file
    ExpectLines({Err("setLockFile",
                     "File [/tmp/.orvadr_lock/b] has been open, can not set file "
                     "path to [/tmp/.orvadr_lock//b]")});
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    lock.unlock();
    EXPECT_TRUE(lock.setLockFile("b"));
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("b"));
}

TEST_F(FileLockTest, AnEmptyNameIsRefusedAndChangesNothing)
{
    FileLock lock("a");
    EXPECT_FALSE(lock.setLockFile(""));
    ExpectLines({Err("setLockFile", "Failed to set lock path []")});
    EXPECT_TRUE(lock.openLockedFile());
    EXPECT_FALSE(lock.setLockFile(""));
    ExpectLines({Err("setLockFile", "Failed to set lock path []")});
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("a"));
}

TEST_F(FileLockTest, TheNameMayChangeAfterAFileCouldNotBeOpened)
{
    std::filesystem::create_directory(dir.File("a"));
    FileLock lock("a");
    EXPECT_FALSE(lock.openLockedFile());
    EXPECT_EQ(TakeLines().size(), 1U);
    EXPECT_TRUE(lock.setLockFile("b"));
    EXPECT_TRUE(lock.lock(Exclusive, 0));
}

}  // namespace
