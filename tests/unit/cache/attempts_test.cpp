#include "cache/attempts.h"

#include <gtest/gtest.h>

#include <chrono>
#include <limits>

#include "support/fakes/pauses.h"

namespace {

using OrvaDRCore::Deadline;
using OrvaDRCore::Pause;
using OrvaDRCore::PauseUntil;
using OrvaDRCore::RetryAttempts;
using std::chrono::milliseconds;

TEST(AttemptsTest, ALimitAllowsTwoAttemptsMoreAndANegativeOneASingleAttempt)
{
    const struct {
        int limit;
        int attempts;
    } rows[] = {{0, 2}, {1, 3}, {5, 7}, {-1, 1}, {std::numeric_limits<int>::min(), 1}};
    for (const auto& row : rows) {
        int attempts = 0;
        int pauses = 0;
        const auto fail = [&] { return ++attempts == 0; };
        EXPECT_FALSE(RetryAttempts(row.limit, fail, [&] { return ++pauses > 0; })) << row.limit;
        EXPECT_EQ(attempts, row.attempts);
        EXPECT_EQ(pauses, row.attempts - 1);
    }
}

TEST(AttemptsTest, TheLargestLimitDoesNotOverflow)
{
    int attempts = 0;
    const auto succeed = [&] { return ++attempts == 100; };
    EXPECT_TRUE(RetryAttempts(std::numeric_limits<int>::max(), succeed, [] { return true; }));
    EXPECT_EQ(attempts, 100);
}

TEST(AttemptsTest, EndWithTheirTime)
{
    int attempts = 0;
    int pauses = 0;
    const auto fail = [&] { return ++attempts == 0; };
    EXPECT_FALSE(RetryAttempts(100, fail, [&] { return ++pauses < 3; }));
    EXPECT_EQ(attempts, 3);
}

TEST(AttemptsTest, PausesUntilADeadlineGrowFromMillisecondsToASecond)
{
    Pauses pauses;
    pauses.OnWait([](std::size_t /*count*/) {});
    const Pause pause = PauseUntil(Deadline(milliseconds(3'600'000)));
    for (int i = 0; i < 10; ++i) EXPECT_TRUE(pause());
    EXPECT_GE(pauses.Waits().at(0), 10'000U);
    EXPECT_LE(pauses.Waits().at(0), 20'000U);
    EXPECT_GE(pauses.Taken().back(), 500'000U);
    EXPECT_LE(pauses.Taken().back(), 1'000'000U);
    EXPECT_FALSE(PauseUntil(Deadline(milliseconds(0)))());
}

}  // namespace
