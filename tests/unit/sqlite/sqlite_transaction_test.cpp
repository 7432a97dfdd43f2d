#include <orvadrcore/sqlite_transaction.h>

#include <functional>
#include <memory>
#include <utility>

#include "support/fixtures/sqlite_fixture.h"

namespace {

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteTransaction;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;

class SqliteTransactionTest : public SqliteFixture {
  protected:
    SqliteTransactionTest() { Run("CREATE TABLE jobs (id INTEGER PRIMARY KEY, name TEXT)"); }

    // Lines of the transaction's own.
    static LogLine Told(const std::string& function, const std::string& message)
    {
        return Err(function, message).In("sqlite_transaction.cpp");
    }

    InsertCommand Insert(int id) const
    {
        InsertCommand command;
        command.SetTable(jobs);
        command.AddFieldValue("id", id);
        return command;
    }

    std::string Ids() const { return Run("SELECT id FROM jobs"); }

    // Has SQLite roll back what is open on the connection, at a row that is there already.
    void HaveSqliteRollBack(SqliteDB& connection)
    {
        EXPECT_FALSE(connection.InsertRecord(Insert(7)));
        EXPECT_EQ(TakeLines().size(), 2U);
    }

    // How often a statement that fails is tried.
    static std::size_t CountTries(SqliteDB& connection)
    {
        EXPECT_FALSE(connection.Exec("BAD"));
        EXPECT_EQ(TakeLines().size(), 1U);
        return connection.GetErr().size();
    }

    // A row that makes SQLite roll back whatever is open.
    void MakeConflictsRollBack() const
    {
        Run("DROP TABLE jobs; CREATE TABLE jobs (id INTEGER PRIMARY KEY ON CONFLICT ROLLBACK);"
            "INSERT INTO jobs VALUES (7)");
    }

    const SqliteTableHandler jobs{"jobs", ""};
    const Failure duplicate{"INSERT INTO jobs (id) VALUES (7);", SQLITE_CONSTRAINT,
                            "UNIQUE constraint failed: jobs.id"};
    const LogLine duplicateFailed =
        Err("InsertRecord", "Failed to exec [" + duplicate.command + "] in db[" + path + "]");
    const LogLine alreadyOpen = Told("Begin", "transaction is already open in db[" + path + "]");
    const LogLine wasRolledBack = Told("Commit", "transaction in db[" + path + "] was rolled back");
};

// ------------------------------------------------------------------------------------- all or none

TEST_F(SqliteTransactionTest, CommittedOperationsAreSeenByOthersTogether)
{
    SqliteTransaction transaction(db);
    EXPECT_EQ(Opened(), 0);
    ASSERT_TRUE(transaction.Begin());  // opens
    EXPECT_EQ(Opened(), 1);
    ExpectErr(db, 0);
    UpdateCommand update;
    update.SetTable(jobs);
    update.AddFieldValue("name", "a");
    update.SetCondition("id=1");
    SqliteValueList record;
    record.AddValue("id", 3);
    EXPECT_TRUE(db.InsertRecord(Insert(1)) && db.InsertRecord(Insert(2)) &&
                db.UpdateRecord(update) && db.DeleteRecord("id=2", jobs) &&
                db.InsertRecords(jobs, {record}));
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "0");
    EXPECT_TRUE(transaction.Commit());
    ExpectErr(db, 0);
    EXPECT_EQ(Run("SELECT * FROM jobs"), "1,a;3,NULL");
}

TEST_F(SqliteTransactionTest, RolledBackOperationsHaveNotHappened)
{
    SqliteTransaction transaction(db);
    ASSERT_TRUE(transaction.Begin() && db.InsertRecord(Insert(1)));
    db.SetDBErr("", 0, "earlier");
    EXPECT_TRUE(transaction.Rollback());
    ExpectErr(db, 0);
    EXPECT_EQ(Ids(), "");
    EXPECT_TRUE(db.InsertRecord(Insert(2)));  // outside
    EXPECT_EQ(Ids(), "2");
    EXPECT_EQ(Closed(), 0);
}

