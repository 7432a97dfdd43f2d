// The statements that a connection caches. Caching may save time but change nothing else.
#include "sqlite/sqlite_statement_cache.h"

#include <orvadrcore/sqlite_db.h>

#include <algorithm>

#include "support/fixtures/sqlite_fixture.h"

namespace {

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteRow;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValueList;

class SqliteStatementCacheTest : public SqliteFixture {
  protected:
    // Counts the statements that are prepared from here on.
    SqliteStatementCacheTest()
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
        const bool isCached = std::count(prepared.begin(), prepared.end(), statement) == 0;
        return record.ToStr() + (isCached ? "; cached" : "; prepared");
    }

    // Attaches another file that holds a table `nodes` with one row.
    void AttachNodes(const std::string& name)
    {
        const std::string attached = dir.File(name + ".db");
        PlainDb other(attached);
        for (const std::string& statement : {std::string("CREATE TABLE nodes (id)"),
                                             "INSERT INTO nodes VALUES ('" + name + "')"}) {
            other.Run(statement);
        }
        ASSERT_TRUE(db.Open());
        ASSERT_TRUE(db.Exec("ATTACH '" + attached + "' AS " + name));
    }

    const std::string ids = "SELECT id FROM jobs";
    const std::string nodeIds = "SELECT id FROM nodes";
    SqliteFaults faults;
    std::vector<std::string> prepared;
};

TEST_F(SqliteStatementCacheTest, ASelectIsPreparedOnce)
{
    RunEach({"CREATE TABLE jobs (id)", "INSERT INTO jobs VALUES (1), (2)"});
    ASSERT_TRUE(db.Open());
    EXPECT_EQ(Select(ids), "id:1; prepared");
    EXPECT_EQ(Select(ids), "id:1; cached");

    std::vector<SqliteValueList> records;
    EXPECT_TRUE(db.SelectByCommand(ids, records));
    EXPECT_EQ(records.size(), 2U);
    EXPECT_EQ(Select(ids), "id:1; cached");
}

TEST_F(SqliteStatementCacheTest, TheTableLookupIsPreparedOnce)
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

TEST_F(SqliteStatementCacheTest, ACachedSelectSeesNewRowsAndColumns)
{
    const std::string all = "SELECT * FROM jobs";
    RunEach({"CREATE TABLE jobs (id)", "INSERT INTO jobs VALUES (1)"});
    ASSERT_TRUE(db.Open());
    EXPECT_EQ(Select(all), "id:1; prepared");
    Run("UPDATE jobs SET id = 2");
    EXPECT_EQ(Select(all), "id:2; cached");
    Run("ALTER TABLE jobs ADD COLUMN size DEFAULT 7");
    EXPECT_EQ(Select(all), "id:2, size:7; cached");
    RunEach({"DROP TABLE jobs", "CREATE TABLE jobs (name)", "INSERT INTO jobs VALUES ('new')"});
    EXPECT_EQ(Select(all), "name:'new'; cached");
}

TEST_F(SqliteStatementCacheTest, ACachedSelectFailsLikeANewOneWhenItsTableIsGone)
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

TEST_F(SqliteStatementCacheTest, ACachedSelectHoldsNoLock)
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

TEST_F(SqliteStatementCacheTest, TheMostRecentSelectsAreCached)
{
    ASSERT_TRUE(db.Open());
    const auto number = [](int value) { return "SELECT " + std::to_string(value) + " AS x"; };
    for (int value = 1; value <= 20; ++value) Select(number(value));
    EXPECT_EQ(Select(number(1)), "x:1; cached");  // now that of 2 is the oldest
    EXPECT_EQ(Select(number(21)), "x:21; prepared");
    EXPECT_EQ(Select(number(1)), "x:1; cached");
    EXPECT_EQ(Select(number(3)), "x:3; cached");
    EXPECT_EQ(Select(number(2)), "x:2; prepared");
}

