#include "sqlite/sqlite_watch.h"

#include <gtest/gtest.h>

#include <memory>

namespace {

using OrvaDRCore::StatementWatch;

struct CloseDatabase {
    void operator()(sqlite3* handle) const { sqlite3_close(handle); }
};
using Database = std::unique_ptr<sqlite3, CloseDatabase>;

Database OpenInMemory(StatementWatch& watch)
{
    sqlite3* handle = nullptr;
    EXPECT_EQ(sqlite3_open_v2(":memory:", &handle, SQLITE_OPEN_READWRITE, nullptr), SQLITE_OK);
    watch.Start(handle);
    return Database(handle);
}

class StatementWatchTest : public ::testing::Test {
  protected:
    void Run(const char* text) const { sqlite3_exec(db.get(), text, nullptr, nullptr, nullptr); }

    StatementWatch watch;
    Database db = OpenInMemory(watch);
};

TEST_F(StatementWatchTest, CountsOutermostTransactions)
{
    EXPECT_EQ(watch.CountTransactions(), 0U);
    struct Row {
        const char* text;
        std::uint64_t count;
    };
    for (const Row& row : {
             Row{"CREATE TABLE jobs (id); INSERT INTO jobs VALUES (1)", 0},
             Row{"BEGIN", 1},
             Row{"SAVEPOINT inner; ROLLBACK TO inner; RELEASE inner", 1},
             Row{"BEGIN", 1},  // fails
             Row{"COMMIT", 1},
             Row{"begin immediate; rollback; savepoint outer; release outer", 3},
             Row{"BEGIN EXCLUSIVE; COMMIT; BEGIN; END", 5},
             Row{"SELECT 'BEGIN'; -- BEGIN", 5},
         }) {
        Run(row.text);
        EXPECT_EQ(watch.CountTransactions(), row.count) << row.text;
    }
    EXPECT_NE(sqlite3_get_autocommit(db.get()), 0);
}

TEST_F(StatementWatchTest, SeesTheBusyTimeoutSetInEverySpelling)
{
    for (const char* text : {"PRAGMA busy_timeout", "SELECT timeout FROM pragma_busy_timeout",
                             "PRAGMA cache_size=100", "PRAGMA nowhere.busy_timeout=5"}) {
        Run(text);
        EXPECT_FALSE(watch.IsBusyTimeoutSet()) << text;
    }
    for (const char* text : {"PRAGMA busy_timeout=5", "pragma main.\"Busy_TIMEOUT\"(5)",
                             "SELECT 1; PRAGMA/**/[busy_timeout] = -1; BAD"}) {
        db = OpenInMemory(watch);
        EXPECT_FALSE(watch.IsBusyTimeoutSet());
        Run(text);
        EXPECT_TRUE(watch.IsBusyTimeoutSet()) << text;
    }
}

TEST_F(StatementWatchTest, SeesThePragmasThatHideChangesOfTheSchema)
{
    for (const char* text : {"PRAGMA writable_schema", "SELECT * FROM pragma_schema_version",
                             "PRAGMA user_version=7", "CREATE TABLE jobs (id)"}) {
        Run(text);
        EXPECT_FALSE(watch.IsSchemaUnguarded()) << text;
    }
    for (const char* text : {"PRAGMA writable_schema=1", "pragma main.\"SCHEMA_version\"(5)",
                             "SELECT 1; PRAGMA/**/[Writable_Schema] = RESET; BAD"}) {
        db = OpenInMemory(watch);
        EXPECT_FALSE(watch.IsSchemaUnguarded());
        Run(text);
        EXPECT_TRUE(watch.IsSchemaUnguarded()) << text;
    }
}

TEST_F(StatementWatchTest, CountsStatementsThatMayChangeTheSchemaOrUndoThat)
{
    std::uint64_t before = watch.CountSchemaStatements();
    for (const char* text :
         {"CREATE TABLE jobs (id)", "CREATE TEMP TABLE others (id)", "SAVEPOINT s",
          "ALTER TABLE jobs RENAME TO tasks", "DROP TABLE tasks", "ROLLBACK TO s; RELEASE s",
          "ATTACH ':memory:' AS more", "PRAGMA user_version=1",
          "CREATE VIRTUAL TABLE words USING fts5(word)"}) {
        Run(text);
        EXPECT_GT(watch.CountSchemaStatements(), before) << text;
        before = watch.CountSchemaStatements();
    }
    const std::uint64_t definitions = watch.CountDefinitions();
    EXPECT_GE(definitions, 5U);
    for (const char* text :
         {"BEGIN; INSERT INTO jobs VALUES (1); COMMIT", "UPDATE jobs SET id=abs(id)",
          "DELETE FROM jobs", "SELECT * FROM jobs"}) {
        Run(text);
        EXPECT_EQ(watch.CountSchemaStatements(), before) << text;
    }
    Run("PRAGMA user_version; SAVEPOINT s; RELEASE s");
    EXPECT_EQ(watch.CountDefinitions(), definitions);
    Run("EXPLAIN PRAGMA foreign_keys=ON");  // takes effect all the same
    EXPECT_EQ(watch.CountDefinitions(), definitions + 1);
}

TEST_F(StatementWatchTest, SeesTemporaryTablesAndViews)
{
    for (const char* text : {"CREATE TABLE jobs (id)", "CREATE VIEW ids AS SELECT 1",
                             "CREATE VIRTUAL TABLE words USING fts5(word)"}) {
        Run(text);
        EXPECT_FALSE(watch.HasTempTables()) << text;
    }
    for (const char* text :
         {"CREATE TEMP TABLE jobs (id)", "CREATE TABLE temp.jobs AS SELECT 1 AS id",
          "CREATE TEMPORARY VIEW jobs AS SELECT 1",
          "CREATE VIRTUAL TABLE Temp.jobs USING fts5(id)"}) {
        db = OpenInMemory(watch);
        EXPECT_FALSE(watch.HasTempTables());
        Run(text);
        EXPECT_TRUE(watch.HasTempTables()) << text;
    }
}

TEST_F(StatementWatchTest, CountsStatementsThatChangeRowsAndTheirRows)
{
    struct Row {
        const char* text;
        std::uint64_t statements;
        std::int64_t rows;
    };
    for (const Row& row : {
             Row{"CREATE TABLE jobs (id); CREATE TEMP TABLE others (id)", 0, 0},
             Row{"INSERT INTO jobs VALUES (1), (2); INSERT INTO jobs VALUES (3)", 2, 3},
             Row{"SELECT * FROM jobs; CREATE INDEX ids ON jobs (id); BEGIN; COMMIT", 2, 3},
             Row{"UPDATE jobs SET id=id WHERE id<3; DELETE FROM jobs WHERE id=7", 4, 5},
             Row{"INSERT INTO others VALUES (1); BAD", 5, 6},
         }) {
        Run(row.text);
        EXPECT_EQ(watch.CountChanges().statements, row.statements) << row.text;
        EXPECT_EQ(watch.CountChanges().rows, row.rows) << row.text;
    }
    EXPECT_EQ(watch.CountAllRows(), 6);
}

TEST_F(StatementWatchTest, RefusesTransactionsWhileItIsAskedTo)
{
    watch.ForbidTransactions(true);
    for (const char* text : {"BEGIN", "COMMIT", "ROLLBACK"}) {
        EXPECT_EQ(sqlite3_exec(db.get(), text, nullptr, nullptr, nullptr), SQLITE_AUTH) << text;
    }
    EXPECT_EQ(sqlite3_exec(db.get(), "CREATE TABLE jobs (id); SAVEPOINT a; RELEASE a", nullptr,
                           nullptr, nullptr),
              SQLITE_OK);
    watch.ForbidTransactions(false);
    EXPECT_EQ(sqlite3_exec(db.get(), "BEGIN; COMMIT", nullptr, nullptr, nullptr), SQLITE_OK);
}

TEST_F(StatementWatchTest, RefusesToPrepareAStatementAgainWhileItIsAskedTo)
{
    Run("CREATE TABLE jobs (id)");
    sqlite3_stmt* select = nullptr;
    ASSERT_EQ(sqlite3_prepare_v2(db.get(), "SELECT id FROM jobs", -1, &select, nullptr), SQLITE_OK);
    watch.RefuseToPrepareAgain(select);
    EXPECT_EQ(sqlite3_step(select), SQLITE_DONE);
    EXPECT_FALSE(watch.AcceptToPrepareAgain());
    sqlite3_reset(select);
    Run("CREATE INDEX jobs_id ON jobs(id)");
    watch.RefuseToPrepareAgain(select);
    EXPECT_EQ(sqlite3_step(select), SQLITE_AUTH);
    EXPECT_TRUE(watch.AcceptToPrepareAgain());
    sqlite3_reset(select);
    EXPECT_EQ(sqlite3_step(select), SQLITE_DONE);
    sqlite3_finalize(select);
}

TEST_F(StatementWatchTest, KeepsCountingOnTheNextConnection)
{
    Run("CREATE TABLE jobs (id); INSERT INTO jobs VALUES (1)");
    EXPECT_EQ(watch.CountChanges().rows, 1);
    Run("BEGIN");
    watch.Stop();
    EXPECT_EQ(watch.CountChanges().rows, 1);
    EXPECT_EQ(watch.CountAllRows(), 0);
    db = OpenInMemory(watch);
    Run("BEGIN");
    EXPECT_EQ(watch.CountTransactions(), 2U);
    Run("CREATE TABLE jobs (id); INSERT INTO jobs VALUES (1)");
    EXPECT_EQ(watch.CountChanges().rows, 2);
}

}  // namespace
