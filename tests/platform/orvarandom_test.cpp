#include <orvarandom/orvarandom.h>

#include <gtest/gtest.h>
#include <unistd.h>

#include <array>
#include <climits>
#include <cstdint>
#include <memory>
#include <set>
#include <vector>

#include "support/processes/child_process.h"

namespace {

using ORVA::RANDOM::ORVARandom;
using ORVA::RANDOM::ORVARandomBase;

TEST(OrvaRandomTest, DrawsEveryNumberBetweenTheBoundsAndNoOther)
{
    ORVARandom random;
    std::set<unsigned int> drawn;
    for (int count = 0; count < 1000; ++count) drawn.insert(random.urandom(5, 8));
    EXPECT_EQ(drawn, (std::set<unsigned int>{5, 6, 7, 8}));

    drawn.clear();
    for (int count = 0; count < 1000; ++count) drawn.insert(random.urandom(UINT_MAX - 1, UINT_MAX));
    EXPECT_EQ(drawn, (std::set<unsigned int>{UINT_MAX - 1, UINT_MAX}));
}

TEST(OrvaRandomTest, BoundsThatLeaveNoChoiceGiveTheLowerOne)
{
    struct Row {
        unsigned int min;
        unsigned int max;
    };
    ORVARandom random;
    for (const Row& row :
         {Row{0, 0}, Row{7, 7}, Row{UINT_MAX, UINT_MAX}, Row{9, 8}, Row{7, 0}, Row{UINT_MAX, 0}}) {
        for (int count = 0; count < 20; ++count) {
            EXPECT_EQ(random.urandom(row.min, row.max), row.min) << row.max;
        }
    }
}

TEST(OrvaRandomTest, TheFullRangeUsesEveryBit)
{
    ORVARandom random;
    unsigned int set = 0;
    unsigned int unset = 0;
    for (int count = 0; count < 100; ++count) {
        const unsigned int number = random.urandom(0, UINT_MAX);
        set |= number;
        unset |= ~number;
    }
    EXPECT_EQ(set, UINT_MAX);
    EXPECT_EQ(unset, UINT_MAX);
}

// Pearson's chi-squared sum over buckets of the same size. With up to 16 buckets a fair source exceeds
// the bound once in 7 * 10^13 runs; one that omits or favours a number always does.
TEST(OrvaRandomTest, NumbersAreEquallyLikely)
{
    struct Row {
        unsigned int min;
        unsigned int max;
        unsigned int bucketSize;
    };
    constexpr double Bound = 100.0;
    constexpr int Draws = 60'000;
    const std::vector<Row> rows{
        {0, 1, 1},
        {10, 19, 1},
        {500, 1000, 167},                   // 167 numbers for each of three buckets
        {0, 2'999'999'999, 1'000'000'000},  // the remainder of 32 bits would favour the first
        {0, UINT_MAX, 0x1000'0000},
    };
    ORVARandom random;
    for (const Row& row : rows) {
        const std::uint64_t range = std::uint64_t{row.max} - row.min + 1;
        ASSERT_EQ(range % row.bucketSize, 0U);
        std::vector<double> buckets(static_cast<std::size_t>(range / row.bucketSize));
        ASSERT_LE(buckets.size(), 16U);
        for (int count = 0; count < Draws; ++count) {
            ++buckets.at((random.urandom(row.min, row.max) - row.min) / row.bucketSize);
        }
        const double expected = Draws / static_cast<double>(buckets.size());
        double sum = 0;
        for (const double count : buckets) {
            sum += (count - expected) * (count - expected) / expected;
        }
        EXPECT_LT(sum, Bound) << row.min << " to " << row.max;
    }
}

// Enough bits that two sequences are never equal by chance.
using Sample = std::array<unsigned int, 8>;

Sample Draw(ORVARandomBase& random)
{
    Sample sample{};
    for (unsigned int& number : sample) number = random.urandom(0, UINT_MAX);
    return sample;
}

TEST(OrvaRandomTest, TwoObjectsDrawDifferentNumbers)
{
    ORVARandom one;
    ORVARandom other;
    EXPECT_NE(Draw(one), Draw(other));
}

TEST(OrvaRandomTest, AForkedChildDrawsDifferentNumbers)
{
    const std::unique_ptr<ORVARandomBase> random = std::make_unique<ORVARandom>();
    Draw(*random);

    std::array<int, 2> pipe{};
    ASSERT_EQ(::pipe(pipe.data()), 0);
    ChildProcess child([&](ChildProcess::Link&) {
        const Sample sample = Draw(*random);
        if (::write(pipe[1], sample.data(), sizeof sample) != sizeof sample) throw errno;
    });
    EXPECT_EQ(child.Join(), 0);
    Sample childs{};
    EXPECT_EQ(::read(pipe[0], childs.data(), sizeof childs), static_cast<ssize_t>(sizeof childs));
    EXPECT_NE(Draw(*random), childs);
    ::close(pipe[0]);
    ::close(pipe[1]);
}

}  // namespace
