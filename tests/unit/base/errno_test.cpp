#include "base/errno.h"

#include <gtest/gtest.h>

namespace {

using OrvaDRCore::PreserveErrno;
using OrvaDRCore::RetryOnEintr;

TEST(PreserveErrnoTest, RestoresErrnoAtTheEndOfTheScope)
{
    errno = ENOENT;
    {
        const PreserveErrno preserve;
        errno = EIO;
    }
    EXPECT_EQ(errno, ENOENT);
}

TEST(RetryOnEintrTest, RepeatsACallThatSignalsInterrupt)
{
    int calls = 0;
    const long result = RetryOnEintr([&] {
        errno = EINTR;
        return ++calls < 3 ? -1L : 5L;
    });
    EXPECT_EQ(result, 5);
    EXPECT_EQ(calls, 3);
}

TEST(RetryOnEintrTest, RepeatsNeitherOtherFailuresNorSuccesses)
{
    int calls = 0;
    const auto call = [&](int result, int error) {
        return [&calls, result, error] {
            ++calls;
            errno = error;
            return result;
        };
    };
    EXPECT_EQ(RetryOnEintr(call(-1, EIO)), -1);
    EXPECT_EQ(errno, EIO);
    EXPECT_EQ(RetryOnEintr(call(0, EINTR)), 0);
    EXPECT_EQ(calls, 2);
}

}  // namespace
