// FileLock between processes.
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/file.h>
#include <unistd.h>

#include <atomic>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include <orvadrcore/file.h>
#include <orvadrcore/file_lock.h>
#include <orvadrcore/utils.h>

#include "support/fixtures/process_test.h"
#include "support/fixtures/scale.h"
#include "support/processes/await.h"
#include "support/processes/child_process.h"
#include "support/processes/crowd.h"
#include "support/processes/reap.h"
#include "support/processes/shared_memory.h"
#include "support/processes/traced_process.h"

namespace {

using OrvaDRCore::File;
using OrvaDRCore::FileLock;

constexpr const char* FlockProgram = "/usr/bin/flock";

class FileLockProcessTest : public ProcessTest {
  protected:
    std::string Name() const { return dir.File("lock"); }
    std::string Path() const { return FileLock::getLockFilePath(Name()); }

    bool IsFree(int operation = LOCK_EX) const
    {
        return FileLock(Name()).tryLock(operation | LOCK_NB);
    }

    // A process that takes the lock and holds it until Tell() or until it is killed.
    ChildProcess StartHolder(
        int operation, const std::function<void()>& whileHolding = [] {})
    {
        return ChildProcess([this, operation, whileHolding](ChildProcess::Link& link) {
            FileLock lock(Name());
            if (!lock.lock(operation, 0)) return;
            whileHolding();
            link.Tell();
            link.Await();
        });
    }

