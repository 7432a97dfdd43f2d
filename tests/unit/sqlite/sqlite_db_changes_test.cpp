// What an operation has changed: GetAffectedRows, GetLastInsertId, GetSqliteCode, and whether a row
// was found.
#include <sys/stat.h>

#include <cstdio>
#include <functional>

#include <orvadrcore/sqlite_db.h>
#include <orvadrcore/sqlite_transaction.h>

#include "support/fixtures/sqlite_fixture.h"

namespace {

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteRow;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteTransaction;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;

class SqliteDbChangesTest : public SqliteFixture {
  protected:
    static SqliteTableHandler Jobs()
    {
        return SqliteTableHandler("jobs", "id INTEGER PRIMARY KEY, state INTEGER UNIQUE");
    }

    static SqliteValueList Record(int state)
    {
        SqliteValueList record;
        record.AddValue("state", state);
        return record;
    }

    bool Insert(int state)
    {
        InsertCommand insert;
        insert.SetTable(Jobs());
        insert.SetFieldValues(Record(state));
        return db.InsertRecord(insert);
    }

    bool Update(const std::string& condition)
    {
        UpdateCommand update;
        update.SetTable(Jobs());
        update.AddFieldValue("id", 1);
        update.SetCondition(condition);
        return db.UpdateRecord(update);
    }

    // Runs a text that may fail, and returns the number of rows.
    std::int64_t Exec(const std::string& text)
    {
        db.Exec(text);
        TakeLines();
        return db.GetAffectedRows();
    }

    static SelectCommand Select(const std::string& condition)
    {
        SelectCommand select;
        select.SetTable(Jobs());
        select.SelectAll();
        select.SetCondition(condition);
        return select;
    }

