// The error by itself. Which operation leaves which error is tested with SqliteDB.
#include "sqlite/sqlite_error.h"

#include <gtest/gtest.h>

#include <utility>

#include "base/json_helpers.h"

namespace {

using OrvaDRCore::SqliteError;

std::string RecordOf(const SqliteError& error)
{
    return OrvaDRCore::toString(error.GetRecord());
}

TEST(SqliteErrorTest, ANewErrorIsNone)
{
    const SqliteError error;
    EXPECT_EQ(error.GetCode(), 0);
    EXPECT_EQ(RecordOf(error), "null");
}

TEST(SqliteErrorTest, AFailureHasItsStatementCodeAndMessage)
{
    SqliteError error;
    error.SetFailure("BAD", 1, "syntax error");
    EXPECT_EQ(error.GetCode(), 404);
    EXPECT_EQ(RecordOf(error),
              R"({"command":"BAD","sqlite_errcode":1,"sqlite_errmsg":"syntax error"})");
    error.SetFailure("", 0, "");
    EXPECT_EQ(RecordOf(error), R"({"sqlite_errmsg":""})");
}

TEST(SqliteErrorTest, SettingACodeRemovesTheRecord)
{
    SqliteError error;
    error.SetFailure("BAD", 1, "syntax error");
    error.Set(401);
    EXPECT_EQ(error.GetCode(), 401);
    EXPECT_EQ(RecordOf(error), "null");
}

TEST(SqliteErrorTest, SqlitesCodeStaysUntilTheNextOperation)
{
    SqliteError error;
    EXPECT_EQ(error.GetSqliteCode(), 0);
    error.SetFailure("BAD", 19, "why");
    EXPECT_EQ(error.GetSqliteCode(), 19);
    error.SetSqliteCode(2067);
    error.SetFailures(Json::Value(Json::arrayValue));
    EXPECT_EQ(error.GetSqliteCode(), 2067);
    error.Set(404);
    EXPECT_EQ(error.GetSqliteCode(), 0);
}

TEST(SqliteErrorTest, FailuresAreAListOfEntries)
{
    SqliteError error;
    Json::Value entries;
    error.Set(404);
    entries.append(error.AsEntry());
    error.SetFailure("", 0, "why");
    entries.append(error.AsEntry());
    error.SetFailures(std::move(entries));
    EXPECT_EQ(error.GetCode(), 404);
    EXPECT_EQ(RecordOf(error), R"([{"err_code":404,"err_code_str":"ERR_DATABASE_OPERATION"},)"
                               R"({"err_code":404,"err_code_str":"ERR_DATABASE_OPERATION",)"
                               R"("err_msg":{"sqlite_errmsg":"why"}}])");
}

}  // namespace
