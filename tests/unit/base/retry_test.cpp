#include "base/retry.h"

#include <gtest/gtest.h>

#include <limits>

namespace {

using OrvaDRCore::Retry;

TEST(RetryTest, AnImmediateSuccessTakesNoPause)
{
    int pauses = 0;
    const auto outcome = Retry(
        3, [] { return true; }, [&] { ++pauses; });
    EXPECT_TRUE(outcome.succeeded);
    EXPECT_EQ(outcome.failures, 0U);
    EXPECT_EQ(pauses, 0);
}

TEST(RetryTest, PausesBetweenAttemptsAndNotAfterTheLast)
{
    int attempts = 0;
    int pauses = 0;
    const auto outcome = Retry(
        3, [&] { return ++attempts < 0; }, [&] { ++pauses; });
    EXPECT_FALSE(outcome.succeeded);
    EXPECT_EQ(outcome.failures, 4U);
    EXPECT_EQ(attempts, 4);
    EXPECT_EQ(pauses, 3);
}

TEST(RetryTest, ALaterSuccessCountsTheFailures)
{
    int attempts = 0;
    const auto outcome = Retry(
        5, [&] { return ++attempts == 3; }, [] {});
    EXPECT_TRUE(outcome.succeeded);
    EXPECT_EQ(outcome.failures, 2U);
}

TEST(RetryTest, ALimitOfZeroMeansOneAttempt)
{
    int attempts = 0;
    EXPECT_FALSE(Retry(
                     0, [&] { return ++attempts < 0; }, [] {})
                     .succeeded);
    EXPECT_EQ(attempts, 1);
}

TEST(RetryTest, StopsAfterAFailureThatMustNotBeRepeated)
{
    int attempts = 0;
    int pauses = 0;
    const auto outcome = Retry(
        5, [&] { return ++attempts < 0; }, [&] { ++pauses; }, [&] { return attempts < 2; });
    EXPECT_FALSE(outcome.succeeded);
    EXPECT_EQ(outcome.failures, 2U);
    EXPECT_EQ(attempts, 2);
    EXPECT_EQ(pauses, 1);
}

TEST(RetryTest, TheLargestLimitDoesNotOverflow)
{
    constexpr unsigned int Limit = std::numeric_limits<unsigned int>::max();
    int attempts = 0;
    const auto outcome = Retry(
        Limit, [&] { return ++attempts == 3; }, [] {});
    EXPECT_TRUE(outcome.succeeded);
    EXPECT_EQ(outcome.failures, 2U);
    // One attempt more than the limit must still fit the counter, or the loop would not end.
    static_assert(std::numeric_limits<decltype(outcome.failures)>::max() > Limit);
}

}  // namespace
