#include "sqlite/sqlite_retry.h"

#include <gtest/gtest.h>

#include "base/json_helpers.h"
#include "support/fakes/pauses.h"

namespace {

using OrvaDRCore::Attempts;
using OrvaDRCore::RunWithRetries;
using OrvaDRCore::SqliteError;
using OrvaDRCore::toString;

class SqliteRetryTest : public ::testing::Test {
  protected:
    // Fails so often, each time with another message, and then succeeds.
    Attempts Run(unsigned int limit, int failures)
    {
        int count = 0;
        return RunWithRetries(error, limit, [&] {
            EXPECT_EQ(error.GetCode(), 0);
            if (++count > failures) return true;
            error.SetFailure("", 0, std::to_string(count).c_str());
            return false;
        });
    }

    static std::string Entry(int number)
    {
        return R"({"err_code":404,"err_code_str":"ERR_DATABASE_OPERATION","err_msg":)"
               R"({"sqlite_errmsg":")" +
               std::to_string(number) + R"("}})";
    }

    SqliteError error;
    Pauses pauses;
};

TEST_F(SqliteRetryTest, ASuccessAtTheFirstAttemptHasNothingToReport)
{
    error.SetFailure("", 0, "earlier");
    const Attempts attempts = Run(3, 0);
    EXPECT_TRUE(attempts.succeeded);
    EXPECT_EQ(attempts.failures, 0U);
    EXPECT_EQ(attempts.errors, "");
    EXPECT_EQ(error.GetCode(), 0);
    EXPECT_EQ(pauses.Taken().size(), 0U);
}

TEST_F(SqliteRetryTest, ASuccessAfterFailuresReportsThemAndLeavesNoError)
{
    const Attempts attempts = Run(3, 2);
    EXPECT_TRUE(attempts.succeeded);
    EXPECT_EQ(attempts.failures, 2U);
    EXPECT_EQ(attempts.errors, "[" + Entry(1) + "," + Entry(2) + "]");
    EXPECT_EQ(error.GetCode(), 0);
    EXPECT_EQ(toString(error.GetRecord()), "null");
    EXPECT_EQ(pauses.Taken().size(), 2U);
}

TEST_F(SqliteRetryTest, AfterTheLastAttemptTheErrorIsTheListOfFailures)
{
    const Attempts attempts = Run(1, 2);
    EXPECT_FALSE(attempts.succeeded);
    EXPECT_EQ(attempts.failures, 2U);
    EXPECT_EQ(error.GetCode(), 404);
    EXPECT_EQ(toString(error.GetRecord()), attempts.errors);
    EXPECT_EQ(attempts.errors, "[" + Entry(1) + "," + Entry(2) + "]");
    EXPECT_EQ(pauses.Taken().size(), 1U);
}

TEST_F(SqliteRetryTest, ALimitOfZeroMeansOneAttempt)
{
    EXPECT_EQ(Run(0, 5).failures, 1U);
    EXPECT_EQ(pauses.Taken().size(), 0U);
}

}  // namespace
