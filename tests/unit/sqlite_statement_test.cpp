// The selects that a connection keeps prepared: that nothing but time tells of them.
#include "sqlite_statement.h"

#include <orvadrcore/sqlite_db.h>

#include <algorithm>

#include "support/sqlite_fixture.h"

namespace {

using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValueList;

class SqliteStatementTest : public SqliteFixture {
  protected:
    // Counts the statements that are prepared from here on.
    SqliteStatementTest()
    {
        faults.prepare = [this](sqlite3* handle, const char* sql, sqlite3_stmt** statement) {
            prepared.emplace_back(sql);
            return RealPrepare(handle, sql, statement);
        };
    }

    // One by one: where preparing is counted, SQLite sees the first of several only.
    void RunEach(const std::vector<std::string>& statements)
    {
        for (const std::string& statement : statements) Run(statement);
    }

    // The first row of a statement, and whether SQLite had to prepare it.
    std::string Select(const std::string& statement)
    {
        prepared.clear();
        SqliteValueList record;
        EXPECT_TRUE(db.SelectByCommand(statement, record)) << statement;
        // SQLite prepares statements of its own, too, when the tables have changed.
        const bool isKept = std::count(prepared.begin(), prepared.end(), statement) == 0;
        return record.ToStr() + (isKept ? "; kept" : "; prepared");
    }

    const std::string ids = "SELECT id FROM jobs";
    SqliteFaults faults;
    std::vector<std::string> prepared;
};

TEST_F(SqliteStatementTest, ASelectIsPreparedOnce)
{
    RunEach({"CREATE TABLE jobs (id)", "INSERT INTO jobs VALUES (1), (2)"});
    ASSERT_TRUE(db.Open());
    EXPECT_EQ(Select(ids), "id:1; prepared");
    EXPECT_EQ(Select(ids), "id:1; kept");

    std::vector<SqliteValueList> records;
    EXPECT_TRUE(db.SelectByCommand(ids, records));
    EXPECT_EQ(records.size(), 2U);
    EXPECT_EQ(Select(ids), "id:1; kept");
}

TEST_F(SqliteStatementTest, TheLookForATableIsPreparedOnce)
{
    const SqliteTableHandler jobs("jobs", "id INTEGER");
    ASSERT_TRUE(db.Open());
    ASSERT_TRUE(db.CreateTable(jobs));
    SelectCommand command;
    command.SetTable(jobs);
    command.SelectAll();
    std::vector<SqliteValueList> records;
    EXPECT_TRUE(db.SelectRecords(command, records));
    prepared.clear();
    EXPECT_TRUE(db.SelectRecords(command, records));
    EXPECT_TRUE(db.DeleteAllRecords(jobs));
    EXPECT_EQ(prepared, std::vector<std::string>{"DELETE FROM jobs;"});
}

TEST_F(SqliteStatementTest, AKeptSelectSeesNewRowsAndColumns)
{
    const std::string all = "SELECT * FROM jobs";
    RunEach({"CREATE TABLE jobs (id)", "INSERT INTO jobs VALUES (1)"});
    ASSERT_TRUE(db.Open());
    EXPECT_EQ(Select(all), "id:1; prepared");
    Run("UPDATE jobs SET id = 2");
    EXPECT_EQ(Select(all), "id:2; kept");
    Run("ALTER TABLE jobs ADD COLUMN size DEFAULT 7");
    EXPECT_EQ(Select(all), "id:2, size:7; kept");
    RunEach({"DROP TABLE jobs", "CREATE TABLE jobs (name)", "INSERT INTO jobs VALUES ('new')"});
    EXPECT_EQ(Select(all), "name:'new'; kept");
}

TEST_F(SqliteStatementTest, AKeptSelectOfATableThatIsGoneFailsAsANewOneDoes)
{
    const Failure noTable{ids, SQLITE_ERROR, "no such table: jobs"};
    Run("CREATE TABLE jobs (id)");
    ASSERT_TRUE(retrying.Open());
    SqliteValueList record;
    EXPECT_TRUE(retrying.SelectByCommand(ids, record));
    Run("DROP TABLE jobs");
    EXPECT_FALSE(retrying.SelectByCommand(ids, record));
    ExpectErr(retrying, 404, TriesText(noTable, 4));
    ExpectLines({OneRowGaveUp(noTable, 4)});
    ExpectPauses(3);
}

TEST_F(SqliteStatementTest, AKeptSelectWaitsForNobodyAndKeepsNobodyOut)
{
    RunEach({"CREATE TABLE jobs (id)", "INSERT INTO jobs VALUES (1), (2)"});
    ASSERT_TRUE(db.Open());
    EXPECT_EQ(Select(ids), "id:1; prepared");  // leaves the second row unread
    PlainDb other(path);
    other.Run("BEGIN EXCLUSIVE");
    other.Run("INSERT INTO jobs VALUES (3)");
    other.Run("COMMIT");
    EXPECT_TRUE(db.Exec("DROP TABLE jobs"));
    EXPECT_TRUE(db.Exec("VACUUM"));
}

TEST_F(SqliteStatementTest, TheSelectsUsedLastAreKept)
{
    ASSERT_TRUE(db.Open());
    const auto number = [](int value) { return "SELECT " + std::to_string(value) + " AS x"; };
    for (int value = 1; value <= 8; ++value) Select(number(value));
    EXPECT_EQ(Select(number(1)), "x:1; kept");  // now that of 2 is the oldest
    EXPECT_EQ(Select(number(9)), "x:9; prepared");
    EXPECT_EQ(Select(number(1)), "x:1; kept");
    EXPECT_EQ(Select(number(3)), "x:3; kept");
    EXPECT_EQ(Select(number(2)), "x:2; prepared");
}

TEST_F(SqliteStatementTest, WhatIsNoSelectOrVeryLongIsPreparedEachTime)
{
    Run("CREATE TABLE jobs (id)");
    ASSERT_TRUE(db.Open());
    const std::string longest = "SELECT 1 AS x " + std::string(1024 - 14, ' ');
    for (const std::string& statement :
         {std::string("PRAGMA user_version"), std::string("INSERT INTO jobs VALUES (1)"),
          std::string("VALUES (1)"), std::string(" SELECT 1"), longest + " "}) {
        Select(statement);
        Select(statement);
        EXPECT_EQ(prepared, std::vector<std::string>{statement});
    }
    Select(longest);
    EXPECT_EQ(Select(longest), "x:1; kept");
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "2");
}

TEST_F(SqliteStatementTest, ClosingLetsTheKeptSelectsGo)
{
    ASSERT_TRUE(db.Open());
    Select("SELECT 1 AS x");
    db.Close();
    EXPECT_EQ(Closed(), 1);
    ASSERT_TRUE(db.Open());
    EXPECT_EQ(Select("SELECT 1 AS x"), "x:1; prepared");
}

TEST_F(SqliteStatementTest, AMoveTakesTheKeptSelects)
{
    ASSERT_TRUE(db.Open());
    Select("SELECT 1 AS x");
    SqliteDB other("", 0);
    other = std::move(db);
    db = std::move(other);
    EXPECT_EQ(Select("SELECT 1 AS x"), "x:1; kept");
    EXPECT_EQ(Closed(), 0);
}

}  // namespace
