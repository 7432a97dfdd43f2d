// Whom a lock excludes, how often taking it is tried, and how it is freed.
#include <orvadrcore/file_lock.h>

#include <gmock/gmock.h>
#include <orvacore/orvacore.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "support/fixtures/file_lock_fixture.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"

namespace {

using OrvaDRCore::FileLock;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class FileLockTakingTest : public FileLockFixture {};

// ------------------------------------------------------------------------------------- excluding

TEST_F(FileLockTakingTest, TwoObjectsOfOneProcessExcludeEachOther)
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

TEST_F(FileLockTakingTest, LocksWithDifferentNamesAreIndependent)
{
    FileLock first("a");
    FileLock second("b");
    EXPECT_TRUE(first.lock(Exclusive, 0));
    EXPECT_TRUE(second.lock(Exclusive, 0));
}

TEST_F(FileLockTakingTest, ASharedLockExcludesOnlyExclusiveOnes)
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

TEST_F(FileLockTakingTest, TheSameObjectMayLockAgain)
{
    MakeLockFile("a");
    FileLock lock("a");
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    EXPECT_TRUE(lock.lock(Shared, 0));  // changes the kind
    EXPECT_TRUE(CanTake("a", Shared));
    EXPECT_FALSE(CanTake("a", Exclusive));
}

TEST_F(FileLockTakingTest, AnotherProcessExcludesThisOne)
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

TEST_F(FileLockTakingTest, AKilledProcessLeavesNoLock)
{
    MakeLockFile("a");
    ChildProcess holder = Holder("a");
    ASSERT_TRUE(holder.Await());
    EXPECT_FALSE(CanTake("a"));
    holder.Kill(SIGKILL);
    EXPECT_EQ(holder.Join(), 128 + SIGKILL);
    EXPECT_TRUE(CanTake("a"));
}

TEST_F(FileLockTakingTest, AForkedChildSharesTheLock)
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

TEST_F(FileLockTakingTest, ALockEndsOnlyWhenParentAndChildHaveClosedIt)
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

TEST_F(FileLockTakingTest, ExcludesTheFlockProgram)
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

TEST_F(FileLockTakingTest, IsExcludedByTheFlockProgram)
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

TEST_F(FileLockTakingTest, PassesTheOperationToFlockUnchanged)
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

TEST_F(FileLockTakingTest, PausesASecondBetweenAttemptsAndNotAfterTheLast)
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

TEST_F(FileLockTakingTest, TheNextAttemptTakesALockThatHasBecomeFree)
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

TEST_F(FileLockTakingTest, WithoutLockNbOneAttemptWaits)
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

TEST_F(FileLockTakingTest, AnInterruptedWaitCountsAsAFailedAttempt)
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

TEST_F(FileLockTakingTest, TryLockLeavesTheLockFree)
{
    MakeLockFile("a");
    FileLock lock("a");
    EXPECT_TRUE(lock.tryLock(Exclusive));
    EXPECT_TRUE(CanTake("a"));
    EXPECT_TRUE(lock.tryLock(Shared));
    EXPECT_TRUE(CanTake("a"));
}

// It is a probe, which never leaves the lock held.
TEST_F(FileLockTakingTest, TryLockFreesALockThatWasHeldBefore)
{
    MakeLockFile("a");
    FileLock lock("a");
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    EXPECT_TRUE(lock.tryLock(Exclusive));
    EXPECT_TRUE(CanTake("a"));
}

TEST_F(FileLockTakingTest, TryLockMakesOneAttemptWithoutAPause)
{
    MakeLockFile("a");
    ChildProcess holder = Holder("a");
    ASSERT_TRUE(holder.Await());
    FileLock lock("a");
    EXPECT_FALSE(lock.tryLock(Exclusive));
    EXPECT_EQ(attempts.size(), 1U);
    EXPECT_THAT(sleeps, IsEmpty());
}

TEST_F(FileLockTakingTest, TryLockTellsWhetherALockOfThatKindIsFree)
{
    MakeLockFile("a");
    ChildProcess holder = Holder("a", Shared);
    ASSERT_TRUE(holder.Await());
    FileLock lock("a");
    EXPECT_TRUE(lock.tryLock(Shared));
    EXPECT_FALSE(lock.tryLock(Exclusive));
}

// ----------------------------------------------------------------------------------------- unlock

TEST_F(FileLockTakingTest, UnlockFreesTheLockAndKeepsTheFileOpen)
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

TEST_F(FileLockTakingTest, UnlockBeforeTheFirstUseDoesNothing)
{
    const FileLock lock("a");
    lock.unlock();
    EXPECT_THAT(attempts, IsEmpty());
    EXPECT_THAT(opened, IsEmpty());
}

TEST_F(FileLockTakingTest, AFailedUnlockIsLogged)
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

TEST_F(FileLockTakingTest, TryLockSucceedsEvenIfTheLockCannotBeFreed)
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

TEST_F(FileLockTakingTest, DestructionFreesTheLockAndClosesTheFile)
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
TEST_F(FileLockTakingTest, UnlockOfDescriptorZeroDoesNothing)
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

TEST_F(FileLockTakingTest, ReopensAFileThatSomebodyElseHasClosed)
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

}  // namespace