TEST_F(SqliteTransactionTest, WhatIsStillOpenIsRolledBackAtTheEndAndTheErrorStays)
{
    {
        SqliteTransaction transaction(db);
        ASSERT_TRUE(transaction.Begin() && db.InsertRecord(Insert(7)));
        EXPECT_FALSE(db.InsertRecord(Insert(7)));
    }
    ExpectErr(db, 404, TriesText(duplicate));
    ExpectLines({ExecGaveUp(duplicate), duplicateFailed});
    EXPECT_EQ(Ids(), "");
    EXPECT_TRUE(db.InsertRecord(Insert(1)));
    EXPECT_EQ(Ids(), "1");
}

TEST_F(SqliteTransactionTest, TheEndOfWhatIsNotOpenTouchesNothing)
{
    {
        const SqliteTransaction never(db);
    }
    EXPECT_EQ(Opened(), 0);
    {
        SqliteTransaction committed(db);
        ASSERT_TRUE(committed.Begin() && db.InsertRecord(Insert(1)) && committed.Commit());
        ASSERT_TRUE(db.Exec("BEGIN") && db.InsertRecord(Insert(2)));  // somebody else's
    }
    EXPECT_TRUE(db.Exec("COMMIT"));
    EXPECT_EQ(Ids(), "1;2");
}

TEST_F(SqliteTransactionTest, OneObjectServesManyTransactionsOneAfterTheOther)
{
    SqliteTransaction transaction(db);
    ASSERT_TRUE(transaction.Begin() && db.InsertRecord(Insert(1)) && transaction.Commit());
    ASSERT_TRUE(transaction.Begin() && db.InsertRecord(Insert(2)) && transaction.Rollback());
    ASSERT_TRUE(transaction.Begin() && db.InsertRecord(Insert(3)) && transaction.Commit());
    EXPECT_EQ(Ids(), "1;3");
}

// ------------------------------------------------------------------------------------------- Begin

TEST_F(SqliteTransactionTest, BeginInsideATransactionIsRefusedAndLeavesItOpen)
{
    SqliteTransaction transaction(db);
    SqliteTransaction second(db);
    ASSERT_TRUE(transaction.Begin() && db.InsertRecord(Insert(1)));
    for (SqliteTransaction* each : {&transaction, &second}) {
        db.SetDBErr("", 0, "earlier");
        EXPECT_FALSE(each->Begin());
        ExpectErr(db, 401);
        ExpectLines({alreadyOpen});
    }
    EXPECT_TRUE(second.Rollback());  // it has none
    EXPECT_TRUE(transaction.Commit());
    EXPECT_EQ(Ids(), "1");

    ASSERT_TRUE(db.Exec("BEGIN"));
    EXPECT_FALSE(transaction.Begin());
    ExpectErr(db, 401);
    ExpectLines({alreadyOpen});
    EXPECT_TRUE(db.Exec("COMMIT"));
}

TEST_F(SqliteTransactionTest, AFileThatCannotBeOpenedIsToldByBothLayers)
{
    SqliteDB refused(dir.Path(), 3);
    SqliteTransaction transaction(refused);
    refused.SetDBErr("", 0, "earlier");
    EXPECT_FALSE(transaction.Begin());
    ExpectErr(refused, 404);
    ExpectLines({Warn("Open", "Failed to open db[" + dir.Path() + "]"),
                 Told("Begin", "Failed to open db [" + dir.Path() + "]")});
    EXPECT_TRUE(transaction.Rollback());
    ExpectErr(refused, 0);
    ExpectPauses(0);
}

TEST_F(SqliteTransactionTest, AnotherWriterIsWaitedFor)
{
    LockHolder holder(path, "BEGIN IMMEDIATE");
    const Failure busy{"BEGIN IMMEDIATE", SQLITE_BUSY, Locked};
    SqliteTransaction transaction(retrying);
    EXPECT_FALSE(transaction.Begin());
    ExpectErr(retrying, 404, TriesText(busy, 4));
    ExpectLines(
        {ExecGaveUp(busy, 4), Told("Begin", "Failed to begin transaction in db[" + path + "]")});
    ExpectPauses(3);

    pauses.OnPause([&](std::size_t number) {
        if (number == 5) holder.Release();
    });
    EXPECT_TRUE(transaction.Begin());
    ExpectErr(retrying, 0);
    ExpectLines({Info("Exec",
                      "After retry [2] times, success to exec command [BEGIN IMMEDIATE], "
                      "previous errors[" +
                          TriesText(busy, 2) + "]")});
    EXPECT_TRUE(retrying.InsertRecord(Insert(1)) && transaction.Commit());
    EXPECT_EQ(Ids(), "1");
}