    // Three jobs, with the states 1 to 3.
    void MakeJobs() { ASSERT_TRUE(db.InsertRecords(Jobs(), {Record(1), Record(2), Record(3)})); }
};

// ----------------------------------------------------------------------------------- affected rows

TEST_F(SqliteDbChangesTest, EachOperationTellsHowManyRowsItHasChanged)
{
    EXPECT_EQ(db.GetAffectedRows(), 0);
    EXPECT_TRUE(Insert(10));  // makes the table, too
    EXPECT_EQ(db.GetAffectedRows(), 1);
    EXPECT_TRUE(db.InsertRecords(Jobs(), {Record(11), Record(12), Record(13)}));
    EXPECT_EQ(db.GetAffectedRows(), 3);
    EXPECT_TRUE(Update("id=1"));
    EXPECT_EQ(db.GetAffectedRows(), 1);
    EXPECT_TRUE(Update("id=77"));
    EXPECT_EQ(db.GetAffectedRows(), 0);
    EXPECT_TRUE(db.DeleteRecord("id>2", Jobs()));
    EXPECT_EQ(db.GetAffectedRows(), 2);
    EXPECT_TRUE(db.DeleteAllRecords(Jobs()));
    EXPECT_EQ(db.GetAffectedRows(), 2);
    EXPECT_TRUE(db.DeleteAllRecords(Jobs()));
    EXPECT_EQ(db.GetAffectedRows(), 0);
    EXPECT_TRUE(Insert(14));
    EXPECT_TRUE(db.InsertRecords(Jobs(), {}));
    EXPECT_EQ(db.GetAffectedRows(), 0);
}

TEST_F(SqliteDbChangesTest, ExecCountsTheRowsOfAllItsStatements)
{
    MakeJobs();
    EXPECT_EQ(Exec("UPDATE jobs SET state=-state"), 3);
    EXPECT_EQ(Exec("INSERT INTO jobs VALUES (7,7); CREATE TABLE others (id); SELECT * FROM jobs;"
                   "UPDATE jobs SET state=state+100; DELETE FROM jobs WHERE id=7"),
              6);
    EXPECT_EQ(Exec("INSERT OR REPLACE INTO jobs VALUES (1,5)"), 1);
    EXPECT_EQ(Exec("INSERT OR IGNORE INTO jobs VALUES (1,5)"), 0);
    EXPECT_EQ(Exec("WITH n AS (SELECT 8 AS x) INSERT INTO jobs SELECT x, x FROM n"), 1);
    EXPECT_TRUE(db.DoExecSqliteCommand("UPDATE jobs SET state=state+1000"));
    EXPECT_EQ(db.GetAffectedRows(), 4);
    EXPECT_EQ(Exec("DELETE FROM jobs"), 4);
}

TEST_F(SqliteDbChangesTest, WhatChangesNoRowsLeavesTheNumber)
{
    MakeJobs();
    std::vector<SqliteValueList> records;
    EXPECT_TRUE(db.SelectRecords(Select("id>0"), records));
    EXPECT_TRUE(db.SelectEach(Select("id>0"), [](const SqliteRow&) { return true; }));
    EXPECT_TRUE(db.CreateTable(SqliteTableHandler("others", "id")));
    EXPECT_TRUE(db.IsTableExisted("others"));
    for (const char* text :
         {"CREATE INDEX states ON jobs (state)", "BEGIN", "SAVEPOINT inner", "RELEASE inner",
          "COMMIT", "ALTER TABLE others ADD COLUMN name", "CREATE TEMP TABLE temporary (id)",
          "PRAGMA cache_size=100", "SELECT 1", "VACUUM", "-- nothing"}) {
        EXPECT_EQ(Exec(text), 3) << text;
    }
    SqliteValueList record;
    EXPECT_TRUE(db.SelectByCommand("PRAGMA journal_mode=WAL", record));
    EXPECT_EQ(db.GetAffectedRows(), 3);
    db.Close();
    EXPECT_EQ(db.GetAffectedRows(), 3);
    EXPECT_TRUE(db.Open());
    EXPECT_EQ(Exec("UPDATE jobs SET id=id WHERE id=2"), 1);
}

TEST_F(SqliteDbChangesTest, AFailureLeavesNoRows)
{
    MakeJobs();
    EXPECT_EQ(Exec("BAD"), 0);
    SqliteValueList record;
    EXPECT_TRUE(db.SelectRecord(Select("id=1"), record));
    EXPECT_EQ(db.GetAffectedRows(), 0);

    const auto expectNone = [this](const std::string& what, const std::function<bool()>& fail) {
        SCOPED_TRACE(what);
        EXPECT_EQ(Exec("UPDATE jobs SET id=id"), 3);
        EXPECT_FALSE(fail());
        EXPECT_EQ(db.GetAffectedRows(), 0);
        TakeLines();
    };
    expectNone("row", [&] { return Insert(1); });
    expectNone("rows", [&] { return db.InsertRecords(Jobs(), {Record(8), Record(1)}); });
    expectNone("statements", [&] { return db.Exec("UPDATE jobs SET id=id; BAD"); });
    expectNone("select", [&] { return db.SelectByCommand("BAD", record); });
    expectNone("command", [&] { return db.UpdateRecord(UpdateCommand()); });
    expectNone("empty text", [&] { return db.Exec(""); });
    expectNone("delete", [&] { return db.DeleteRecord("", Jobs()); });
    expectNone("commit", [&] { return SqliteTransaction(db).Commit(); });
}

TEST_F(SqliteDbChangesTest, AFileThatCannotBeOpenedLeavesNoRows)
{
    MakeJobs();
    db.Close();
    const std::string away = dir.File("away.db");
    ASSERT_EQ(::rename(path.c_str(), away.c_str()), 0);
    ASSERT_EQ(::mkdir(path.c_str(), 0700), 0);
    EXPECT_FALSE(Insert(4));
    EXPECT_EQ(db.GetAffectedRows(), 0);
    EXPECT_EQ(db.GetSqliteCode() & 0xff, SQLITE_CANTOPEN);
    TakeLines();
}

TEST_F(SqliteDbChangesTest, AStatementWithRowsThatWritesCounts)
{
    MakeJobs();
    SqliteValueList record;
    EXPECT_TRUE(db.SelectByCommand("UPDATE jobs SET state=-state RETURNING id", record));
    EXPECT_EQ(db.GetAffectedRows(), 3);
    EXPECT_TRUE(db.SelectEachByCommand("DELETE FROM jobs WHERE id<3 RETURNING id",
                                       [](const SqliteRow&) { return true; }));
    EXPECT_EQ(db.GetAffectedRows(), 2);
    EXPECT_TRUE(db.SelectByCommand("DELETE FROM jobs WHERE id=77 RETURNING id", record));
    EXPECT_EQ(db.GetAffectedRows(), 0);
}

TEST_F(SqliteDbChangesTest, RowsChangedByTriggersAndForeignKeysDoNotCount)
{
    MakeJobs();
    Exec(
        "CREATE TABLE log (id INTEGER PRIMARY KEY, text);"
        "CREATE TRIGGER noted AFTER UPDATE ON jobs BEGIN"
        " INSERT INTO log (text) VALUES ('a'); INSERT INTO log (text) VALUES ('b'); END;"
        "CREATE TRIGGER inserted AFTER INSERT ON jobs BEGIN"
        " INSERT INTO log (text) VALUES ('c'), ('d'); END;"
        "CREATE TABLE parts (job REFERENCES jobs (id) ON DELETE CASCADE);"
        "INSERT INTO parts VALUES (1), (1), (2)");
    EXPECT_EQ(Exec("UPDATE jobs SET state=-state"), 3);
    EXPECT_EQ(Exec("UPDATE jobs SET state=state+100; UPDATE jobs SET state=0 WHERE id=1"), 4);
    EXPECT_TRUE(db.InsertRecords(Jobs(), {Record(7), Record(8)}));
    EXPECT_EQ(db.GetAffectedRows(), 2);
    Exec("PRAGMA foreign_keys=ON");
    EXPECT_EQ(Exec("DELETE FROM jobs WHERE id<3"), 2);
    EXPECT_EQ(Run("SELECT count(*) FROM parts"), "0");
    Exec(
        "CREATE VIEW both AS SELECT * FROM jobs; CREATE TRIGGER into_view INSTEAD OF INSERT ON both"
        " BEGIN INSERT INTO jobs VALUES (NEW.id, NEW.state); END");
    EXPECT_EQ(Exec("INSERT INTO both VALUES (70, 70)"), 0);  // SQLite counts none for a view
}

TEST_F(SqliteDbChangesTest, RowsOfAVirtualTableCountOnce)
{
    ASSERT_TRUE(db.Open());
    Exec("CREATE VIRTUAL TABLE texts USING fts5 (body)");
    EXPECT_EQ(Exec("INSERT INTO texts VALUES ('one'), ('two')"), 2);
    EXPECT_EQ(Exec("INSERT INTO texts VALUES ('three'); UPDATE texts SET body='four'"), 4);
}

TEST_F(SqliteDbChangesTest, CommitAndRollbackLeaveTheNumber)
{
    MakeJobs();
    SqliteTransaction transaction(db);
    ASSERT_TRUE(transaction.Begin());
    EXPECT_EQ(Exec("UPDATE jobs SET state=-state WHERE id<3"), 2);
    EXPECT_TRUE(transaction.Commit());
    EXPECT_EQ(db.GetAffectedRows(), 2);
    ASSERT_TRUE(transaction.Begin());
    EXPECT_EQ(Exec("DELETE FROM jobs"), 3);
    EXPECT_TRUE(transaction.Rollback());
    EXPECT_EQ(db.GetAffectedRows(), 3);
}

TEST_F(SqliteDbChangesTest, OnlyTheAttemptThatSucceedsCounts)
{
    MakeJobs();
    ASSERT_TRUE(retrying.Open());
    LockHolder holder(path);
    pauses.OnPause([&](std::size_t) { holder.Release(); });
    EXPECT_TRUE(retrying.InsertRecords(SqliteTableHandler("jobs", ""), {Record(7), Record(8)}));
    EXPECT_EQ(retrying.GetAffectedRows(), 2);
    ExpectPauses(1);
}

// ---------------------------------------------------------------------------------- last insert id

TEST_F(SqliteDbChangesTest, TheLastInsertIdIsThatOfThisConnection)
{
    EXPECT_EQ(db.GetLastInsertId(), 0);
    MakeJobs();
    EXPECT_EQ(db.GetLastInsertId(), 3);
    EXPECT_EQ(Exec("INSERT INTO jobs VALUES (5000000000, 7)"), 1);
    EXPECT_EQ(db.GetLastInsertId(), 5'000'000'000);
    EXPECT_TRUE(retrying.Open());
    EXPECT_TRUE(retrying.Exec("INSERT INTO jobs VALUES (9, 9)"));
    EXPECT_EQ(db.GetLastInsertId(), 5'000'000'000);
    EXPECT_FALSE(Insert(9));
    TakeLines();
    EXPECT_EQ(db.GetLastInsertId(), 5'000'000'000);
    db.Close();
    EXPECT_EQ(db.GetLastInsertId(), 0);
}

// ------------------------------------------------------------------------------------ SQLite's code

TEST_F(SqliteDbChangesTest, SqlitesCodeIsTheExtendedOne)
{
    MakeJobs();
    EXPECT_EQ(db.GetSqliteCode(), 0);
    EXPECT_FALSE(Insert(1));
    EXPECT_EQ(db.GetSqliteCode(), SQLITE_CONSTRAINT_UNIQUE);
    EXPECT_EQ(db.GetErr()[0]["err_msg"]["sqlite_errcode"].asInt(), SQLITE_CONSTRAINT);
    EXPECT_EQ(Exec("SELECT 1"), 0);
    EXPECT_EQ(db.GetSqliteCode(), 0);
    EXPECT_FALSE(db.InsertRecords(Jobs(), {Record(8), Record(1)}));
    EXPECT_EQ(db.GetSqliteCode(), SQLITE_CONSTRAINT_UNIQUE);
    SqliteValueList record;
    EXPECT_FALSE(db.SelectByCommand("INSERT INTO jobs VALUES (1,7) RETURNING id", record));
    EXPECT_EQ(db.GetSqliteCode(), SQLITE_CONSTRAINT_PRIMARYKEY);
    EXPECT_FALSE(db.SelectByCommand("BAD", record));
    EXPECT_EQ(db.GetSqliteCode(), SQLITE_ERROR);
    EXPECT_FALSE(db.DoExecSqliteCommand("UPDATE jobs SET id=1"));
    EXPECT_EQ(db.GetSqliteCode(), SQLITE_CONSTRAINT_PRIMARYKEY);
    EXPECT_FALSE(db.Exec(""));
    EXPECT_EQ(db.GetSqliteCode(), 0);  // SQLite was not asked
    db.Close();
    EXPECT_FALSE(db.SelectByCommand("SELECT 1", record));
    EXPECT_EQ(db.GetSqliteCode(), SQLITE_MISUSE);
    TakeLines();
}

TEST_F(SqliteDbChangesTest, SqlitesCodeIsThatOfTheLastAttempt)
{
    MakeJobs();
    ASSERT_TRUE(retrying.Open());
    LockHolder holder(path);
    pauses.OnPause([&](std::size_t number) {
        if (number == 3) holder.Release();
    });
    EXPECT_FALSE(retrying.Exec("INSERT INTO jobs VALUES (1,1)"));
    EXPECT_EQ(retrying.GetErr()[0]["err_msg"]["sqlite_errcode"].asInt(), SQLITE_BUSY);
    EXPECT_EQ(retrying.GetSqliteCode() & 0xff, SQLITE_CONSTRAINT);
    TakeLines();
}

TEST_F(SqliteDbChangesTest, ACallersOwnErrorKeepsItsCode)
{
    db.SetDBErr("statement", SQLITE_CONSTRAINT_UNIQUE, "message");
    EXPECT_EQ(db.GetSqliteCode(), SQLITE_CONSTRAINT_UNIQUE);
    ExpectErr(db, 404, ErrorText({"statement", SQLITE_CONSTRAINT_UNIQUE, "message"}));
    SqliteDB other(std::move(db));
    EXPECT_EQ(other.GetSqliteCode(), SQLITE_CONSTRAINT_UNIQUE);
    EXPECT_EQ(db.GetSqliteCode(), 0);
}

TEST_F(SqliteDbChangesTest, AFileThatCannotBeOpenedHasSqlitesCode)
{
    SqliteDB nowhere(dir.File("none/jobs.db"), 0);
    EXPECT_FALSE(nowhere.Open());
    ExpectErr(nowhere, 0);
    EXPECT_EQ(nowhere.GetSqliteCode(), SQLITE_CANTOPEN);
    EXPECT_FALSE(nowhere.DeleteAllRecords(Jobs()));
    ExpectErr(nowhere, 404);
    EXPECT_EQ(nowhere.GetSqliteCode(), SQLITE_CANTOPEN);
    TakeLines();
}

// ------------------------------------------------------------------------------------ found or not

TEST_F(SqliteDbChangesTest, AOneRowSelectTellsWhetherThereWasARow)
{
    MakeJobs();
    SqliteValueList record;
    bool found = false;
    EXPECT_TRUE(db.SelectRecord(Select("id=2"), record, found));
    EXPECT_TRUE(found);
    EXPECT_EQ(record.ToStr(), "id:2, state:2");
    EXPECT_TRUE(db.SelectRecord(Select("id=77"), record, found));
    EXPECT_FALSE(found);
    EXPECT_EQ(record.ToStr(), "id:2, state:2");
    ExpectErr(db, 0);
}

TEST_F(SqliteDbChangesTest, ARowOfNullsIsFoundAndEmpty)
{
    MakeJobs();
    ASSERT_EQ(Exec("UPDATE jobs SET state=NULL WHERE id=1"), 1);
    SelectCommand select;
    select.SetTable(Jobs());
    select.AddField("state");
    select.SetCondition("id=1");
    SqliteValueList record;
    record.AddValue("old", 1);
    bool found = false;
    EXPECT_TRUE(db.SelectRecord(select, record, found));
    EXPECT_TRUE(found);
    EXPECT_EQ(record.ToStr(), "");
    ExpectLines({Warn("ParseRecord", "field [state] has null value")});
}

TEST_F(SqliteDbChangesTest, AFailedOneRowSelectLeavesBothOutputs)
{
    const Failure noColumn{"SELECT  * FROM jobs WHERE x=1", SQLITE_ERROR, "no such column: x"};
    MakeJobs();
    SqliteValueList record;
    record.AddValue("old", 1);
    for (bool found : {true, false}) {
        const bool old = found;
        EXPECT_FALSE(db.SelectRecord(Select("x=1"), record, found));
        ExpectErr(db, 404, TriesText(noColumn));
        ExpectLines({OneRowGaveUp(noColumn), Err("SelectRecord", "Failed to select by command [" +
                                                                     noColumn.command + "]")});
        EXPECT_FALSE(db.SelectRecord(SelectCommand(), record, found));
        ExpectErr(db, 401);
        TakeLines();
        EXPECT_EQ(found, old);
        EXPECT_EQ(record.ToStr(), "old:1");
    }
}

}  // namespace
