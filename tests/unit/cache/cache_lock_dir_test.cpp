// Caches whose lock is in a directory of their user.
#include <orvadrcore/cache.h>

#include <gmock/gmock.h>
#include <sys/file.h>
#include <sys/stat.h>

#include <chrono>
#include <filesystem>
#include <string>

#include "support/fixtures/cache_fixture.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"

namespace {

using OrvaDRCore::CacheState;
using std::chrono::milliseconds;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class CacheLockDirTest : public CacheFixture {
  protected:
    TestCache Own(bool updatedRequired = false) const
    {
        return {dir.Path(), "status", Timeout, updatedRequired, 0, ownDir};
    }

    const std::string ownDir = dir.File("locks/mine");
    const std::string ownLock = ownDir + "/status.cached.lock";
    const std::string ownPid = ownDir + "/status.cached.pid";
};

TEST_F(CacheLockDirTest, GetPathIsTheCacheFile)
{
    EXPECT_EQ(cache.GetPath(), path);
    EXPECT_EQ(Own().GetPath(), path);
}

TEST_F(CacheLockDirTest, LockAndPidFileAreInTheDirectory)
{
    const Umask umask(0);
    for (const bool isRead : {false, true}) {
        TestCache own = Own(true);
        own.produce = [this](Json::Value& data) {
            EXPECT_THAT(NamesIn(ownDir), ElementsAre("status.cached.lock", "status.cached.pid"));
            EXPECT_EQ(ModeOf(ownLock), 0600U);
            EXPECT_EQ(ModeOf(ownPid), 0600U);
            EXPECT_FALSE(IsLocked(ownLock));
            data = "new";
            return true;
        };
        Json::Value data;
        if (isRead) {
            data = own.Read();
        } else {
            EXPECT_EQ(own.ReadWithin(milliseconds(0), data), CacheState::Fresh);
        }
        EXPECT_EQ(data, "new");
        EXPECT_THAT(NamesIn(ownDir), ElementsAre("status.cached.lock"));
        EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("locks", "status.cached"));
        EXPECT_EQ(own.Remove(), 0);
    }
    EXPECT_EQ(ModeOf(dir.File("locks")), 0700U);
    EXPECT_EQ(ModeOf(ownDir), 0700U);
    EXPECT_EQ(CountOpened(lockPath), 0U);
    TakeLines();
}

TEST_F(CacheLockDirTest, ACopyKeepsTheDirectory)
{
    WriteStale("old");
    const TestCache own = Own();
    const TestCache copy = own;  // NOLINT(performance-unnecessary-copy-initialization)
    Json::Value data;
    EXPECT_EQ(copy.ReadWithin(milliseconds(0), data), CacheState::Fresh);
    EXPECT_TRUE(std::filesystem::exists(ownLock));
    EXPECT_EQ(CountOpened(lockPath), 0U);
    TakeLines();
}

TEST_F(CacheLockDirTest, WithoutADirectoryTheLockIsTheNamedOne)
{
    WriteStale("old");
    const TestCache named(dir.Path(), "status", Timeout, false, 0, "");
    Json::Value data;
    EXPECT_EQ(named.ReadWithin(milliseconds(0), data), CacheState::Fresh);
    EXPECT_GT(CountOpened(lockPath), 0U);
    TakeLines();
}

TEST_F(CacheLockDirTest, TheDefaultCacheFileHasItsLockThere)
{
    const TestCache own("", "status", Timeout, false, 0, ownDir);
    EXPECT_EQ(own.GetPath(), "/tmp/default_dr_cache");
    Json::Value data;
    own.ReadWithin(milliseconds(0), data);
    EXPECT_THAT(NamesIn(ownDir), ElementsAre("default_dr_cache.lock"));
    TakeLines();
}

TEST_F(CacheLockDirTest, TheLineOfALockThatIsHeldHasItsPath)
{
    WriteStale("old");
    const TestCache own = Own(true);
    std::filesystem::create_directories(ownDir);
    WriteFile(ownLock, "");
    faults.flock = [](int fd, int operation) {
        if (operation != (LOCK_EX | LOCK_NB)) return RealFlock(fd, operation);
        errno = EWOULDBLOCK;
        return -1;
    };
    EXPECT_FALSE(own.Update());
    ExpectLines({Debug("SetUpdating", "Failed to lock [" + ownLock + "]")});
    ExpectSleeps(5);
}

TEST_F(CacheLockDirTest, ADirectoryThatCannotBeMadeCostsNothingButTheLock)
{
    WriteStale("old");
    WriteFile(dir.File("locks"), "in the way");
    const TestCache own = Own();
    Json::Value data;
    EXPECT_EQ(own.ReadWithin(milliseconds(60'000), data), CacheState::Fresh);
    EXPECT_EQ(data, "new");
    ExpectLines(
        {Err("checkLockDir", "Failed to create lock dir [" + ownDir + "] in local host")
             .In("file_lock.cpp"),
         Err("openLockedFile", "Failed to check lock dir of lock file [" + ownLock + "].")
             .In("file_lock.cpp"),
         Err("acquire", "Bad fd [-1] to lock [" + ownLock + "]").In("file_lock.cpp"),
         Warn("ReadWithin", "Failed to lock cache [" + path + "], refreshed it all the same")});
}

TEST_F(CacheLockDirTest, AnOrdinaryUserReadsAndRefreshesAgainAndAgain)
{
    CheckAsOrdinaryUser(dir, [this] {
        for (int round = 0; round < 3; ++round) {
            Json::Value data;
            const TestCache own = Own(true);
            EXPECT_EQ(own.ReadWithin(milliseconds(0), data), CacheState::Fresh);
            EXPECT_EQ(data, "new");
            WriteStale("old");
            EXPECT_EQ(own.Read(), "new");
            WriteStale("old");
        }
        EXPECT_THAT(NamesIn(ownDir), ElementsAre("status.cached.lock"));
        TakeLines();
    });
}

}  // namespace