// ------------------------------------------------------------------------------------ single tries

TEST_F(SqliteTransactionTest, WhileItIsOpenOperationsAreTriedOnceAndAfterwardsAsBefore)
{
    Run("INSERT INTO jobs (id) VALUES (7)");
    const auto expectTries = [&](std::size_t tries) {
        const std::size_t pausesBefore = pauses.Taken().size();
        EXPECT_FALSE(retrying.InsertRecord(Insert(7)));
        ExpectErr(retrying, 404, TriesText(duplicate, tries));
        ExpectLines({ExecGaveUp(duplicate, tries), duplicateFailed});
        ExpectPauses(pausesBefore + tries - 1);
    };
    expectTries(4);
    {
        SqliteTransaction transaction(retrying);
        expectTries(4);
        ASSERT_TRUE(transaction.Begin());
        expectTries(1);
        ASSERT_TRUE(transaction.Commit());
        expectTries(4);
        ASSERT_TRUE(transaction.Begin());
        expectTries(1);
        ASSERT_TRUE(transaction.Rollback());
        expectTries(4);
        ASSERT_TRUE(transaction.Begin());
    }
    expectTries(4);
}

TEST_F(SqliteTransactionTest, NoOperationGoesOnOutsideOfATransactionThatSqliteHasEnded)
{
    MakeConflictsRollBack();
    SqliteTransaction transaction(retrying);
    ASSERT_TRUE(transaction.Begin() && retrying.Exec("DELETE FROM jobs") &&
                retrying.Exec("INSERT INTO jobs VALUES (7),(8)"));
    // A second try, by itself, would meet the old row 7 alone; a row 8 it could store.
    const Failure both{"INSERT INTO jobs VALUES (9),(8)", SQLITE_CONSTRAINT, duplicate.message};
    EXPECT_FALSE(retrying.Exec(both.command));
    ExpectErr(retrying, 404, TriesText(both));
    ExpectLines({ExecGaveUp(both)});
    EXPECT_EQ(Ids(), "7");
    EXPECT_FALSE(transaction.Commit());
    ExpectErr(retrying, 404);
    ExpectLines({wasRolledBack});
    ExpectPauses(0);
    EXPECT_EQ(Ids(), "7");
}

// ------------------------------------------------------------------------------ Commit and Rollback

TEST_F(SqliteTransactionTest, ACommitWithoutATransactionIsRefused)
{
    SqliteTransaction transaction(db);
    const LogLine none = Told("Commit", "no transaction to commit in db[" + path + "]");
    EXPECT_FALSE(transaction.Commit());
    ExpectErr(db, 401);
    ASSERT_TRUE(transaction.Begin() && transaction.Commit());
    EXPECT_FALSE(transaction.Commit());
    ASSERT_TRUE(transaction.Begin() && transaction.Rollback());
    db.SetDBErr("", 0, "earlier");
    EXPECT_FALSE(transaction.Commit());
    ExpectErr(db, 401);
    ASSERT_TRUE(db.Exec("BEGIN"));
    EXPECT_FALSE(transaction.Commit());  // somebody else's
    EXPECT_TRUE(db.Exec("COMMIT"));
    ExpectLines({none, none, none, none});
}

TEST_F(SqliteTransactionTest, ACommitWaitsForReadersAndLeavesTheTransactionOpenWhenTheyStay)
{
    LockHolder reader(path, "BEGIN; SELECT * FROM jobs");
    const Failure busy{"COMMIT", SQLITE_BUSY, Locked};
    SqliteTransaction transaction(retrying);
    ASSERT_TRUE(transaction.Begin() && retrying.InsertRecord(Insert(7)));
    EXPECT_FALSE(transaction.Commit());
    ExpectErr(retrying, 404, TriesText(busy, 4));
    ExpectLines(
        {ExecGaveUp(busy, 4), Told("Commit", "Failed to commit transaction in db[" + path + "]")});
    ExpectPauses(3);

    EXPECT_FALSE(retrying.InsertRecord(Insert(7)));  // a single try still
    ExpectErr(retrying, 404, TriesText(duplicate));
    ExpectLines({ExecGaveUp(duplicate), duplicateFailed});
    reader.Release();
    EXPECT_TRUE(transaction.Commit());
    EXPECT_EQ(Ids(), "7");
}

