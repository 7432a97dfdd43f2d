// How a refresh sets its mark before it begins and removes it at its end.
#include <orvadrcore/cache.h>

#include <gmock/gmock.h>
#include <orvacore/orvacore.h>
#include <sys/file.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <optional>
#include <string>

#include "support/fixtures/cache_update_fixture.h"
#include "support/fixtures/test_files.h"

namespace {

using ::testing::ElementsAre;

class CacheMarkTest : public CacheUpdateFixture {};

// ---------------------------------------------------------------------------------------- marking

TEST_F(CacheMarkTest, WithoutTheMarkingLockThereIsNoRefresh)
{
    WriteStale("old");
    NoteLocking();
    const HeldLock look(lockFile, LOCK_SH);  // others can read the mark, but not set it
    EXPECT_EQ(waiting.Read(), "old");
    EXPECT_THAT(locking, ElementsAre(Probe, Probe, Mark, Mark, Mark, Mark, Mark, Mark));
    ExpectSleeps(5);
    ExpectLines({Debug("SetUpdating", "Failed to lock [" + lockPath + "]"), UsesOldData()});
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 0U);
    EXPECT_FALSE(IsMarked());
}

TEST_F(CacheMarkTest, TheNextAttemptTakesAMarkingLockThatHasBecomeFree)
{
    std::optional<HeldLock> look;
    look.emplace(lockFile, LOCK_SH);
    OnLocking(5, [&] {  // the third attempt to mark
        look.reset();
        return std::nullopt;
    });
    EXPECT_TRUE(waiting.Update());
    EXPECT_THAT(locking, ElementsAre(Probe, Probe, Mark, Mark, Mark, Probe, Probe));
    ExpectSleeps(2);
    ExpectLines({Start(), Finish()});
}

TEST_F(CacheMarkTest, AMarkingLockThatCannotBeOpenedIsLoggedByTheLockToo)
{
    FailOpeningLock(3);
    EXPECT_FALSE(waiting.Update());
    ExpectLines(
        Joined({LockIsNotOpened(), {Debug("SetUpdating", "Failed to lock [" + lockPath + "]")}}));
    ExpectSleeps(0);
    EXPECT_FALSE(IsMarked());
}

TEST_F(CacheMarkTest, AnUpdaterThatAppearsBetweenTheTwoChecksIsLeftAlone)
{
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    const std::string marked = ReadFile(pidPath);
    std::filesystem::remove(pidPath);
    OnLocking(2, [&] {
        WriteFile(pidPath, marked);
        return std::nullopt;
    });
    EXPECT_FALSE(waiting.Update());  // without a log line
    EXPECT_THAT(locking, ElementsAre(Probe, Probe));
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 0U);
    EXPECT_EQ(ReadFile(pidPath), marked);
}

TEST_F(CacheMarkTest, AnUpdaterThatAppearsBeforeTheMarkingIsLeftAlone)
{
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    const std::string marked = ReadFile(pidPath);
    std::filesystem::remove(pidPath);
    OnLocking(3, [&] {
        WriteFile(pidPath, marked);
        return std::nullopt;
    });
    WriteStale("old");
    EXPECT_EQ(waiting.Read(), "old");
    ExpectLines({Debug("SetUpdating", "there is other process to update cache [" + path + "]"),
                 UsesOldData()});
    EXPECT_THAT(locking, ElementsAre(Probe, Probe, Mark));
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 0U);
    EXPECT_EQ(ReadFile(pidPath), marked);
    EXPECT_FALSE(IsLocked(lockFile));
}

TEST_F(CacheMarkTest, WithoutAPidFileThereIsNoRefresh)
{
    WriteStale("old");
    std::filesystem::create_directory(pidPath);  // no file can replace it
    EXPECT_EQ(waiting.Read(), "old");
    ExpectLines(
        {Debug("SetUpdating", "Failed to set cache [" + path + "] updating"), UsesOldData()});
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 0U);
    EXPECT_FALSE(IsLocked(lockFile));
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("status.cached", "status.cached.pid"));
}

