#include "base/scope_guard.h"

#include <gtest/gtest.h>

#include <stdexcept>

namespace {

using OrvaDRCore::ScopeGuard;

TEST(ScopeGuardTest, CallsItsFunctionAtTheEndOfTheScope)
{
    int calls = 0;
    {
        const ScopeGuard guard([&] { ++calls; });
        EXPECT_EQ(calls, 0);
    }
    EXPECT_EQ(calls, 1);
}

TEST(ScopeGuardTest, CallsItsFunctionWhenAnExceptionLeavesTheScope)
{
    int calls = 0;
    const auto fail = [&] {
        const ScopeGuard guard([&] { ++calls; });
        throw std::runtime_error("failed");
    };
    EXPECT_THROW(fail(), std::runtime_error);
    EXPECT_EQ(calls, 1);
}

TEST(ScopeGuardTest, CallsNothingOnceItIsDismissed)
{
    int calls = 0;
    {
        ScopeGuard guard([&] { ++calls; });
        guard.Dismiss();
    }
    EXPECT_EQ(calls, 0);
}

}  // namespace
