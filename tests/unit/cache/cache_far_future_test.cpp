// Caches after January 2038, when times need more than 32 bits.
#include <orvadrcore/cache.h>

#include <chrono>
#include <cstdint>
#include <ctime>

#include "support/fixtures/cache_update_fixture.h"
#include "support/fixtures/json_kinds.h"
#include "support/fixtures/test_files.h"

namespace {

using OrvaDRCore::CacheState;

constexpr std::time_t In2040 = 2'208'988'800;

class FarFutureTest : public CacheUpdateFixture {
  protected:
    FarFutureTest() { StopClock(In2040); }

    void WriteAged(std::time_t age) const { WriteCache("old", In2040 - age); }

    CacheState ReadWithin(Json::Value& data) const
    {
        return cache.ReadWithin(std::chrono::milliseconds(0), data);
    }
};

TEST_F(FarFutureTest, AFileIsStaleFromTheSecondAfterItsTimeout)
{
    WriteAged(Timeout);
    EXPECT_FALSE(cache.IsTimeout());
    EXPECT_EQ(cache.Read(), "old");
    WriteAged(Timeout + 1);
    EXPECT_TRUE(cache.IsTimeout());
}

TEST_F(FarFutureTest, AFileOf2037IsStaleAndOneOf2040IsNotOfTheFutureIn2037)
{
    WriteAged(3 * 365 * 86'400);
    EXPECT_TRUE(cache.IsTimeout());
    WriteAged(0);
    StopClock(In2040 - 3 * 365 * 86'400);
    EXPECT_FALSE(cache.IsTimeout());
}

TEST_F(FarFutureTest, ReadWithinReturnsFreshDataAndRefreshesStaleData)
{
    Json::Value data;
    WriteAged(Timeout);
    EXPECT_EQ(ReadWithin(data), CacheState::Fresh);
    EXPECT_EQ(data, "old");
    WriteAged(Timeout + 1);
    EXPECT_EQ(ReadWithin(data), CacheState::Fresh);
    EXPECT_EQ(data, "new");
    TakeLines();
}

TEST_F(FarFutureTest, ARefreshWritesWhenItBeganAndEnded)
{
    EXPECT_TRUE(cache.DoUpdate());
    EXPECT_TRUE(Same(Document()["begin_time_to_update"], Json::Int64{In2040}));
    EXPECT_TRUE(Same(Document()["finish_time_to_update"], Json::Int64{In2040}));
    EXPECT_TRUE(Same(Document()["updated_time"], 0.0));
}

TEST_F(FarFutureTest, ALoadedFileIsLoadedAgainOnlyWhenItsTimeHasChanged)
{
    WriteAged(0);
    EXPECT_EQ(cache.GetCachedData(), "old");
    ForgetOpened();
    EXPECT_EQ(cache.GetCachedData(), "old");
    EXPECT_EQ(CountOpened(path), 0U);
    WriteCache("other", In2040 - (std::time_t{1} << 32U));  // differs in the high bits only
    EXPECT_EQ(cache.GetCachedData(), "other");
}

TEST_F(FarFutureTest, AFileOfThreeGigabytesIsUnreadableAndReplaced)
{
    WriteAged(0);
    Lengthen(path, std::int64_t{3} << 30U);
    SetModifyTime(path, In2040);
    EXPECT_FALSE(cache.Load());
    ExpectLines({Unreadable()});
    Json::Value data;
    EXPECT_EQ(ReadWithin(data), CacheState::Fresh);
    EXPECT_EQ(data, "new");
    EXPECT_EQ(Document()["cached_data"], "new");
    EXPECT_FALSE(TakeLines().empty());
}

}  // namespace
