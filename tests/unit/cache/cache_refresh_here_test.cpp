// A refresh in the process that reads.
#include <orvadrcore/cache.h>

#include <gmock/gmock.h>
#include <orvacore/orvacore.h>
#include <sys/file.h>
#include <unistd.h>

#include <cerrno>
#include <functional>
#include <optional>
#include <set>
#include <stdexcept>
#include <string>
#include <vector>

#include "support/fixtures/cache_update_fixture.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"

namespace {

using ::testing::Contains;
using ::testing::ElementsAre;

class CacheRefreshHereTest : public CacheUpdateFixture {};

TEST_F(CacheRefreshHereTest, TheFirstReadRefreshesInTheCaller)
{
    FailForks(EAGAIN);
    const pid_t self = ::getpid();
    cache.produce = [&](Json::Value& data) {
        EXPECT_EQ(::getpid(), self);
        data = "new";
        return true;
    };
    EXPECT_EQ(cache.Read(), "new");
    ExpectLines({NoData(), UsesDefault(), NoData(), UsesDefault(), Start(), Finish()});
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("status.cached"));
    EXPECT_THAT(cache.TakeCalls(),
                ElementsAre("GetDefaultValue", "IsUpdatedDataRequired", "GetDefaultValue",
                            "IsValidData", "GetUpdatedData", "IsValidData", "GetInfo"));
    EXPECT_EQ(cache.Read(), "new");
    EXPECT_EQ(cache.CountCalls("GetUpdatedData"), 0U);
}

TEST_F(CacheRefreshHereTest, UpdateRefreshesFreshDataToo)
{
    WriteCache("old");
    EXPECT_TRUE(waiting.Update());
    ExpectLines({Start(), Finish()});
    EXPECT_EQ(waiting.GetCachedData(), "new");
}

TEST_F(CacheRefreshHereTest, DuringARefreshTheCacheIsMarkedAndNoLockIsHeld)
{
    NoteLocking();
    waiting.produce = [this](Json::Value& data) {
        EXPECT_THAT(locking, ElementsAre(Probe, Probe, Mark));
        EXPECT_FALSE(IsLocked(lockFile));
        EXPECT_EQ(CoreLibReadPidFile(pidPath.c_str()), ::getpid());
        locking.clear();
        data = "new";
        return true;
    };
    EXPECT_TRUE(waiting.Update());
    EXPECT_THAT(locking, ElementsAre(Probe, Probe));
    EXPECT_FALSE(IsLocked(lockFile));
    EXPECT_FALSE(IsMarked());
    EXPECT_EQ(ReadFile(lockFile), "");
    ExpectLines({Start(), Finish()});
    ExpectSleeps(0);
}

// A program that another thread starts meanwhile inherits the descriptor.
TEST_F(CacheRefreshHereTest, EveryLockIsUnlockedBeforeItsFileIsClosed)
{
    std::set<int> held;
    int locks = 0;
    int closed = 0;
    faults.flock = [&](int fd, int operation) {
        const int result = RealFlock(fd, operation);
        if (result != 0 || !IsLockFile(fd)) return result;
        if (operation == LOCK_UN) {
            held.erase(fd);
        } else {
            held.insert(fd);
            ++locks;
        }
        return result;
    };
    faults.close = [&](int fd) {
        if (IsLockFile(fd)) {
            ++closed;
            EXPECT_EQ(held.count(fd), 0U) << "closed while it is locked";
        }
        return RealClose(fd);
    };
    EXPECT_TRUE(waiting.Update());
    EXPECT_EQ(locks, 5);
    EXPECT_EQ(closed, 5);

    WriteFile(pidPath, "1");  // a living process's
    WriteStale("old");
    EXPECT_TRUE(cache.Update());
    EXPECT_EQ(locks, 6);
    EXPECT_EQ(closed, 6);
    ExpectLines({Start(), Finish()});
}