TEST_F(SqliteStatementCacheTest, ASelectInsideOfTheSameSelectIsPreparedOnceMore)
{
    RunEach({"CREATE TABLE jobs (id)", "INSERT INTO jobs VALUES (1), (2)"});
    ASSERT_TRUE(db.Open());
    EXPECT_EQ(Select(ids), "id:1; prepared");
    prepared.clear();
    EXPECT_TRUE(db.SelectEachByCommand(ids, [&](const SqliteRow&) {
        SqliteValueList record;
        EXPECT_TRUE(db.SelectByCommand(ids, record));  // prepared once for both rows
        EXPECT_TRUE(db.SelectByCommand("SELECT 1 AS x", record));
        return true;
    }));
    EXPECT_EQ(prepared, (std::vector<std::string>{ids, "SELECT 1 AS x"}));
    EXPECT_EQ(Select("SELECT 1 AS x"), "x:1; cached");
    EXPECT_EQ(Select(ids), "id:1; cached");  // there is one of the two
    EXPECT_EQ(Select("SELECT 2 AS x"), "x:2; prepared");
    EXPECT_EQ(Select(ids), "id:1; cached");
}

TEST_F(SqliteStatementCacheTest, OtherStatementsAndVeryLongSelectsAreNotCached)
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
    EXPECT_EQ(Select(longest), "x:1; cached");
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "2");
}

TEST_F(SqliteStatementCacheTest, ClosingDropsTheCachedSelects)
{
    ASSERT_TRUE(db.Open());
    Select("SELECT 1 AS x");
    db.Close();
    EXPECT_EQ(Closed(), 1);
    ASSERT_TRUE(db.Open());
    EXPECT_EQ(Select("SELECT 1 AS x"), "x:1; prepared");
}

TEST_F(SqliteStatementCacheTest, AMoveTakesTheCachedSelects)
{
    ASSERT_TRUE(db.Open());
    Select("SELECT 1 AS x");
    SqliteDB other("", 0);
    other = std::move(db);
    db = std::move(other);
    EXPECT_EQ(Select("SELECT 1 AS x"), "x:1; cached");
    EXPECT_EQ(Closed(), 0);
}

// ------------------------------------------------------------------------------ attached databases

TEST_F(SqliteStatementCacheTest, ATableMadeInMainIsReadInsteadOfTheAttachedOne)
{
    AttachNodes("old");
    SelectCommand select;
    select.SetTable(SqliteTableHandler("nodes", ""));
    select.AddField("id");
    SqliteValueList record;
    ASSERT_TRUE(db.SelectRecord(select, record));
    EXPECT_EQ(record.ToStr(), "id:'old'");

    InsertCommand insert;
    insert.SetTable(SqliteTableHandler("nodes", "id"));
    insert.AddFieldValue("id", 1);
    ASSERT_TRUE(db.InsertRecord(insert));  // makes main.nodes
    ASSERT_TRUE(db.SelectRecord(select, record));
    EXPECT_EQ(record.ToStr(), "id:1");
}

TEST_F(SqliteStatementCacheTest, AViewOrTempTableMadeLaterIsReadInsteadOfTheAttachedTable)
{
    AttachNodes("old");
    AttachNodes("older");
    EXPECT_EQ(Select(nodeIds), "id:'old'; prepared");
    ASSERT_TRUE(db.Exec("CREATE VIEW nodes AS SELECT 'view' AS id"));
    EXPECT_EQ(Select(nodeIds), "id:'view'; prepared");
    ASSERT_TRUE(db.Exec("CREATE TEMP TABLE nodes (id)"));
    ASSERT_TRUE(db.Exec("INSERT INTO temp.nodes VALUES ('temp')"));
    EXPECT_EQ(Select(nodeIds), "id:'temp'; prepared");
}

