#include "sqlite/sqlite_statement.h"

#include <gtest/gtest.h>

#include "support/fixtures/plain_db.h"

namespace {

using OrvaDRCore::EndBeforeLastRow;
using OrvaDRCore::IsTooLong;
using OrvaDRCore::PrepareStatement;
using OrvaDRCore::Statement;

class SqliteStatementTest : public ::testing::Test {
  protected:
    SqliteStatementTest() { db.Run("CREATE TABLE jobs (id)"); }

    int Prepare(const std::string& command)
    {
        return PrepareStatement(db.Handle(), command, statement);
    }

    PlainDb db{":memory:"};
    Statement statement;
};

TEST_F(SqliteStatementTest, PreparesTheFirstStatementOfAText)
{
    EXPECT_EQ(Prepare("SELECT 1; BAD"), SQLITE_OK);
    ASSERT_NE(statement, nullptr);
    EXPECT_STREQ(sqlite3_sql(statement.get()), "SELECT 1;");
}

TEST_F(SqliteStatementTest, AFailureOrATextWithoutAStatementGivesNull)
{
    EXPECT_EQ(Prepare("SELECT 1"), SQLITE_OK);
    EXPECT_EQ(Prepare("BAD"), SQLITE_ERROR);
    EXPECT_EQ(statement, nullptr);
    EXPECT_EQ(Prepare("SELECT 1"), SQLITE_OK);
    EXPECT_EQ(Prepare(" -- nothing"), SQLITE_OK);
    EXPECT_EQ(statement, nullptr);
}

TEST_F(SqliteStatementTest, PreparingOnAClosedConnectionFails)
{
    EXPECT_EQ(PrepareStatement(nullptr, "SELECT 1", statement), SQLITE_MISUSE);
    EXPECT_EQ(statement, nullptr);
}

TEST_F(SqliteStatementTest, AnOrdinaryStatementIsNotTooLong)
{
    EXPECT_FALSE(IsTooLong(""));
    EXPECT_FALSE(IsTooLong("SELECT 1"));
}

TEST_F(SqliteStatementTest, EndingASelectBeforeItsLastRowSucceeds)
{
    ASSERT_EQ(Prepare("SELECT 1 UNION SELECT 2"), SQLITE_OK);
    ASSERT_EQ(sqlite3_step(statement.get()), SQLITE_ROW);
    EXPECT_EQ(EndBeforeLastRow(statement.get()), SQLITE_OK);
}

TEST_F(SqliteStatementTest, EndingAnInsertBeforeItsLastRowCommitsIt)
{
    ASSERT_EQ(Prepare("INSERT INTO jobs VALUES (1), (2) RETURNING id"), SQLITE_OK);
    ASSERT_EQ(sqlite3_step(statement.get()), SQLITE_ROW);
    EXPECT_EQ(EndBeforeLastRow(statement.get()), SQLITE_OK);
    EXPECT_EQ(db.Run("SELECT id FROM jobs"), "1;2");
}

TEST_F(SqliteStatementTest, EndingAnInsertReportsACommitThatFails)
{
    db.Run(
        "PRAGMA foreign_keys = ON; CREATE TABLE parents (id PRIMARY KEY);"
        "CREATE TABLE children (id REFERENCES parents DEFERRABLE INITIALLY DEFERRED)");
    ASSERT_EQ(Prepare("INSERT INTO children VALUES (1) RETURNING id"), SQLITE_OK);
    ASSERT_EQ(sqlite3_step(statement.get()), SQLITE_ROW);
    EXPECT_EQ(EndBeforeLastRow(statement.get()) & 0xff, SQLITE_CONSTRAINT);
}

}  // namespace
