#include "base/retry.h"

#include <gtest/gtest.h>

#include <limits>

namespace {

using OrvaDRCore::Retry;

TEST(RetryTest, ASuccessAtOnceTakesNoPause)
{
    int pauses = 0;
    const auto outcome = Retry(
        3, [] { return true; }, [&] { ++pauses; });
    EXPECT_TRUE(outcome.succeeded);
    EXPECT_EQ(outcome.failures, 0U);
    EXPECT_EQ(pauses, 0);
}

TEST(RetryTest, PausesStandBetweenTriesAndNeverAfterTheLast)
{
    int tries = 0;
    int pauses = 0;
    const auto outcome = Retry(
        3, [&] { return ++tries < 0; }, [&] { ++pauses; });
    EXPECT_FALSE(outcome.succeeded);
    EXPECT_EQ(outcome.failures, 4U);
    EXPECT_EQ(tries, 4);
    EXPECT_EQ(pauses, 3);
}

TEST(RetryTest, ALaterSuccessTellsHowManyTriesFailed)
{
    int tries = 0;
    const auto outcome = Retry(
        5, [&] { return ++tries == 3; }, [] {});
    EXPECT_TRUE(outcome.succeeded);
    EXPECT_EQ(outcome.failures, 2U);
}

TEST(RetryTest, ALimitOfZeroTriesOnce)
{
    int tries = 0;
    EXPECT_FALSE(Retry(
                     0, [&] { return ++tries < 0; }, [] {})
                     .succeeded);
    EXPECT_EQ(tries, 1);
}

TEST(RetryTest, TheLargestLimitOfACallerDoesNotWrap)
{
    constexpr unsigned int Limit = std::numeric_limits<unsigned int>::max();
    int tries = 0;
    const auto outcome = Retry(
        Limit, [&] { return ++tries == 3; }, [] {});
    EXPECT_TRUE(outcome.succeeded);
    EXPECT_EQ(outcome.failures, 2U);
    // One try more than the limit can be counted, so that the loop ends and reports the truth.
    static_assert(std::numeric_limits<decltype(outcome.failures)>::max() > Limit);
}

}  // namespace