TEST_F(CacheRefreshHereTest, ALockOnDescriptorZeroIsUnlockedToo)
{
    CheckInChild([this] {
        ASSERT_EQ(::close(STDIN_FILENO), 0);
        std::vector<int> unlocked;
        faults.flock = [&](int fd, int operation) {
            if (operation == LOCK_UN) unlocked.push_back(fd);
            return RealFlock(fd, operation);
        };
        EXPECT_TRUE(waiting.Update());
        EXPECT_THAT(unlocked, Contains(STDIN_FILENO));
        ExpectLines({Start(), Finish()});
    });
}

// Readers of the mark take the lock shared.
TEST_F(CacheRefreshHereTest, ReadingTheMarkExcludesNoOtherReader)
{
    std::optional<HeldLock> look;
    waiting.produce = [&](Json::Value& data) {
        look.emplace(lockFile, LOCK_SH);
        data = "new";
        return true;
    };
    EXPECT_TRUE(waiting.Update());
    ExpectLines({Start(), Finish()});
    EXPECT_FALSE(IsMarked());
    ExpectSleeps(0);
}

TEST_F(CacheRefreshHereTest, AFailedRefreshIsLoggedAndUnmarked)
{
    struct Row {
        const char* what;
        std::function<bool(Json::Value&)> produce;
        std::function<int(int)> fsync;
        LogLine line;
    };
    const auto nothing = [](Json::Value&) { return false; };
    const auto invalid = [](Json::Value&) { return true; };
    const auto valid = [](Json::Value& data) {
        data = "new";
        return true;
    };
    // The cache file cannot be written once the pid file is.
    const auto fail = [this](int fd) { return IsMarked() ? Failing(ENOSPC)() : RealFsync(fd); };
    const std::vector<Row> table = {
        {"nothing produced", nothing, nullptr, ProducedNothing()},
        {"invalid data", invalid, nullptr,
         Debug("UpdateWithData", R"([null] is not valid to update for cache ["test cache"])")},
        {"nothing written", valid, fail, WroteNothing()},
    };
    WriteStale("old");
    const std::string before = ReadFile(path);
    for (const Row& row : table) {
        SCOPED_TRACE(row.what);
        waiting.produce = row.produce;
        faults.fsync = row.fsync;
        EXPECT_FALSE(waiting.Update());
        ExpectLines({Start(), row.line, Finish()});
        EXPECT_EQ(waiting.Read(), "old");
        ExpectLines({Start(), row.line, Finish(), UsesOldData()});
        EXPECT_FALSE(IsMarked());
        EXPECT_EQ(ReadFile(path), before);
    }
}

TEST_F(CacheRefreshHereTest, TheCallerGetsAnExceptionAfterThePidFileIsRemoved)
{
    WriteStale("old");
    waiting.produce = [this](Json::Value& /*data*/) -> bool {
        EXPECT_TRUE(IsMarked());
        throw std::runtime_error("no node answers");
    };
    try {
        waiting.Read();
        ADD_FAILURE() << "nothing was thrown";
    } catch (const std::runtime_error& error) {
        EXPECT_STREQ(error.what(), "no node answers");
    }
    ExpectLines({Start(), Finish()});
    EXPECT_FALSE(IsMarked());
    EXPECT_FALSE(IsLocked(lockFile));

    waiting.produce = [](Json::Value& /*data*/) -> bool { throw 5; };
    EXPECT_THROW(waiting.Update(), int);
    ExpectLines({Start(), Finish()});
    EXPECT_FALSE(IsMarked());
}

TEST_F(CacheRefreshHereTest, AFileWrittenByGetDefaultValueCountsAsFresh)
{
    cache.defaultValue = [&] {
        WriteCache("written meanwhile");
        return Json::Value("default");
    };
    EXPECT_EQ(cache.Read(), "default");
    EXPECT_EQ(cache.CountCalls("GetUpdatedData"), 0U);
    ExpectLines(
        {Debug("Load", "no data is cached in [" + path + "]"),
         Debug("GetCachedData", "Failed to load cache [" + path + "], use default cache data")});
}

}  // namespace
