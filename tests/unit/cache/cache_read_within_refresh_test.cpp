// Cache::ReadWithin() that refreshes by itself: what fails, what cannot be stored, and the end of the mark.
#include <orvadrcore/cache.h>

#include <gmock/gmock.h>
#include <sys/file.h>

#include <cerrno>
#include <filesystem>
#include <limits>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

#include "support/fixtures/read_within_fixture.h"
#include "support/fixtures/test_files.h"

namespace {

using OrvaDRCore::CacheState;
using ::testing::AllOf;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::Ge;
using ::testing::Le;

class CacheReadWithinRefreshTest : public ReadWithinFixture {};

// -------------------------------------------------------------------------------- failing refreshes

TEST_F(CacheReadWithinRefreshTest, AProductionIsRetriedUpToTheLimitWithShortPauses)
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

TEST_F(CacheReadWithinRefreshTest, AProductionThatFailsWithoutTimeLeftIsNotRetried)
{
    WriteStale("old");
    TestCache patient = Another(false, 1000);
    patient.produce = [](Json::Value&) { return false; };
    EXPECT_EQ(Ask(patient, NoTime), CacheState::Stale);
    EXPECT_EQ(patient.CountCalls("GetUpdatedData"), 1U);
    EXPECT_FALSE(IsMarked());
    ExpectLines({StartsHere(), ProducedNothing(1000), FinishesHere()});
}

TEST_F(CacheReadWithinRefreshTest, ALaterAttemptMaySucceed)
{
    cache.produce = [this](Json::Value& value) {
        value = "new";
        return Productions() == 2;
    };
    EXPECT_EQ(Ask(Long), CacheState::Fresh);
    EXPECT_EQ(data, "new");
    TakeLines();
}

TEST_F(CacheReadWithinRefreshTest, InvalidDataIsNotHandedOut)
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

TEST_F(CacheReadWithinRefreshTest, WhatTheSubclassThrowsPassesAndLeavesNoMark)
{
    WriteStale("old");
    cache.produce = [](Json::Value&) -> bool { throw std::runtime_error("no nodes"); };
    EXPECT_THROW(Ask(NoTime), std::runtime_error);
    EXPECT_EQ(data, "untouched");
    EXPECT_FALSE(IsMarked());
    EXPECT_FALSE(IsLocked(lockFile));
    ExpectLines({StartsHere(), FinishesHere()});
}

TEST_F(CacheReadWithinRefreshTest, WhatAnotherWritesDuringAFailedRefreshIsReturned)
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

TEST_F(CacheReadWithinRefreshTest, DataProducedWithoutALockIsFreshAndStored)
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

TEST_F(CacheReadWithinRefreshTest, AnUpdaterIsRespectedWithoutALock)
{
    BreakLock();
    Mark();
    WriteStale("old");
    EXPECT_EQ(Ask(ShortTime), CacheState::Stale);
    EXPECT_EQ(Productions(), 0U);
    EXPECT_TRUE(IsMarked());
    ExpectLines({});
}

TEST_F(CacheReadWithinRefreshTest, WithoutAMarkDataIsFreshAndStored)
{
    WriteStale("old");
    std::filesystem::create_directory(pidPath);
    EXPECT_EQ(Ask(Long), CacheState::Fresh);
    EXPECT_EQ(data, "new");
    EXPECT_EQ(cache.GetCachedData(), "new");
    EXPECT_FALSE(IsLocked(lockFile));
    ExpectLines({NotLocked()});
}

TEST_F(CacheReadWithinRefreshTest, DataThatCannotBeWrittenIsFresh)
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

TEST_F(CacheReadWithinRefreshTest, DataThatCouldNotBeLoadedAgainIsFresh)
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

TEST_F(CacheReadWithinRefreshTest, TheMarkGoesEvenIfTheLockIsHeld)
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

TEST_F(CacheReadWithinRefreshTest, TheMarkOfAnotherLivingProcessStays)
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

TEST_F(CacheReadWithinRefreshTest, APidFileThatCannotBeReadAnyMoreGoes)
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

}  // namespace