TEST_F(SqliteTransactionTest, ACommitThatEndsTheTransactionLeavesNothingToRollBack)
{
    SqliteTransaction transaction(db);
    ASSERT_TRUE(transaction.Begin() && db.InsertRecord(Insert(1)));
    {
        SqliteFaults faults;
        faults.prepare = [](sqlite3* handle, const char* sql, sqlite3_stmt** statement) {
            if (std::string(sql) != "COMMIT") return RealPrepare(handle, sql, statement);
            sqlite3_exec(handle, "ROLLBACK", nullptr, nullptr, nullptr);
            return SQLITE_FULL;
        };
        EXPECT_FALSE(transaction.Commit());
    }
    EXPECT_EQ(db.GetErrCode(), 404);
    EXPECT_EQ(TakeLines().size(), 2U);
    EXPECT_EQ(Ids(), "");
    EXPECT_FALSE(transaction.Commit());
    ExpectErr(db, 401);
    ExpectLines({Told("Commit", "no transaction to commit in db[" + path + "]")});
}

TEST_F(SqliteTransactionTest, ARollbackBehindSqlitesOwnRunsNothing)
{
    MakeConflictsRollBack();
    std::vector<std::string> run;
    SqliteFaults faults;
    SqliteTransaction transaction(retrying);
    ASSERT_TRUE(transaction.Begin() && retrying.InsertRecord(Insert(1)));
    EXPECT_FALSE(retrying.InsertRecord(Insert(7)));
    ExpectLines({ExecGaveUp(duplicate), duplicateFailed});
    faults.prepare = [&](sqlite3* handle, const char* sql, sqlite3_stmt** statement) {
        run.emplace_back(sql);
        return RealPrepare(handle, sql, statement);
    };
    EXPECT_TRUE(transaction.Rollback());
    ExpectErr(retrying, 0);
    EXPECT_TRUE(transaction.Rollback());
    EXPECT_EQ(run, std::vector<std::string>{});
    EXPECT_EQ(Ids(), "7");
}

TEST_F(SqliteTransactionTest, ANewOneCanBeBegunBehindSqlitesOwnRollback)
{
    MakeConflictsRollBack();
    {
        SqliteTransaction transaction(retrying);
        ASSERT_TRUE(transaction.Begin());
        EXPECT_FALSE(retrying.InsertRecord(Insert(7)));
        EXPECT_TRUE(transaction.Begin() && retrying.InsertRecord(Insert(1)));
        EXPECT_TRUE(transaction.Commit());
    }
    ExpectLines({ExecGaveUp(duplicate), duplicateFailed});
    EXPECT_EQ(Ids(), "1;7");
    EXPECT_FALSE(retrying.InsertRecord(Insert(7)));
    ExpectErr(retrying, 404, TriesText(duplicate, 4));  // the limit is the connection's own again
    ExpectLines({ExecGaveUp(duplicate, 4), duplicateFailed});
}

TEST_F(SqliteTransactionTest, AConnectionThatIsClosedMeanwhileHasRolledBack)
{
    SqliteTransaction transaction(db);
    ASSERT_TRUE(transaction.Begin() && db.InsertRecord(Insert(1)));
    db.Close();
    EXPECT_TRUE(transaction.Rollback());
    ASSERT_TRUE(transaction.Begin() && db.InsertRecord(Insert(2)));
    db.Close();
    EXPECT_FALSE(transaction.Commit());
    ExpectErr(db, 404);
    ExpectLines({wasRolledBack});
    EXPECT_EQ(Ids(), "");
}

