// A reader waits for the refresh of another process.
#include <orvadrcore/cache.h>

#include <signal.h>
#include <sys/file.h>

#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "support/fixtures/cache_update_fixture.h"
#include "support/fixtures/test_files.h"

namespace {

class CacheWaitingTest : public CacheUpdateFixture {};

TEST_F(CacheWaitingTest, WaitingEndsWhenTheFileIsFresh)
{
    WriteStale("old");
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    const std::string marked = ReadFile(pidPath);
    pauses.OnPause([this](std::size_t number) {
        EXPECT_FALSE(IsLocked(lockFile));
        if (number == 3) WriteCache("written by the updater");
    });
    EXPECT_EQ(waiting.Read(), "written by the updater");
    ExpectPauses(3, ShortestWaitPause);
    ExpectLines({StartWait(), FinishWait()});
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 0U);
    EXPECT_EQ(ReadFile(pidPath), marked);
}

TEST_F(CacheWaitingTest, WaitingEndsWhenTheUpdaterDies)
{
    WriteStale("old");
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    pauses.OnPause([&](std::size_t number) {
        if (number != 2) return;
        updater.Kill(SIGKILL);
        EXPECT_EQ(updater.Join(), 128 + SIGKILL);
    });
    EXPECT_EQ(waiting.Read(), "old");  // what the file holds
    ExpectPauses(2, ShortestWaitPause);
    ExpectLines({StartWait(), FinishWait()});
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 0U);
    EXPECT_TRUE(IsMarked());
    EXPECT_EQ(waiting.Read(), "new");  // the next read finds it dead
    ExpectLines({Start(), Finish()});
}

TEST_F(CacheWaitingTest, WaitingEndsWhenThePidFileIsGone)
{
    WriteStale("old");
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    pauses.OnPause([this](std::size_t number) {
        if (number == 4) std::filesystem::remove(pidPath);
    });
    EXPECT_TRUE(waiting.Update());
    ExpectPauses(4, ShortestWaitPause);
    ExpectLines({StartWait(), FinishWait()});
    EXPECT_EQ(waiting.GetCachedData(), "old");
}

// Only the age counts here, neither validity nor need.
TEST_F(CacheWaitingTest, WaitingTakesOnePauseWhenTheFileIsNotTooOld)
{
    WriteCache("old");
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    cache.isNeedUpdate = waiting.isNeedUpdate = [](const Json::Value&) { return true; };
    cache.isValid = [](const Json::Value&) { return false; };
    for (TestCache* each : {&cache, &waiting}) {
        EXPECT_EQ(each->Read(), "old");
        ExpectPauses(1, ShortestWaitPause);
        ExpectLines({StartWait(), FinishWait()});
    }
}

TEST_F(CacheWaitingTest, TheFirstReadersWaitForTheMissingFile)
{
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    pauses.OnPause([this](std::size_t number) {
        if (number == 2) WriteCache("first");
    });
    EXPECT_EQ(cache.Read(), "first");
    ExpectPauses(2, ShortestWaitPause);
    ExpectLines({NoData(), UsesDefault(), NoData(), UsesDefault(), StartWait(), FinishWait()});
}

TEST_F(CacheWaitingTest, WaitingContinuesWhileTheLockCannotBeTaken)
{
    WriteStale("old");
    NoteLocking();
    std::optional<HeldLock> other;
    other.emplace(lockFile, LOCK_EX);
    pauses.OnPause([&](std::size_t number) {
        if (number == 3) other.reset();
    });
    EXPECT_TRUE(waiting.Update());
    ExpectPauses(3, ShortestWaitPause);
    ExpectSleeps(15);  // of the first check, and of those after two pauses
    EXPECT_EQ(locking, std::vector<int>(19, Probe));
    ExpectLines({StartWait(), FinishWait()});
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 0U);
}

TEST_F(CacheWaitingTest, WaitingForALockEndsWhenTheFileIsFresh)
{
    WriteStale("old");
    FailOpeningLock(1);
    pauses.OnPause([this](std::size_t number) {
        if (number == 2) WriteCache("fresh");
    });
    EXPECT_EQ(waiting.Read(), "fresh");
    ExpectPauses(2, ShortestWaitPause);
    ExpectLines(Joined(
        {LockIsNotOpened(), {StartWait()}, LockIsNotOpened(), LockIsNotOpened(), {FinishWait()}}));
}

}  // namespace
