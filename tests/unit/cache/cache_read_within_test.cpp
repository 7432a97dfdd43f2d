// Cache::ReadWithin() in one process: fresh data, and waiting for that of others. What several processes
// do is in tests/process/cold_cache_test.cpp.
#include <orvadrcore/cache.h>

#include <gmock/gmock.h>
#include <sys/file.h>

#include <chrono>
#include <filesystem>
#include <limits>
#include <string>
#include <vector>

#include "support/fixtures/read_within_fixture.h"
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

class CacheReadWithinTest : public ReadWithinFixture {};

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
    for (const std::int64_t timeout :
         std::initializer_list<std::int64_t>{0, -1, std::numeric_limits<std::int64_t>::min()}) {
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
    TestCache forever = Another(false, 0, std::numeric_limits<std::int64_t>::max());
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
    for (const int timeout : {0, -1}) {
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