    // All operations of the library that start a program.
    using Starter = std::pair<const char*, std::function<void()>>;
    std::vector<Starter> Starters() const
    {
        return {{"CreateDir", [this] { File::CreateDir(dir.File("made"), 0755); }},
                {"RemoveDir", [this] { File::RemoveDir(dir.File("full")); }},
                {"GenerateUUID", [] { OrvaDRCore::GenerateUUID(); }}};
    }
};

// Adds 1 to the number in a file. Two processes at once would lose an increment.
void Increment(const std::string& path)
{
    int number = 0;
    std::ifstream(path) >> number;
    std::ofstream(path) << number + 1;
}

TEST_F(FileLockProcessTest, ProcessesThatIncrementUnderALockLoseNothing)
{
    constexpr int Processes = 8;
    if (!HasLocks()) return;
    const int increments = Scaled(100, 500);
    const std::string counter = dir.File("counter");
    const Crowd crowd(Processes, [&](int) {
        for (int i = 0; i < increments; ++i) {
            FileLock lock(Name());
            if (!lock.lock(LOCK_EX, 0)) ::_exit(2);
            Increment(counter);
        }
    });
    ASSERT_TRUE(crowd.Start());
    EXPECT_TRUE(crowd.Join());

    int sum = 0;
    std::ifstream(counter) >> sum;
    EXPECT_EQ(sum, Processes * increments);
    ReportCount("increments", sum);
}

TEST_F(FileLockProcessTest, TheFlockProgramRespectsOurLock)
{
    if (!HasLocks()) return;
    const auto runFlock = [this] {
        ChildProcess flock([this](ChildProcess::Link& /*link*/) {
            ::execl(FlockProgram, "flock", "--nonblock", "--conflict-exit-code", "75",
                    Path().c_str(), "true", nullptr);
            ::_exit(127);
        });
        return flock.Join();
    };
    FileLock lock(Name());
    ASSERT_TRUE(lock.lock(LOCK_EX, 0));
    EXPECT_EQ(runFlock(), 75);
    lock.unlock();
    EXPECT_EQ(runFlock(), 0);
}

TEST_F(FileLockProcessTest, OurLockRespectsTheFlockProgram)
{
    if (!HasLocks()) return;
    ASSERT_TRUE(FileLock(Name()).openLockedFile());
    const std::string mark = dir.File("mark");
    ChildProcess flock([&](ChildProcess::Link& /*link*/) {
        const std::string holdWhileMarked =
            "touch '" + mark + "'; while [ -e '" + mark + "' ]; do sleep 0.01; done";
        ::execl(FlockProgram, "flock", Path().c_str(), "sh", "-c", holdWhileMarked.c_str(),
                nullptr);
        ::_exit(127);
    });
    ASSERT_TRUE(AwaitUntil([&] { return std::filesystem::exists(mark); }));
    EXPECT_FALSE(IsFree());
    EXPECT_FALSE(IsFree(LOCK_SH));
    std::filesystem::remove(mark);
    EXPECT_EQ(flock.Join(), 0);
    EXPECT_TRUE(IsFree());
}

TEST_F(FileLockProcessTest, SharedLocksExcludeOnlyAnExclusiveOne)
{
    if (!HasLocks()) return;
    ChildProcess one = StartHolder(LOCK_SH);
    ChildProcess another = StartHolder(LOCK_SH);
    ASSERT_TRUE(one.Await());
    ASSERT_TRUE(another.Await());
    EXPECT_TRUE(IsFree(LOCK_SH));
    EXPECT_FALSE(IsFree(LOCK_EX));
    one.Tell();
    EXPECT_EQ(one.Join(), 0);
    EXPECT_FALSE(IsFree(LOCK_EX));
    another.Tell();
    EXPECT_EQ(another.Join(), 0);
    EXPECT_TRUE(IsFree(LOCK_EX));
}

TEST_F(FileLockProcessTest, TheLockOfAKilledProcessIsFree)
{
    if (!HasLocks()) return;
    ChildProcess holder = StartHolder(LOCK_EX);
    ASSERT_TRUE(holder.Await());
    EXPECT_FALSE(IsFree());
    holder.Kill(SIGKILL);
    EXPECT_EQ(holder.Join(), 128 + SIGKILL);
    EXPECT_TRUE(IsFree());
}

TEST_F(FileLockProcessTest, AWaitingProcessGetsTheLockWhenItsHolderIsKilled)
{
    if (!HasLocks()) return;
    ChildProcess holder = StartHolder(LOCK_EX);
    ASSERT_TRUE(holder.Await());
    const SharedMemory<std::atomic<bool>> isHolderDead;
    ChildProcess waiter([&](ChildProcess::Link& link) {
        link.Tell();
        FileLock lock(Name());
        if (!lock.lock(LOCK_EX, 0)) ::_exit(2);
        if (!*isHolderDead) ::_exit(3);
    });
    ASSERT_TRUE(waiter.Await());
    *isHolderDead = true;
    holder.Kill(SIGKILL);
    EXPECT_EQ(waiter.Join(), 0);
}

TEST_F(FileLockProcessTest, AForkedChildKeepsTheLock)
{
    if (!HasLocks()) return;
    auto lock = std::make_unique<FileLock>(Name());
    ASSERT_TRUE(lock->lock(LOCK_EX, 0));
    ChildProcess child([](ChildProcess::Link& link) { link.Await(); });
    lock.reset();
    EXPECT_FALSE(IsFree());
    child.Tell();
    EXPECT_EQ(child.Join(), 0);
    EXPECT_TRUE(IsFree());
}

TEST_F(FileLockProcessTest, AStartedProgramDoesNotKeepTheLockOfAKilledProcess)
{
    if (!HasLocks()) return;
    ASSERT_TRUE(FileLock(Name()).openLockedFile());
    ASSERT_TRUE(std::filesystem::create_directories(dir.File("full/of/directories")));
    for (const auto& [name, start] : Starters()) {
        SCOPED_TRACE(name);
        TracedProcess holder([this, &start = start] {
            FileLock lock(Name());
            if (lock.lock(LOCK_EX, 0)) start();
        });
        const pid_t program = holder.RunToStartedProgram();
        ASSERT_GT(program, 0);
        EXPECT_FALSE(IsFree());
        holder.Kill();
        EXPECT_EQ(::kill(program, 0), 0) << "the program ended too early";
        EXPECT_TRUE(IsFree());
        TracedProcess::Release(program);
        ReapAll();
    }
    // The programs have done their work.
    EXPECT_TRUE(std::filesystem::is_directory(dir.File("made")));
    EXPECT_FALSE(std::filesystem::exists(dir.File("full")));
}

TEST_F(FileLockProcessTest, ALockHeldWhileProgramsWereStartedIsFreeAfterItsHolder)
{
    if (!HasLocks()) return;
    for (const auto& [name, start] : Starters()) {
        SCOPED_TRACE(name);
        ChildProcess holder = StartHolder(LOCK_EX, start);
        ASSERT_TRUE(holder.Await());
        EXPECT_FALSE(IsFree());
        holder.Kill(SIGKILL);
        EXPECT_EQ(holder.Join(), 128 + SIGKILL);
        EXPECT_TRUE(IsFree());
    }
}

}  // namespace
