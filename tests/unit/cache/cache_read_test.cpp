// Read and View: what they return, and when they refresh.
#include <orvadrcore/cache.h>

#include <gmock/gmock.h>
#include <sys/stat.h>

#include <cerrno>
#include <string>
#include <vector>

#include "support/fixtures/cache_fixture.h"
#include "support/fixtures/json_kinds.h"

namespace {

using ::testing::ElementsAre;

class CacheReadTest : public CacheFixture {};

// ------------------------------------------------------------------------------------------- Read

TEST_F(CacheReadTest, ReturnsFreshDataWithoutARefresh)
{
    WriteCache("data");
    for (const bool updatedRequired :
         {false, true}) {  // the constructor's flag does not make it stale
        TestCache each = Another(updatedRequired);
        each.isValid = [](const Json::Value& data) {
            EXPECT_EQ(data, "data");
            return true;
        };
        each.isNeedUpdate = [](const Json::Value& data) {
            EXPECT_EQ(data, "data");
            return false;
        };
        EXPECT_EQ(each.Read(), "data");
        EXPECT_THAT(each.TakeCalls(), ElementsAre("IsValidData", "IsNeedUpdate"));
    }
    EXPECT_EQ(CountOpened(lockPath), 0U);
    EXPECT_EQ(CountOpened(pidPath), 0U);
}

TEST_F(CacheReadTest, AValidDefaultValueIsStillTooOld)
{
    FailForks(EAGAIN);
    cache.defaultValue = [] { return "default"; };
    EXPECT_EQ(cache.Read(), "default");
    ExpectLines({NoData(), UsesDefault(), NoData(), UsesDefault(),
                 Warn("Update", "Failed to fork(). errno=[11/Resource temporarily unavailable]"),
                 UsesOldData()});
}

// Age, validity and need are checked in this order, up to the first that says stale. Only then is it
// asked whether the caller must wait.
TEST_F(CacheReadTest, TheFirstReasonForARefreshEndsTheChecks)
{
    struct Row {
        const char* what;
        long age;
        bool isValid;
        bool isNeedUpdate;
        std::vector<std::string> asked;
    };
    const std::vector<Row> table = {
        {"fresh", 0, true, false, {"IsValidData", "IsNeedUpdate"}},
        {"old", 2 * Timeout, true, false, {"IsUpdatedDataRequired", "GetInfo"}},
        {"old and all else", 2 * Timeout, false, true, {"IsUpdatedDataRequired", "GetInfo"}},
        {"invalid", 0, false, false, {"IsValidData", "IsUpdatedDataRequired", "GetInfo"}},
        {"invalid and unwanted",
         0,
         false,
         true,
         {"IsValidData", "IsUpdatedDataRequired", "GetInfo"}},
        {"unwanted",
         0,
         true,
         true,
         {"IsValidData", "IsNeedUpdate", "IsUpdatedDataRequired", "GetInfo"}},
    };
    FailForks(EAGAIN);
    StopClock();
    for (const Row& row : table) {
        SCOPED_TRACE(row.what);
        WriteCache("data", Now - row.age);
        cache.isValid = [&](const Json::Value&) { return row.isValid; };
        cache.isNeedUpdate = [&](const Json::Value&) { return row.isNeedUpdate; };
        cache.isRequired = [] { return false; };
        EXPECT_EQ(cache.Read(), "data");
        EXPECT_EQ(cache.TakeCalls(), row.asked);
        if (row.asked.back() == "GetInfo") {
            ExpectLines(
                {Warn("Update", "Failed to fork(). errno=[11/Resource temporarily unavailable]"),
                 UsesOldData()});
        }
    }
}

TEST_F(CacheReadTest, ReadReturnsTheDataFromBeforeAFailedRefresh)
{
    TestCache waiting = Another(true);
    waiting.info = [] { return ParseJson(R"({"node":["%s",3.0]})"); };
    WriteStale("old");
    waiting.produce = [this](const Json::Value&) {
        WriteCache("by somebody else");
        return false;
    };
    EXPECT_EQ(waiting.Read(), "old");
    ExpectLines(
        {Start(),
         Debug("DoUpdate", R"(Failed to get updated cache [{"node":["%s",3.0]}] and reach the )"
                           "retry limit[0]"),
         Finish(),
         Debug("Read", R"(Failed to update cache [{"node":["%s",3.0]}], use old cache data.)")});
    ExpectPauses(1, 500'000);
    EXPECT_EQ(waiting.GetCachedData(), "by somebody else");
}

TEST_F(CacheReadTest, ReadReturnsTheDataFromAfterTheRefresh)
{
    WriteStale("old");
    cache.isRequired = [] { return true; };
    cache.produce = [](Json::Value& data) {
        data = "new";
        return true;
    };
    EXPECT_EQ(cache.Read(), "new");
    ExpectLines({Start(), Finish()});
}

TEST_F(CacheReadTest, FreshDataInMemoryTakesOneStat)
{
    WriteCache("data");
    EXPECT_EQ(cache.Read(), "data");
    std::size_t looks = 0;
    faults.stat = [&](const char* name, struct stat* status) {
        if (name == path) ++looks;
        return RealStat(name, status);
    };
    EXPECT_EQ(cache.Read(), "data");
    EXPECT_EQ(looks, 1U);
    EXPECT_EQ(cache.View(), "data");
    EXPECT_EQ(looks, 2U);
    EXPECT_EQ(CountOpened(path), 1U);
}

// ------------------------------------------------------------------------------------------- View

TEST_F(CacheReadTest, AViewOfFreshDataIsTheDataInMemory)
{
    WriteCache("data");
    const Json::Value& first = cache.View();
    EXPECT_EQ(first, "data");
    EXPECT_THAT(cache.TakeCalls(), ElementsAre("IsValidData", "IsNeedUpdate"));
    EXPECT_EQ(&cache.View(), &first);
    EXPECT_EQ(CountOpened(path), 1U);
    EXPECT_EQ(CountOpened(lockPath), 0U);
}

TEST_F(CacheReadTest, AViewCopiesNothing)
{
    WriteCache("data");
    const char* const text = cache.View().asCString();
    EXPECT_EQ(cache.View().asCString(), text);
    EXPECT_EQ(cache.Read(), "data");
    EXPECT_EQ(cache.View().asCString(), text);
    const void* seen = nullptr;
    cache.isValid = [&](const Json::Value& data) {
        seen = &data;
        return true;
    };
    const void* given = &cache.View();
    EXPECT_EQ(seen, given);
}

TEST_F(CacheReadTest, AViewOfAChangedFileShowsTheNewData)
{
    StopClock();
    WriteCache("first", Now);
    EXPECT_EQ(cache.View(), "first");
    WriteCache("second", Now - 1);
    EXPECT_EQ(cache.View(), "second");
}

TEST_F(CacheReadTest, AViewDecidesAsReadDoes)
{
    FailForks(EAGAIN);
    StopClock();
    struct Row {
        long age;
        bool isValid;
        bool isNeedUpdate;
    };
    for (const Row& row : {Row{0, true, false}, Row{2 * Timeout, true, false}, Row{0, false, false},
                           Row{0, true, true}}) {
        WriteCache("data", Now - row.age);
        cache.isValid = [&](const Json::Value&) { return row.isValid; };
        cache.isNeedUpdate = [&](const Json::Value&) { return row.isNeedUpdate; };
        cache.isRequired = [] { return false; };
        EXPECT_EQ(cache.Read(), "data");
        const std::vector<std::string> asked = cache.TakeCalls();
        const std::size_t lines = TakeLines().size();
        EXPECT_EQ(cache.View(), "data");
        EXPECT_EQ(cache.TakeCalls(), asked);
        if (lines > 0) {
            ExpectLines(
                {Warn("Update", "Failed to fork(). errno=[11/Resource temporarily unavailable]"),
                 Debug("View", R"(Failed to update cache ["test cache"], use old cache data.)")});
        }
    }
}

TEST_F(CacheReadTest, AViewMayShowTheDefaultValue)
{
    FailForks(EAGAIN);
    cache.defaultValue = [] { return "default"; };
    cache.isRequired = [] { return false; };
    const Json::Value& data = cache.View();
    EXPECT_EQ(data, "default");
    ExpectLines({NoData(), UsesDefault(),
                 Warn("Update", "Failed to fork(). errno=[11/Resource temporarily unavailable]"),
                 Debug("View", R"(Failed to update cache ["test cache"], use old cache data.)")});
    EXPECT_EQ(data, "default");
}

TEST_F(CacheReadTest, AViewShowsTheDataFromAfterTheRefresh)
{
    WriteStale("old");
    cache.isRequired = [] { return true; };
    EXPECT_EQ(cache.View(), "new");
    ExpectLines({Start(), Finish()});
}

TEST_F(CacheReadTest, AViewShowsTheDataInMemoryWhenTheRefreshFails)
{
    TestCache waiting = Another(true);
    WriteStale("old");
    waiting.produce = [this](const Json::Value&) {
        WriteCache("by somebody else");
        return false;
    };
    EXPECT_EQ(waiting.View(), "old");  // not loaded again
    EXPECT_EQ(TakeLines().size(), 4U);

    WriteStale("old");
    waiting.produce = [&](const Json::Value&) {
        WriteCache("by somebody else");
        EXPECT_EQ(waiting.GetCachedData(), "by somebody else");
        return false;
    };
    EXPECT_EQ(waiting.View(), "by somebody else");
    EXPECT_EQ(TakeLines().size(), 4U);
}

}  // namespace