TEST_F(SqliteStatementCacheTest, ATableMadeInTheFirstOfTwoAttachedDatabasesIsRead)
{
    PlainDb(dir.File("empty.db")).Run("CREATE TABLE others (id)");
    ASSERT_TRUE(db.Open());
    ASSERT_TRUE(db.Exec("ATTACH '" + dir.File("empty.db") + "' AS empty"));
    AttachNodes("old");
    EXPECT_EQ(Select(nodeIds), "id:'old'; prepared");
    ASSERT_TRUE(db.Exec("CREATE TABLE empty.nodes (id)"));
    ASSERT_TRUE(db.Exec("INSERT INTO empty.nodes VALUES (2)"));
    EXPECT_EQ(Select(nodeIds), "id:2; prepared");
}

TEST_F(SqliteStatementCacheTest, ATableMadeInMainByAnotherProcessIsRead)
{
    AttachNodes("old");
    EXPECT_EQ(Select(nodeIds), "id:'old'; prepared");
    ChildProcess other([&](ChildProcess::Link&) {
        RunEach({"CREATE TABLE nodes (id)", "INSERT INTO nodes VALUES (3)"});
    });
    ASSERT_EQ(other.Join(), 0);
    // SQLite itself notices a changed schema only when it reads that database.
    EXPECT_EQ(Select("SELECT name FROM main.sqlite_master"), "name:'nodes'; prepared");
    EXPECT_EQ(Select(nodeIds), "id:3; prepared");
}

TEST_F(SqliteStatementCacheTest, ASelectThatWasCachedBeforeAnAttachIsNotUsedAfterIt)
{
    RunEach({"CREATE TABLE nodes (id)", "INSERT INTO nodes VALUES (1)"});
    ASSERT_TRUE(db.Open());
    EXPECT_EQ(Select(nodeIds), "id:1; prepared");
    EXPECT_EQ(Select(nodeIds), "id:1; cached");
    AttachNodes("old");
    ASSERT_TRUE(db.Exec("DROP TABLE main.nodes"));
    EXPECT_EQ(Select(nodeIds), "id:'old'; prepared");
    ASSERT_TRUE(db.Exec("CREATE TABLE nodes (id)"));
    ASSERT_TRUE(db.Exec("INSERT INTO main.nodes VALUES (4)"));
    EXPECT_EQ(Select(nodeIds), "id:4; prepared");
}

TEST_F(SqliteStatementCacheTest, CachingResumesAfterADetachThatNoStatementBlocks)
{
    RunEach({"CREATE TABLE jobs (id)", "INSERT INTO jobs VALUES (1)"});
    ASSERT_TRUE(db.Open());
    Select(ids);
    AttachNodes("old");
    EXPECT_EQ(Select("SELECT id FROM old.nodes"), "id:'old'; prepared");
    EXPECT_EQ(Select(ids), "id:1; prepared");
    EXPECT_TRUE(db.Exec("DETACH old"));
    EXPECT_EQ(Select(ids), "id:1; prepared");
    EXPECT_EQ(Select(ids), "id:1; cached");
}

TEST_F(SqliteStatementCacheTest, ATempTableIsReadInsteadOfTheTableOfACachedSelect)
{
    RunEach({"CREATE TABLE nodes (id)", "INSERT INTO nodes VALUES (1)"});
    ASSERT_TRUE(db.Open());
    Select(nodeIds);
    EXPECT_EQ(Select(nodeIds), "id:1; cached");
    ASSERT_TRUE(db.Exec("CREATE TEMP TABLE nodes (id)"));
    ASSERT_TRUE(db.Exec("INSERT INTO temp.nodes VALUES (5)"));
    // A connection that defines something forgets what it has cached.
    EXPECT_EQ(Select(nodeIds), "id:5; prepared");
    EXPECT_EQ(Select(nodeIds), "id:5; cached");
    ASSERT_TRUE(db.Exec("DROP TABLE temp.nodes"));
    EXPECT_EQ(Select(nodeIds), "id:1; prepared");
}

}  // namespace