TEST_F(SqliteTransactionTest, WhatCannotBeRolledBackEndsWithTheConnection)
{
    SqliteFaults faults;
    faults.prepare = [](sqlite3* handle, const char* sql, sqlite3_stmt** statement) {
        if (std::string(sql) == "ROLLBACK") return SQLITE_NOMEM;
        return RealPrepare(handle, sql, statement);
    };
    const LogLine failed = Told("Rollback", "Failed to roll back transaction in db[" + path + "]");
    SqliteTransaction transaction(db);
    ASSERT_TRUE(transaction.Begin() && db.InsertRecord(Insert(1)));
    EXPECT_FALSE(transaction.Rollback());
    EXPECT_EQ(db.GetErrCode(), 404);
    EXPECT_EQ(db.GetErr()["command"], "ROLLBACK");
    EXPECT_EQ(db.GetErr()["sqlite_errcode"], SQLITE_NOMEM);
    ExpectLines({failed});
    EXPECT_EQ(Closed(), 1);
    EXPECT_EQ(Ids(), "");
    {
        SqliteTransaction another(db);
        ASSERT_TRUE(another.Begin() && db.InsertRecord(Insert(2)));
        db.SetDBErr("", 0, "earlier");
    }
    ExpectErr(db, 404, R"({"sqlite_errmsg":"earlier"})");
    ExpectLines({failed});
    EXPECT_EQ(Closed(), 2);
    EXPECT_EQ(Ids(), "");
}

// ------------------------------------------------------------------------------------------- owner

TEST_F(SqliteTransactionTest, ASecondObjectThatBeginsAfterSqlitesRollbackOwnsTheTransactionAlone)
{
    MakeConflictsRollBack();
    SqliteTransaction second(retrying);
    {
        SqliteTransaction first(retrying);
        ASSERT_TRUE(first.Begin());
        HaveSqliteRollBack(retrying);
        ASSERT_TRUE(second.Begin() && retrying.InsertRecord(Insert(1)));
        EXPECT_TRUE(first.Rollback());  // it has none
        ExpectErr(retrying, 0);
        EXPECT_EQ(CountTries(retrying), 1U);
        EXPECT_FALSE(first.Begin());
        ExpectLines({alreadyOpen});
    }
    EXPECT_EQ(CountTries(retrying), 1U);
    EXPECT_TRUE(second.Commit());
    EXPECT_EQ(CountTries(retrying), 4U);
    EXPECT_EQ(Ids(), "1;7");
}

TEST_F(SqliteTransactionTest, TheFirstOfTwoObjectsLearnsAtItsCommitThatSqliteRolledBack)
{
    MakeConflictsRollBack();
    SqliteTransaction first(retrying);
    ASSERT_TRUE(first.Begin());
    HaveSqliteRollBack(retrying);
    {
        SqliteTransaction second(retrying);
        ASSERT_TRUE(second.Begin() && retrying.InsertRecord(Insert(1)));
        EXPECT_FALSE(first.Commit());
        ExpectErr(retrying, 404);
        EXPECT_FALSE(first.Commit());
        ExpectErr(retrying, 401);
        ExpectLines(
            {wasRolledBack, Told("Commit", "no transaction to commit in db[" + path + "]")});
        EXPECT_EQ(CountTries(retrying), 1U);
    }
    EXPECT_EQ(CountTries(retrying), 4U);
    EXPECT_EQ(Ids(), "7");  // the second one's was rolled back, by the second one
}

TEST_F(SqliteTransactionTest, TheFirstOfTwoObjectsLeavesTheSecondOnesTransactionAloneWhenItGoes)
{
    MakeConflictsRollBack();
    auto first = std::make_unique<SqliteTransaction>(retrying);
    ASSERT_TRUE(first->Begin());
    HaveSqliteRollBack(retrying);
    SqliteTransaction second(retrying);
    ASSERT_TRUE(second.Begin() && retrying.InsertRecord(Insert(1)));
    first.reset();
    EXPECT_EQ(CountTries(retrying), 1U);
    EXPECT_TRUE(second.Commit());
    EXPECT_EQ(CountTries(retrying), 4U);
    EXPECT_EQ(Ids(), "1;7");
}