// -------------------------------------------------------------------------------------- unmarking

TEST_F(CacheMarkTest, KeepsTheMarkOfAnotherLivingProcess)
{
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    const std::string marked = ReadFile(pidPath);
    std::filesystem::remove(pidPath);
    waiting.produce = [&](Json::Value& data) {
        WriteFile(pidPath, marked);
        data = "new";
        return true;
    };
    EXPECT_TRUE(waiting.Update());
    ExpectLines({Start(), Debug("UnsetUpdating", "Failed to unset updating cache [" + pidPath +
                                                     "] since different pid[" +
                                                     std::to_string(updater.Pid()) + "]")});
    EXPECT_EQ(ReadFile(pidPath), marked);
    EXPECT_FALSE(IsLocked(lockFile));
    EXPECT_EQ(Document()["cached_data"], "new");
}

TEST_F(CacheMarkTest, RemovesAMarkThatNamesNoLivingProcess)
{
    const ChildProcess somebody([](ChildProcess::Link& link) { link.Await(); });
    const std::string reused = std::to_string(somebody.Pid()) + "\n1\n";
    for (const std::string& content : {reused, std::string("garbage"), std::string()}) {
        waiting.produce = [&](Json::Value& data) {
            WriteFile(pidPath, content);
            data = "new";
            return true;
        };
        EXPECT_TRUE(waiting.Update());
        ExpectLines({Start(), Finish()});
        EXPECT_FALSE(IsMarked());
    }
    waiting.produce = [&](Json::Value& data) {
        std::filesystem::remove(pidPath);
        data = "new";
        return true;
    };
    EXPECT_TRUE(waiting.Update());
    ExpectLines({Start(), Finish()});
}

// The contract: for all others, and for itself, this process is the updater as long as it lives.
TEST_F(CacheMarkTest, WithoutTheLockTheMarkStaysAndNothingIsLogged)
{
    NoteLocking();
    std::optional<HeldLock> other;
    waiting.produce = [&](Json::Value& data) {
        locking.clear();
        other.emplace(lockFile, LOCK_EX);
        data = "new";
        return true;
    };
    EXPECT_TRUE(waiting.Update());
    ExpectLines({Start()});
    EXPECT_THAT(locking, ElementsAre(Probe, Probe, Probe, Probe, Probe, Probe));
    ExpectSleeps(5);
    EXPECT_EQ(CoreLibReadPidFile(pidPath.c_str()), ::getpid());

    other.reset();
    waiting.TakeCalls();
    EXPECT_TRUE(waiting.Update());
    ExpectLines({StartWait(), FinishWait()});  // the file is fresh
    ExpectPauses(1, ShortestWaitPause);
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 0U);
}

TEST_F(CacheMarkTest, ALockThatCanNoLongerBeOpenedLeavesTheMark)
{
    FailOpeningLock(4);
    EXPECT_TRUE(waiting.Update());
    ExpectLines(Joined({{Start()}, LockIsNotOpened()}));
    EXPECT_TRUE(IsMarked());
}

TEST_F(CacheMarkTest, WithoutTheSecondLockAMissingMarkCountsAsAnothers)
{
    OnLocking(5, [] { return Failing(EWOULDBLOCK)(); });
    waiting.produce = [&](Json::Value& data) {
        std::filesystem::remove(pidPath);
        data = "new";
        return true;
    };
    EXPECT_TRUE(waiting.Update());
    ExpectLines({Start(), Debug("UnsetUpdating", "Failed to unset updating cache [" + pidPath +
                                                     "] since different pid[0]")});
    ExpectSleeps(5);

    waiting.produce = [](Json::Value& data) {
        data = "newer";
        return true;
    };
    locking.clear();
    EXPECT_TRUE(waiting.Update());
    ExpectLines({Start(), Finish()});  // the pid file names this process
    EXPECT_FALSE(IsMarked());
    ExpectSleeps(5);
}

}  // namespace
