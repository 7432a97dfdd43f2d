#include "common/deadline.h"

#include <gmock/gmock.h>

#include <chrono>

#include "support/fakes/pauses.h"

namespace {

using OrvaDRCore::Backoff;
using OrvaDRCore::Deadline;
using std::chrono::milliseconds;
using ::testing::AllOf;
using ::testing::Each;
using ::testing::Ge;
using ::testing::Le;

TEST(DeadlineTest, IsPassedAtOnceWithoutPatience)
{
    for (const milliseconds patience : {milliseconds(0), milliseconds(-1), milliseconds::min()}) {
        const Deadline deadline(patience);
        EXPECT_TRUE(deadline.IsPassed());
        EXPECT_EQ(deadline.Left().count(), 0);
    }
}

TEST(DeadlineTest, HoldsTheLongestPatience)
{
    for (const milliseconds patience : {milliseconds::max(), milliseconds::max() / 2}) {
        const Deadline deadline(patience);
        EXPECT_FALSE(deadline.IsPassed());
        EXPECT_GT(deadline.Left(), std::chrono::hours(24 * 365));
    }
}

TEST(DeadlineTest, CountsDown)
{
    const Deadline deadline(milliseconds(60'000));
    EXPECT_FALSE(deadline.IsPassed());
    EXPECT_THAT(deadline.Left().count(), AllOf(Ge(1), Le(60'000)));
}

class BackoffTest : public ::testing::Test {
  protected:
    BackoffTest()
    {
        pauses.OnWait([](std::size_t /*count*/) {});
    }

    Pauses pauses;
    const Deadline far{milliseconds(3'600'000)};
};

TEST_F(BackoffTest, PausesGrowUpToTheLongest)
{
    Backoff backoff(2, 10);
    for (int i = 0; i < 20; ++i) EXPECT_TRUE(backoff.Pause(far));
    const std::vector<unsigned int>& waits = pauses.Waits();
    ASSERT_EQ(waits.size(), 20U);
    EXPECT_THAT(waits[0], AllOf(Ge(1'000U), Le(2'000U)));
    EXPECT_THAT(waits[1], AllOf(Ge(2'000U), Le(4'000U)));
    EXPECT_THAT(waits[2], AllOf(Ge(4'000U), Le(8'000U)));
    EXPECT_THAT(std::vector<unsigned int>(waits.begin() + 3, waits.end()),
                Each(AllOf(Ge(5'000U), Le(10'000U))));
}

TEST_F(BackoffTest, PausesAtLeastAMillisecond)
{
    Backoff backoff(0, 0);
    EXPECT_TRUE(backoff.Pause(far));
    EXPECT_TRUE(backoff.Pause(far));
    EXPECT_THAT(pauses.Waits(), Each(AllOf(Ge(1'000U), Le(2'000U))));
}

TEST_F(BackoffTest, PausesNoLongerThanTimeIsLeft)
{
    Backoff backoff(90, 90);
    const Deadline near(milliseconds(5));
    while (backoff.Pause(near)) {
    }
    EXPECT_THAT(pauses.Waits(), Each(Le(6'000U)));
}

TEST_F(BackoffTest, DoesNotPauseAfterTheDeadline)
{
    Backoff backoff(2, 10);
    EXPECT_FALSE(backoff.Pause(Deadline(milliseconds(0))));
    EXPECT_TRUE(pauses.Waits().empty());
}

}  // namespace
