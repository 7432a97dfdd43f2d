#include "cache/freshness.h"

#include <gmock/gmock.h>

#include "support/fixtures/cache_fixture.h"

namespace {

using OrvaDRCore::IsFresh;
using OrvaDRCore::IsTooOld;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class FreshnessTest : public CacheFixture {
  protected:
    FreshnessTest()
    {
        processes.time = [] { return Now; };
    }
};

TEST_F(FreshnessTest, AFileIsTooOldOneSecondAfterTheTimeout)
{
    EXPECT_FALSE(IsTooOld(Now - 59, 60));
    EXPECT_FALSE(IsTooOld(Now - 60, 60));
    EXPECT_TRUE(IsTooOld(Now - 61, 60));
}

TEST_F(FreshnessTest, AMissingFileIsTooOld)
{
    EXPECT_TRUE(IsTooOld(-1, 60));
}

TEST_F(FreshnessTest, WithoutAClockEveryFileIsTooOld)
{
    processes.time = [] { return -1; };
    EXPECT_TRUE(IsTooOld(Now, 60));
}

TEST_F(FreshnessTest, DataIsFreshWhenItIsYoungAndValidAndNeedsNoUpdate)
{
    EXPECT_TRUE(IsFresh(cache, "data", Now, 60));
    EXPECT_THAT(cache.TakeCalls(), ElementsAre("IsValidData", "IsNeedUpdate"));
}

TEST_F(FreshnessTest, OldDataIsStaleWithoutAskingTheCache)
{
    EXPECT_FALSE(IsFresh(cache, "data", Now - 61, 60));
    EXPECT_THAT(cache.TakeCalls(), IsEmpty());
}

TEST_F(FreshnessTest, InvalidDataIsStaleWithoutAskingForNeed)
{
    EXPECT_FALSE(IsFresh(cache, Json::Value(), Now, 60));
    EXPECT_THAT(cache.TakeCalls(), ElementsAre("IsValidData"));
}

TEST_F(FreshnessTest, ValidDataIsStaleWhenItNeedsAnUpdate)
{
    cache.isNeedUpdate = [](const Json::Value&) { return true; };
    EXPECT_FALSE(IsFresh(cache, "data", Now, 60));
}

}  // namespace