TEST_F(SqliteTransactionTest, ATransactionThatTheCallerBeganAfterTheOwnersIsTheCallers)
{
    MakeConflictsRollBack();
    const std::vector<std::function<void()>> ways{
        [this] {
            HaveSqliteRollBack(db);
            EXPECT_TRUE(db.Exec("BEGIN"));
        },
        [this] {
            HaveSqliteRollBack(db);
            EXPECT_TRUE(db.Exec("SAVEPOINT mine"));
        },
        [this] {
            HaveSqliteRollBack(db);
            SqliteValueList none;
            EXPECT_TRUE(db.SelectByCommand("BEGIN", none));
        },
        [this] { EXPECT_TRUE(db.Exec("COMMIT; BEGIN")); },
        [this] { EXPECT_TRUE(db.Exec("ROLLBACK; SELECT 1; BEGIN IMMEDIATE")); },
        [this] {
            db.Close();
            EXPECT_TRUE(db.Open() && db.Exec("BEGIN"));
        },
    };
    for (const auto& endAndBegin : ways) {
        {
            SqliteTransaction left(db);
            ASSERT_TRUE(left.Begin());
            endAndBegin();
            EXPECT_TRUE(db.InsertRecord(Insert(1)));
        }
        EXPECT_TRUE(db.InsertRecord(Insert(2)) && db.Exec("COMMIT"));

        SqliteTransaction ended(db);
        ASSERT_TRUE(ended.Begin());
        endAndBegin();
        EXPECT_TRUE(db.InsertRecord(Insert(3)) && ended.Rollback());
        EXPECT_TRUE(db.InsertRecord(Insert(4)) && db.Exec("COMMIT"));

        ASSERT_TRUE(ended.Begin());
        endAndBegin();
        EXPECT_TRUE(db.InsertRecord(Insert(5)));
        EXPECT_FALSE(ended.Commit());
        ExpectErr(db, 404);
        ExpectLines({wasRolledBack});
        EXPECT_TRUE(db.InsertRecord(Insert(6)) && db.Exec("COMMIT"));
        EXPECT_EQ(Ids(), "1;2;3;4;5;6;7");
        Run("DELETE FROM jobs WHERE id < 7");
    }
}

TEST_F(SqliteTransactionTest, WhatHappensInsideATransactionLeavesItToItsOwner)
{
    SqliteTransaction transaction(db);
    ASSERT_TRUE(transaction.Begin() && db.InsertRecord(Insert(1)));
    EXPECT_TRUE(db.Exec("SAVEPOINT part"));
    EXPECT_TRUE(db.InsertRecord(Insert(2)) && db.Exec("ROLLBACK TO part; RELEASE part"));
    EXPECT_FALSE(db.Exec("BEGIN"));
    EXPECT_EQ(TakeLines().size(), 1U);
    EXPECT_TRUE(transaction.Commit());
    EXPECT_EQ(Ids(), "1");
    ASSERT_TRUE(transaction.Begin() && db.InsertRecord(Insert(3)));
    EXPECT_FALSE(db.Exec("BEGIN"));
    EXPECT_EQ(TakeLines().size(), 1U);
    EXPECT_TRUE(transaction.Rollback());
    EXPECT_EQ(Ids(), "1");
}

TEST_F(SqliteTransactionTest, AMoveOfTheConnectionPartsATransactionFromItsObject)
{
    SqliteDB target(path, 2);
    SqliteTransaction ofTarget(target);
    ASSERT_TRUE(ofTarget.Begin() && target.InsertRecord(Insert(5)));
    target.Close();
    {
        SqliteTransaction moved(retrying);
        ASSERT_TRUE(moved.Begin() && retrying.InsertRecord(Insert(1)));
        SqliteDB between(std::move(retrying));
        target = std::move(between);
        // That it can be used is what this is about.
        EXPECT_TRUE(retrying.Open());  // NOLINT(bugprone-use-after-move)
        EXPECT_EQ(CountTries(retrying), 4U);
        EXPECT_TRUE(retrying.Exec("BEGIN"));
        EXPECT_FALSE(moved.Commit());
        EXPECT_FALSE(ofTarget.Commit());
        ExpectLines({wasRolledBack, wasRolledBack});
    }
    EXPECT_TRUE(retrying.Exec("COMMIT"));
    EXPECT_EQ(CountTries(target), 4U);  // the limit has moved along
    EXPECT_TRUE(target.InsertRecord(Insert(2)) && target.Exec("COMMIT"));
    EXPECT_EQ(Ids(), "1;2");
}

}  // namespace
