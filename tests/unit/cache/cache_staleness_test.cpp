// When a cache is too old, and when its reader must have fresh data.
#include <orvadrcore/cache.h>

#include <cstdint>
#include <filesystem>
#include <limits>
#include <string>
#include <vector>

#include "support/fixtures/cache_fixture.h"
#include "support/fixtures/test_files.h"

namespace {

class CacheStalenessTest : public CacheFixture {};

// -------------------------------------------------------------------------------------- IsTimeout

TEST_F(CacheStalenessTest, AFileOlderThanTheTimeoutIsStale)
{
    struct Row {
        std::int64_t timeout;
        std::int64_t age;
        bool isTimeout;
    };
    const std::vector<Row> table = {
        {60, 0, false},
        {60, 59, false},
        {60, 60, false},
        {60, 61, true},
        {60, -1000, false},  // modified in the future
        {0, 0, false},
        {0, 1, true},
        {-1, 0, true},
        {-1, -1, false},
        {-1, -2, false},
        {1'000'000'000, 1'000'000'000, false},
        {1'000'000'000, 1'000'000'001, true},
        {5'000'000'000, Now, false},
        {std::numeric_limits<std::int64_t>::max(), Now, false},
        {std::numeric_limits<std::int64_t>::min(), -1'000'000, true},
    };
    StopClock();
    WriteCache("data");
    for (const Row& row : table) {
        SCOPED_TRACE(std::to_string(row.timeout) + ", " + std::to_string(row.age));
        SetModifyTime(path, Now - row.age);
        EXPECT_EQ(Another(false, 0, row.timeout).IsTimeout(), row.isTimeout);
    }
}

TEST_F(CacheStalenessTest, FractionsOfASecondDoNotCount)
{
    StopClock();
    WriteCache("data");
    SetModifyTime(path, Now - Timeout, 999'999'999);
    EXPECT_FALSE(cache.IsTimeout());
    SetModifyTime(path, Now - Timeout - 1, 999'999'999);
    EXPECT_TRUE(cache.IsTimeout());
}

// A missing file has the time -1, so its age is the time of day plus one second.
TEST_F(CacheStalenessTest, AMissingFileIsStale)
{
    StopClock();
    EXPECT_TRUE(cache.IsTimeout());
    EXPECT_TRUE(Another(false, 0, 0).IsTimeout());
    EXPECT_TRUE(Another(false, 0, Now).IsTimeout());
    EXPECT_FALSE(Another(false, 0, Now + 1).IsTimeout());
}

TEST_F(CacheStalenessTest, WithoutAClockEveryFileIsStale)
{
    StopClock(-1);
    WriteCache("data", Now);
    EXPECT_TRUE(cache.IsTimeout());
    EXPECT_TRUE(Another(false, 0, std::numeric_limits<std::int64_t>::max()).IsTimeout());
}

TEST_F(CacheStalenessTest, TimesInTheFileDoNotCount)
{
    StopClock();
    WriteFile(path, R"({"timeout":1,"finish_time_to_update":5,"cached_data":1})");
    SetModifyTime(path, Now - Timeout);
    EXPECT_FALSE(cache.IsTimeout());
    WriteFile(path, R"({"timeout":9000000,"finish_time_to_update":1700000000,"cached_data":1})");
    SetModifyTime(path, Now - Timeout - 1);
    EXPECT_TRUE(cache.IsTimeout());
}

TEST_F(CacheStalenessTest, ADirectoryInPlaceOfTheFileHasAnAge)
{
    StopClock();
    std::filesystem::create_directory(path);
    SetModifyTime(path, Now - Timeout);
    EXPECT_FALSE(cache.IsTimeout());
}

// -------------------------------------------------------------------------- IsUpdatedDataRequired

TEST_F(CacheStalenessTest, FreshDataIsRequiredByTheConstructorOrByInvalidData)
{
    WriteCache("data");
    for (const bool updatedRequired : {false, true}) {
        for (const bool valid : {false, true}) {
            TestCache each = Another(updatedRequired);
            each.isValid = [valid](const Json::Value& data) {
                EXPECT_EQ(data, "data");
                return valid;
            };
            EXPECT_EQ(each.IsUpdatedDataRequired(), updatedRequired || !valid);
            EXPECT_EQ(each.CountCalls("IsValidData"), updatedRequired ? 0U : 1U);
        }
    }
}

TEST_F(CacheStalenessTest, WithoutAFileFreshDataIsRequiredUnlessTheDefaultIsValid)
{
    EXPECT_TRUE(cache.IsUpdatedDataRequired());
    ExpectLines({NoData(), UsesDefault()});
    cache.defaultValue = [] { return "default"; };
    EXPECT_FALSE(cache.IsUpdatedDataRequired());
    ExpectLines({NoData(), UsesDefault()});
}

}  // namespace
