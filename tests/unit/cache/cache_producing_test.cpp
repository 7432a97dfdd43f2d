// How a cache asks its class for data: retries, their pauses, and the times that are recorded.
#include <orvadrcore/cache.h>

#include <unistd.h>

#include <algorithm>
#include <array>
#include <ctime>
#include <filesystem>
#include <limits>
#include <string>
#include <vector>

#include "support/fixtures/cache_update_fixture.h"
#include "support/fixtures/json_kinds.h"
#include "support/fixtures/test_files.h"

namespace {

constexpr int MaxInt = std::numeric_limits<int>::max();

class CacheProducingTest : public CacheUpdateFixture {};

TEST_F(CacheProducingTest, ProducingIsRetriedUpToTheLimit)
{
    WriteCache("old");
    const std::string before = ReadFile(path);
    for (const Attempts& row : AttemptsByLimit) {
        SCOPED_TRACE(row.limit);
        TestCache each = Another(false, row.limit);
        each.produce = [](Json::Value& data) {
            EXPECT_EQ(data, Json::Value());  // for each attempt
            data["left"] = "behind";
            return false;
        };
        EXPECT_FALSE(each.DoUpdate());
        EXPECT_EQ(each.CountCalls("GetUpdatedData"), row.attempts);
        ExpectPauses(row.attempts - 1, ShortestProducePause);
        ExpectLines({ProducedNothing(row.limit)});
    }
    EXPECT_EQ(ReadFile(path), before);
}

TEST_F(CacheProducingTest, AProductionThatSucceedsLaterEndsTheRetriesWithoutALogLine)
{
    for (const int limit : {1, 3, MaxInt}) {
        TestCache each = Another(false, limit);
        int attempts = 0;
        each.produce = [&](Json::Value& data) {
            EXPECT_EQ(data, Json::Value());
            data = ++attempts;
            return attempts == 3;
        };
        EXPECT_TRUE(each.DoUpdate());
        EXPECT_EQ(attempts, 3);
        ExpectPauses(2, ShortestProducePause);
        EXPECT_EQ(Document()["cached_data"], 3);
    }
}

TEST_F(CacheProducingTest, TheRecordedTimesIncludeAllAttemptsAndPauses)
{
    std::time_t now = 5'000'000'000;
    processes.time = [&] { return now; };
    pauses.OnPause([&](std::size_t /*number*/) { now += 10; });
    TestCache each = Another(false, 2);
    int attempts = 0;
    each.produce = [&](Json::Value& data) {
        now += 1;
        data = "new";
        return ++attempts == 3;
    };
    EXPECT_TRUE(each.DoUpdate());
    EXPECT_TRUE(Same(Document()["begin_time_to_update"], Json::Int64{5'000'000'000}));
    EXPECT_TRUE(Same(Document()["finish_time_to_update"], Json::Int64{5'000'000'023}));
    EXPECT_TRUE(Same(Document()["updated_time"], 23.0));
    EXPECT_TRUE(Same(Document()["max_updated_time"], 23));
}

TEST_F(CacheProducingTest, InvalidDataIsNotProducedAgain)
{
    WriteCache("old");
    const std::string before = ReadFile(path);
    TestCache each = Another(false, 3);
    each.produce = [](Json::Value& data) {
        data = Json::Value();
        return true;
    };
    EXPECT_FALSE(each.DoUpdate());
    EXPECT_EQ(each.CountCalls("GetUpdatedData"), 1U);
    ExpectPauses(0, 0);
    ExpectLines(
        {Debug("UpdateWithData", R"([null] is not valid to update for cache ["test cache"])")});
    EXPECT_EQ(ReadFile(path), before);
}

TEST_F(CacheProducingTest, DoUpdateTakesNoLockAndSetsNoMark)
{
    cache.produce = [this](Json::Value& data) {
        EXPECT_FALSE(IsMarked());
        data = "new";
        return true;
    };
    EXPECT_TRUE(cache.DoUpdate());
    EXPECT_EQ(CountOpened(lockPath), 0U);
    EXPECT_EQ(CountOpened(pidPath), 0U);
    EXPECT_EQ(cache.GetCachedData(), "new");
}

TEST_F(CacheProducingTest, PausesAreSpreadOverTheirWholeRange)
{
    constexpr std::size_t Count =
        200;  // with so many, a tenth of a second stays empty once in 10^13 runs
    std::size_t from = 0;
    const auto expectSpread = [&](unsigned int shortest) {
        const std::vector<unsigned int> taken(pauses.Taken().begin() + static_cast<long>(from),
                                              pauses.Taken().end());
        from += taken.size();
        ExpectPauses(Count, shortest);
        ASSERT_FALSE(taken.empty());
        EXPECT_LT(*std::min_element(taken.begin(), taken.end()), shortest + 100'000);
        EXPECT_GT(*std::max_element(taken.begin(), taken.end()), 900'000U);
    };
    constexpr int Limit = Count - 1;
    TestCache each = Another(true, Limit);
    each.produce = [](const Json::Value&) { return false; };
    EXPECT_FALSE(each.DoUpdate());
    ExpectLines({ProducedNothing(Limit)});
    expectSpread(ShortestProducePause);

    faults.fsync = Failing(EIO);
    EXPECT_FALSE(each.UpdateWithData("new"));
    ExpectLines({WroteNothing(Limit)});
    expectSpread(ShortestWritePause);

    faults.fsync = nullptr;
    WriteFile(pidPath, std::to_string(::getpid()));
    pauses.OnPause([&](std::size_t number) {
        if (number == from + Count) std::filesystem::remove(pidPath);
    });
    EXPECT_TRUE(each.Update());
    ExpectLines({StartWait(), FinishWait()});
    expectSpread(ShortestWaitPause);
}

}  // namespace
