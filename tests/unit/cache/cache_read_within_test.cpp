// Cache::ReadWithin() in one process. What several do is in tests/process/cold_cache_test.cpp.
#include <orvadrcore/cache.h>

#include <gmock/gmock.h>
#include <orvacore/orvacore.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <filesystem>
#include <limits>
#include <stdexcept>
#include <string>
#include <vector>

#include "support/fixtures/cache_fixture.h"
#include "support/fixtures/test_files.h"

namespace {

using OrvaDRCore::CacheState;
using std::chrono::milliseconds;
using ::testing::AllOf;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::Ge;
using ::testing::IsEmpty;
using ::testing::Le;

constexpr milliseconds NoTime{0};
constexpr milliseconds ShortTime{20};
constexpr milliseconds Long{60'000};

class CacheReadWithinTest : public CacheFixture {
  protected:
    CacheReadWithinTest()
    {
        cache.defaultValue = [] { return Json::Value("default"); };
        cache.isValid = [](const Json::Value& value) {
            return value.isString() && value != "default" && value != "bad";
        };
        pauses.OnWait([this](std::size_t count) {
            if (onWait) onWait(count);
        });
    }

    CacheState Ask(const TestCache& which, milliseconds patience)
    {
        data = "untouched";
        return which.ReadWithin(patience, data);
    }
    CacheState Ask(milliseconds patience) { return Ask(cache, patience); }

    // Marks this process, as another thread would.
    void Mark() const { ASSERT_EQ(CoreLibProcPidFileCreate(pidPath.c_str()), 0); }
    bool IsMarked() const { return std::filesystem::exists(pidPath); }

    std::size_t Productions() const { return cache.CountCalls("GetUpdatedData"); }

    // A lock file that nobody can open.
    void BreakLock()
    {
        std::filesystem::remove(lockFile);
        std::filesystem::create_directory(lockFile);
    }
    std::vector<LogLine> LockIsNotOpened() const
    {
        return {Err("openLockedFile",
                    "Failed to open lock file[" + lockPath + "], errno=Is a directory")
                    .In("file_lock.cpp"),
                Err("acquire", "Bad fd [-1] to lock [" + lockPath + "]").In("file_lock.cpp")};
    }

    LogLine StartsHere() const
    {
        return Debug("ReadWithin", "---> Start to update cache [" + path + "]");
    }
    LogLine FinishesHere() const
    {
        return Debug("ReadWithin", "<--- Finish to update cache [" + path + "]");
    }
    LogLine NotStored() const
    {
        return Warn("ReadWithin",
                    "Failed to store cache [" + path + "], use fresh data all the same");
    }
    LogLine NotLocked() const
    {
        return Warn("ReadWithin", "Failed to lock cache [" + path + "], refreshed it all the same");
    }
    static LogLine ProducedNothing(int limit)
    {
        return Debug("DoUpdate", R"(Failed to get updated cache ["test cache"] and reach )"
                                 "the retry limit[" +
                                     std::to_string(limit) + "]");
    }

    Json::Value data;
    std::function<void(std::size_t)> onWait;
};

// ------------------------------------------------------------------------------------- fresh data

TEST_F(CacheReadWithinTest, FreshDataComesAtOnceWithoutALock)
{
    WriteCache("young");
    NoteLocking();
    for (const milliseconds patience : {NoTime, Long}) {
        EXPECT_EQ(Ask(patience), CacheState::Fresh);
        EXPECT_EQ(data, "young");
    }
    EXPECT_THAT(locking, IsEmpty());
    EXPECT_EQ(CountOpened(pidPath), 0U);
    EXPECT_EQ(CountOpened(path), 1U);
    EXPECT_THAT(pauses.Waits(), IsEmpty());
    ExpectLines({});
}

TEST_F(CacheReadWithinTest, AnyPatienceWorks)
{
    for (const milliseconds patience :
         {milliseconds::min(), milliseconds(-1), NoTime, Long,
          milliseconds::max() - milliseconds(1), milliseconds::max()}) {
        WriteStale();
        EXPECT_EQ(Ask(patience), CacheState::Fresh);
        EXPECT_EQ(data, "new");
        ExpectLines({StartsHere(), FinishesHere()});
    }
}

TEST_F(CacheReadWithinTest, MissingDataIsProducedHere)
{
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_EQ(data, "new");
    EXPECT_EQ(Productions(), 1U);
    EXPECT_FALSE(IsMarked());
    EXPECT_EQ(cache.GetCachedData(), "new");
    // The subclass may prepare the refresh in IsUpdatedDataRequired(), which looks for data, too.
    ExpectLines({NoData(), StartsHere(), NoData(), UsesDefault(), FinishesHere()});
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_EQ(Productions(), 1U);
}

TEST_F(CacheReadWithinTest, OldInvalidAndUnwantedDataIsReplacedHere)
{
    FailForks(EAGAIN);  // none is made
    WriteStale("old");
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_EQ(data, "new");

    WriteCache("bad");
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_EQ(data, "new");

    WriteCache("unwanted");
    cache.isNeedUpdate = [](const Json::Value& value) { return value == "unwanted"; };
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_EQ(data, "new");
    EXPECT_EQ(Productions(), 3U);
    TakeLines();
}

TEST_F(CacheReadWithinTest, ARefreshIsPreparedBeforeItProduces)
{
    WriteStale();
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_THAT(cache.TakeCalls(),
                ElementsAre("IsValidData", "IsUpdatedDataRequired", "IsValidData", "GetUpdatedData",
                            "IsValidData", "GetInfo"));
    ExpectLines({StartsHere(), FinishesHere()});
}

TEST_F(CacheReadWithinTest, DataThatWasJustProducedIsFreshWhateverTheTimeoutSays)
{
    for (const long timeout : {0L, -1L, std::numeric_limits<long>::min()}) {
        TestCache always = Another(false, 0, timeout);
        always.isNeedUpdate = [](const Json::Value&) { return true; };
        EXPECT_EQ(Ask(always, NoTime), CacheState::Fresh);
        EXPECT_EQ(data, "new");
    }
    TakeLines();
}

TEST_F(CacheReadWithinTest, TheFileOfTheFutureIsFresh)
{
    WriteCache("future", std::time(nullptr) + 1000);
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_EQ(data, "future");
}

TEST_F(CacheReadWithinTest, WithoutAClockDataIsProduced)
{
    WriteCache("young");
    processes.time = [] { return -1; };
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_EQ(data, "new");
    TakeLines();
}

// ---------------------------------------------------------------------------------------- waiting

TEST_F(CacheReadWithinTest, ReturnsOldDataWhenTheUpdaterTakesTooLong)
{
    WriteStale("old");
    const ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    NoteLocking();
    for (const milliseconds patience : {milliseconds(-1), NoTime, ShortTime}) {
        const auto begin = std::chrono::steady_clock::now();
        EXPECT_EQ(Ask(patience), CacheState::Stale);
        EXPECT_EQ(data, "old");
        EXPECT_GE(std::chrono::steady_clock::now() - begin, patience);
    }
    EXPECT_EQ(Productions(), 0U);
    EXPECT_THAT(locking, IsEmpty()) << "the lock is left to others while one refreshes";
    EXPECT_TRUE(IsMarked());
    ExpectSleeps(0);
}

TEST_F(CacheReadWithinTest, ReturnsTheDefaultValueWhenThereIsNothingElse)
{
    Mark();
    EXPECT_EQ(Ask(NoTime), CacheState::None);
    EXPECT_EQ(data, "default");
    ExpectLines({NoData()});

    WriteCache("bad");
    EXPECT_EQ(Ask(ShortTime), CacheState::None);
    EXPECT_EQ(data, "default");

    WriteFile(path, "no document");
    SetModifyTime(path, 1);
    EXPECT_EQ(Ask(ShortTime), CacheState::None);
    EXPECT_EQ(data, "default");
    ExpectLines({Unreadable()});
}

TEST_F(CacheReadWithinTest, ADefaultValueIsNeverFreshOrOldData)
{
    Mark();
    cache.isValid = [](const Json::Value&) { return true; };
    TestCache forever = Another(false, 0, std::numeric_limits<long>::max());
    forever.isValid = cache.isValid;
    EXPECT_EQ(Ask(NoTime), CacheState::None);
    EXPECT_EQ(Ask(forever, NoTime), CacheState::None);
    TakeLines();
}

TEST_F(CacheReadWithinTest, LooksEveryFewMillisecondsForWhatAnotherUpdaterWrites)
{
    WriteStale("old");
    Mark();
    onWait = [this](std::size_t count) {
        if (count == 40) WriteCache("theirs");
    };
    EXPECT_EQ(Ask(Long), CacheState::Fresh);
    EXPECT_EQ(data, "theirs");
    EXPECT_EQ(Productions(), 0U);
    EXPECT_EQ(pauses.Waits().size(), 40U);
    EXPECT_THAT(pauses.Waits(), Each(AllOf(Ge(1'000U), Le(10'000U))));
    EXPECT_THAT(pauses.Taken(), IsEmpty());
    EXPECT_LE(CountOpened(pidPath), 20U) << "most looks ask for the file's status alone";
    ExpectLines({});
}

TEST_F(CacheReadWithinTest, AFileThatDoesNotChangeIsNotReadAgain)
{
    Mark();
    WriteCache("bad");
    onWait = [this](std::size_t count) {
        if (count == 20) WriteCache("theirs");
    };
    EXPECT_EQ(Ask(Long), CacheState::Fresh);
    EXPECT_EQ(CountOpened(path), 2U);

    WriteFile(path, "no document");
    SetModifyTime(path, 1);
    EXPECT_EQ(Ask(ShortTime), CacheState::None);
    ExpectLines({Unreadable()});
}

TEST_F(CacheReadWithinTest, NoticesAFileThatIsReplacedWithinTheSameSecond)
{
    const std::time_t now = std::time(nullptr);
    Mark();
    WriteCache("bad", now);
    onWait = [this, now](std::size_t count) {
        if (count != 3) return;
        WriteCache("bad as well", now);
        std::filesystem::remove(path);
        WriteCache("theirs", now);
        // The same length and time: another inode.
        ASSERT_TRUE(Another(false).UpdateWithData("thein"));
        SetModifyTime(path, now);
    };
    EXPECT_EQ(Ask(Long), CacheState::Fresh);
    EXPECT_EQ(data, "thein");
}

TEST_F(CacheReadWithinTest, DataDoesNotBecomeTooOldWhileItIsWaitedFor)
{
    std::time_t now = 1'700'000'000;
    processes.time = [&now] { return now; };
    Mark();
    onWait = [&](std::size_t count) {
        if (count != 3) return;
        WriteCache("theirs", now);
        now += 1000;
    };
    EXPECT_EQ(Ask(Long), CacheState::Fresh);
    EXPECT_EQ(data, "theirs");
    ExpectLines({NoData()});
}

TEST_F(CacheReadWithinTest, AClockThatIsSetBackDoesNotMakeDataTooOld)
{
    std::time_t now = 1'700'000'000;
    processes.time = [&now] { return now; };
    Mark();
    onWait = [&](std::size_t count) {
        if (count != 3) return;
        now -= 1000;
        WriteCache("theirs", now);
    };
    EXPECT_EQ(Ask(Long), CacheState::Fresh);
    EXPECT_EQ(data, "theirs");
    TakeLines();
}

TEST_F(CacheReadWithinTest, OldAndUnwantedFilesThatArriveAreNotFresh)
{
    Mark();
    cache.isNeedUpdate = [](const Json::Value& value) { return value == "unwanted"; };
    onWait = [this](std::size_t count) {
        if (count == 2) WriteStale("old");
        if (count == 4) WriteCache("bad");
        if (count == 6) WriteCache("unwanted");
        if (count == 8) WriteCache("theirs");
    };
    EXPECT_EQ(Ask(Long), CacheState::Fresh);
    EXPECT_EQ(data, "theirs");
    EXPECT_EQ(pauses.Waits().size(), 8U);
    TakeLines();
}

// Otherwise each of those that wait would refresh in turn.
TEST_F(CacheReadWithinTest, WhatALaterRefreshBringsIsFreshWhateverTheRulesSay)
{
    const std::time_t now = std::time(nullptr);
    for (const long timeout : {0L, -1L}) {
        Mark();
        TestCache always = Another(false, 0, timeout);
        always.isNeedUpdate = [](const Json::Value&) { return true; };
        always.isValid = [](const Json::Value& value) {
            return value.isString() && value != "bad";
        };
        std::size_t waits = 0;
        onWait = [&](std::size_t) {
            ++waits;
            if (waits == 3) {
                EXPECT_TRUE(cache.UpdateWithData("before", now - 2, now));
            }
            if (waits == 6) {
                EXPECT_TRUE(cache.UpdateWithData("bad", now + 9, now + 9));
            }
            if (waits == 9) {
                EXPECT_TRUE(cache.UpdateWithData("later", now + 9, now + 9));
            }
        };
        cache.isValid = [](const Json::Value&) { return true; };
        EXPECT_EQ(Ask(always, Long), CacheState::Fresh);
        EXPECT_EQ(data, "later");
        EXPECT_EQ(always.CountCalls("GetUpdatedData"), 0U);
        std::filesystem::remove(pidPath);

        EXPECT_EQ(Ask(always, NoTime), CacheState::Fresh);
        EXPECT_EQ(data, "new") << "what was there before the call is stale";
        EXPECT_EQ(cache.Remove(), 0);
    }
    TakeLines();
}

TEST_F(CacheReadWithinTest, TakesOverFromAnUpdaterThatHasDied)
{
    WriteStale("old");
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    updater.Tell();
    ASSERT_EQ(updater.Join(), 0);
    ASSERT_TRUE(IsMarked());
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_EQ(data, "new");
    EXPECT_FALSE(IsMarked());
    ExpectLines({StartsHere(), FinishesHere()});
}

TEST_F(CacheReadWithinTest, TakesOverFromAnUpdaterThatHasFailed)
{
    WriteStale("old");
    Mark();
    onWait = [this](std::size_t count) {
        if (count == 10) std::filesystem::remove(pidPath);
    };
    EXPECT_EQ(Ask(Long), CacheState::Fresh);
    EXPECT_EQ(data, "new");
    EXPECT_EQ(Productions(), 1U);
    EXPECT_LE(pauses.Waits().size(), 13U);
    ExpectLines({StartsHere(), FinishesHere()});
}

TEST_F(CacheReadWithinTest, LooksForFreshDataAgainUnderTheLock)
{
    WriteStale("old");
    faults.flock = [this](int fd, int operation) {
        if (operation == (LOCK_EX | LOCK_NB)) WriteCache("theirs");
        return RealFlock(fd, operation);
    };
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_EQ(data, "theirs");
    EXPECT_EQ(Productions(), 0U);
    EXPECT_FALSE(IsLocked(lockFile));
    ExpectLines({});
}

TEST_F(CacheReadWithinTest, LooksForAnUpdaterAgainUnderTheLock)
{
    WriteStale("old");
    faults.flock = [this](int fd, int operation) {
        if (operation == (LOCK_EX | LOCK_NB)) Mark();
        return RealFlock(fd, operation);
    };
    EXPECT_EQ(Ask(NoTime), CacheState::Stale);
    EXPECT_EQ(Productions(), 0U);
    EXPECT_TRUE(IsMarked());
}

TEST_F(CacheReadWithinTest, ALockThatIsHeldForAMomentIsWaitedFor)
{
    WriteStale("old");
    HeldLock held(lockFile, LOCK_SH);
    onWait = [&held](std::size_t count) {
        if (count == 5) held.Free();
    };
    EXPECT_EQ(Ask(Long), CacheState::Fresh);
    EXPECT_EQ(data, "new");
    EXPECT_EQ(pauses.Waits().size(), 5U);
    ExpectSleeps(0);
    TakeLines();
}

TEST_F(CacheReadWithinTest, ALockThatIsHeldForLongGivesOldData)
{
    WriteStale("old");
    const HeldLock held(lockFile, LOCK_EX);
    EXPECT_EQ(Ask(ShortTime), CacheState::Stale);
    EXPECT_EQ(data, "old");
    EXPECT_EQ(Productions(), 0U);
    ExpectSleeps(0);
}

// -------------------------------------------------------------------------------- failing refreshes

TEST_F(CacheReadWithinTest, AProductionIsRetriedUpToTheLimitWithShortPauses)
{
    for (const int limit : {-1, 0, 3}) {
        WriteStale("old");
        TestCache each = Another(false, limit);
        each.produce = [](Json::Value& value) {
            EXPECT_EQ(value, Json::Value());
            value = "left behind";
            return false;
        };
        EXPECT_EQ(Ask(each, Long), CacheState::Stale);
        EXPECT_EQ(data, "old");
        EXPECT_EQ(each.CountCalls("GetUpdatedData"), limit < 0 ? 1U : std::size_t(limit) + 2);
        EXPECT_FALSE(IsMarked());
        ExpectLines({StartsHere(), ProducedNothing(limit), FinishesHere()});
    }
    ASSERT_FALSE(pauses.Waits().empty());
    EXPECT_THAT(pauses.Waits(), Each(AllOf(Ge(10'000U), Le(100'000U))));
}

TEST_F(CacheReadWithinTest, AProductionThatFailsWithoutTimeLeftIsNotRetried)
{
    WriteStale("old");
    TestCache patient = Another(false, 1000);
    patient.produce = [](Json::Value&) { return false; };
    EXPECT_EQ(Ask(patient, NoTime), CacheState::Stale);
    EXPECT_EQ(patient.CountCalls("GetUpdatedData"), 1U);
    EXPECT_FALSE(IsMarked());
    ExpectLines({StartsHere(), ProducedNothing(1000), FinishesHere()});
}

TEST_F(CacheReadWithinTest, ALaterAttemptMaySucceed)
{
    cache.produce = [this](Json::Value& value) {
        value = "new";
        return Productions() == 2;
    };
    EXPECT_EQ(Ask(Long), CacheState::Fresh);
    EXPECT_EQ(data, "new");
    TakeLines();
}

TEST_F(CacheReadWithinTest, InvalidDataIsNotHandedOut)
{
    WriteStale("old");
    cache.produce = [](Json::Value& value) {
        value = "bad";
        return true;
    };
    EXPECT_EQ(Ask(Long), CacheState::Stale);
    EXPECT_EQ(data, "old");
    EXPECT_FALSE(IsMarked());
    ExpectLines(
        {StartsHere(),
         Debug("UpdateWithData", R"(["bad"] is not valid to update for cache ["test cache"])"),
         FinishesHere()});
}

TEST_F(CacheReadWithinTest, WhatTheSubclassThrowsPassesAndLeavesNoMark)
{
    WriteStale("old");
    cache.produce = [](Json::Value&) -> bool { throw std::runtime_error("no nodes"); };
    EXPECT_THROW(Ask(NoTime), std::runtime_error);
    EXPECT_EQ(data, "untouched");
    EXPECT_FALSE(IsMarked());
    EXPECT_FALSE(IsLocked(lockFile));
    ExpectLines({StartsHere(), FinishesHere()});
}

TEST_F(CacheReadWithinTest, WhatAnotherWritesDuringAFailedRefreshIsReturned)
{
    cache.produce = [this](Json::Value&) {
        WriteCache("theirs");
        return false;
    };
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_EQ(data, "theirs");
    TakeLines();
}

// ------------------------------------------------------------------------- what cannot be stored

TEST_F(CacheReadWithinTest, DataProducedWithoutALockIsFreshAndStored)
{
    BreakLock();
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_EQ(data, "new");
    std::vector<LogLine> lines = {NoData()};
    for (const LogLine& line : LockIsNotOpened()) lines.push_back(line);
    for (const LogLine& line : {NoData(), UsesDefault(), NotLocked()}) lines.push_back(line);
    ExpectLines(lines);
    EXPECT_FALSE(IsMarked());

    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_EQ(Productions(), 1U);
}

TEST_F(CacheReadWithinTest, AnUpdaterIsRespectedWithoutALock)
{
    BreakLock();
    Mark();
    WriteStale("old");
    EXPECT_EQ(Ask(ShortTime), CacheState::Stale);
    EXPECT_EQ(Productions(), 0U);
    EXPECT_TRUE(IsMarked());
    ExpectLines({});
}

TEST_F(CacheReadWithinTest, WithoutAMarkDataIsFreshAndStored)
{
    WriteStale("old");
    std::filesystem::create_directory(pidPath);
    EXPECT_EQ(Ask(Long), CacheState::Fresh);
    EXPECT_EQ(data, "new");
    EXPECT_EQ(cache.GetCachedData(), "new");
    EXPECT_FALSE(IsLocked(lockFile));
    ExpectLines({NotLocked()});
}

TEST_F(CacheReadWithinTest, DataThatCannotBeWrittenIsFresh)
{
    WriteStale("old");
    faults.rename = [this](const char* from, const char* to) {
        if (to != path) return RealRename(from, to);
        errno = ENOSPC;
        return -1;
    };
    EXPECT_EQ(Ask(Long), CacheState::Fresh);
    EXPECT_EQ(data, "new");
    EXPECT_FALSE(IsMarked());
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("status.cached"));
    ExpectLines({StartsHere(),
                 Debug("UpdateWithData",
                       "Failed to write cache to file [" + path + "] and reach retry limit[0]"),
                 NotStored(), FinishesHere()});
    ASSERT_EQ(pauses.Waits().size(), 1U);
    EXPECT_LE(pauses.Waits()[0], 20'000U);
}

TEST_F(CacheReadWithinTest, DataThatCouldNotBeLoadedAgainIsFresh)
{
    cache.isValid = [](const Json::Value& value) { return value.isDouble(); };
    cache.produce = [](Json::Value& value) {
        value = std::numeric_limits<double>::infinity();
        return true;
    };
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_EQ(data.asDouble(), std::numeric_limits<double>::infinity());
    EXPECT_FALSE(std::filesystem::exists(path));
    TakeLines();
}

// --------------------------------------------------------------------------------- the end of a mark

TEST_F(CacheReadWithinTest, TheMarkGoesEvenIfTheLockIsHeld)
{
    WriteStale("old");
    std::optional<HeldLock> held;
    cache.produce = [&](Json::Value& value) {
        EXPECT_TRUE(IsMarked());
        EXPECT_FALSE(IsLocked(lockFile));
        held.emplace(lockFile, LOCK_EX);
        value = "new";
        return true;
    };
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_FALSE(IsMarked());
    ExpectSleeps(0);
    TakeLines();
}

TEST_F(CacheReadWithinTest, TheMarkOfAnotherLivingProcessStays)
{
    WriteStale("old");
    std::optional<ChildProcess> other;
    cache.produce = [&](Json::Value& value) {
        std::filesystem::remove(pidPath);  // by hand
        other.emplace([this](ChildProcess::Link& link) {
            if (CoreLibProcPidFileCreate(pidPath.c_str()) == 0) link.Tell();
            link.Await();
        });
        value = "new";
        return other->Await();
    };
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_TRUE(IsMarked());
    other->Tell();
    EXPECT_EQ(other->Join(), 0);
    TakeLines();
}

TEST_F(CacheReadWithinTest, APidFileThatCannotBeReadAnyMoreGoes)
{
    WriteStale("old");
    cache.produce = [&](Json::Value& value) {
        WriteFile(pidPath, "damaged");
        value = "new";
        return true;
    };
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_FALSE(IsMarked());
    TakeLines();
}

// ----------------------------------------------------------------------------------- the other reads

TEST_F(CacheReadWithinTest, ReadGetsWhatWasProducedInTime)
{
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    TakeLines();
    EXPECT_EQ(cache.Read(), "new");
    EXPECT_EQ(cache.View(), "new");
    EXPECT_EQ(Another(true).Read(), "new");
    EXPECT_EQ(Productions(), 1U);
    ExpectLines({});
}

TEST_F(CacheReadWithinTest, AFileThatComesBackIsLoadedAgain)
{
    WriteCache("young");
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    std::filesystem::rename(path, path + ".away");
    EXPECT_EQ(cache.GetCachedData(), "default");
    std::filesystem::rename(path + ".away", path);
    EXPECT_EQ(Ask(NoTime), CacheState::Fresh);
    EXPECT_EQ(data, "young");
    TakeLines();
}

}  // namespace
