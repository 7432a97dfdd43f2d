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

    // A log line of the transaction itself.
    static LogLine TransactionErr(const std::string& function, const std::string& message)
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

    // Makes SQLite roll back the open transaction, by inserting a row that exists already.
    void MakeSqliteRollBack(SqliteDB& connection)
    {
        EXPECT_FALSE(connection.InsertRecord(Insert(7)));
        EXPECT_EQ(TakeLines().size(), 2U);
    }

    // How many attempts a failing statement gets.
    static std::size_t CountAttempts(SqliteDB& connection)
    {
        EXPECT_FALSE(connection.Exec("BAD"));
        EXPECT_EQ(TakeLines().size(), 1U);
        return connection.GetErr().size();
    }

    // From now on SQLite rolls back when row 7 is inserted again.
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
    const LogLine alreadyOpen =
        TransactionErr("Begin", "transaction is already open in db[" + path + "]");
    const LogLine wasRolledBack =
        TransactionErr("Commit", "transaction in db[" + path + "] was rolled back");
};

// ---------------------------------------------------------------------------------- all or nothing

TEST_F(SqliteTransactionTest, CommittedOperationsBecomeVisibleTogether)
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

TEST_F(SqliteTransactionTest, RolledBackOperationsLeaveNoTrace)
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

TEST_F(SqliteTransactionTest, TheDestructorRollsBackAndKeepsTheError)
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

TEST_F(SqliteTransactionTest, TheDestructorLeavesAloneWhatTheObjectDidNotBegin)
{
    {
        const SqliteTransaction never(db);
    }
    EXPECT_EQ(Opened(), 0);
    {
        SqliteTransaction committed(db);
        ASSERT_TRUE(committed.Begin() && db.InsertRecord(Insert(1)) && committed.Commit());
        ASSERT_TRUE(db.Exec("BEGIN") && db.InsertRecord(Insert(2)));  // not the object's
    }
    EXPECT_TRUE(db.Exec("COMMIT"));
    EXPECT_EQ(Ids(), "1;2");
}

TEST_F(SqliteTransactionTest, AnObjectCanBeginOneTransactionAfterTheOther)
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

TEST_F(SqliteTransactionTest, AFileThatCannotBeOpenedIsLoggedByBothLayers)
{
    SqliteDB refused(dir.Path(), 3);
    SqliteTransaction transaction(refused);
    refused.SetDBErr("", 0, "earlier");
    EXPECT_FALSE(transaction.Begin());
    ExpectErr(refused, 404);
    ExpectLines({Warn("Open", "Failed to open db[" + dir.Path() + "]"),
                 TransactionErr("Begin", "Failed to open db [" + dir.Path() + "]")});
    EXPECT_TRUE(transaction.Rollback());
    ExpectErr(refused, 0);
    ExpectPauses(0);
}

TEST_F(SqliteTransactionTest, BeginWaitsForAnotherWriter)
{
    LockHolder holder(path, "BEGIN IMMEDIATE");
    const Failure busy{"BEGIN IMMEDIATE", SQLITE_BUSY, Locked};
    SqliteTransaction transaction(retrying);
    EXPECT_FALSE(transaction.Begin());
    ExpectErr(retrying, 404, TriesText(busy, 4));
    ExpectLines({ExecGaveUp(busy, 4),
                 TransactionErr("Begin", "Failed to begin transaction in db[" + path + "]")});
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

// --------------------------------------------------------------------------------- single attempts

TEST_F(SqliteTransactionTest, OperationsAreNotRetriedWhileATransactionIsOpen)
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

TEST_F(SqliteTransactionTest, AfterARollbackBySqliteNoRetryRunsOutsideOfTheTransaction)
{
    MakeConflictsRollBack();
    SqliteTransaction transaction(retrying);
    ASSERT_TRUE(transaction.Begin() && retrying.Exec("DELETE FROM jobs") &&
                retrying.Exec("INSERT INTO jobs VALUES (7),(8)"));
    // Outside of the transaction only the old row 7 exists: a second attempt could store 9 and 8.
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

// ----------------------------------------------------------------------------- Commit and Rollback

TEST_F(SqliteTransactionTest, ACommitWithoutATransactionIsRefused)
{
    SqliteTransaction transaction(db);
    const LogLine none = TransactionErr("Commit", "no transaction to commit in db[" + path + "]");
    EXPECT_FALSE(transaction.Commit());
    ExpectErr(db, 401);
    ASSERT_TRUE(transaction.Begin() && transaction.Commit());
    EXPECT_FALSE(transaction.Commit());
    ASSERT_TRUE(transaction.Begin() && transaction.Rollback());
    db.SetDBErr("", 0, "earlier");
    EXPECT_FALSE(transaction.Commit());
    ExpectErr(db, 401);
    ASSERT_TRUE(db.Exec("BEGIN"));
    EXPECT_FALSE(transaction.Commit());  // not the object's
    EXPECT_TRUE(db.Exec("COMMIT"));
    ExpectLines({none, none, none, none});
}

TEST_F(SqliteTransactionTest, ACommitThatReadersBlockLeavesTheTransactionOpen)
{
    LockHolder reader(path, "BEGIN; SELECT * FROM jobs");
    const Failure busy{"COMMIT", SQLITE_BUSY, Locked};
    SqliteTransaction transaction(retrying);
    ASSERT_TRUE(transaction.Begin() && retrying.InsertRecord(Insert(7)));
    EXPECT_FALSE(transaction.Commit());
    ExpectErr(retrying, 404, TriesText(busy, 4));
    ExpectLines({ExecGaveUp(busy, 4),
                 TransactionErr("Commit", "Failed to commit transaction in db[" + path + "]")});
    ExpectPauses(3);

    EXPECT_FALSE(retrying.InsertRecord(Insert(7)));  // still a single attempt
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
    ExpectLines({TransactionErr("Commit", "no transaction to commit in db[" + path + "]")});
}

TEST_F(SqliteTransactionTest, ARollbackAfterSqlitesOwnRunsNothing)
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

TEST_F(SqliteTransactionTest, ATransactionCanBeginAfterSqliteRolledBackTheLastOne)
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
    ExpectErr(retrying, 404, TriesText(duplicate, 4));  // the connection's own limit again
    ExpectLines({ExecGaveUp(duplicate, 4), duplicateFailed});
}

TEST_F(SqliteTransactionTest, ClosingTheConnectionRollsBack)
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

TEST_F(SqliteTransactionTest, AFailedRollbackClosesTheConnection)
{
    SqliteFaults faults;
    faults.prepare = [](sqlite3* handle, const char* sql, sqlite3_stmt** statement) {
        if (std::string(sql) == "ROLLBACK") return SQLITE_NOMEM;
        return RealPrepare(handle, sql, statement);
    };
    const LogLine failed =
        TransactionErr("Rollback", "Failed to roll back transaction in db[" + path + "]");
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

TEST_F(SqliteTransactionTest, AfterSqlitesRollbackASecondObjectOwnsTheNextTransaction)
{
    MakeConflictsRollBack();
    SqliteTransaction second(retrying);
    {
        SqliteTransaction first(retrying);
        ASSERT_TRUE(first.Begin());
        MakeSqliteRollBack(retrying);
        ASSERT_TRUE(second.Begin() && retrying.InsertRecord(Insert(1)));
        EXPECT_TRUE(first.Rollback());  // it has none
        ExpectErr(retrying, 0);
        EXPECT_EQ(CountAttempts(retrying), 1U);
        EXPECT_FALSE(first.Begin());
        ExpectLines({alreadyOpen});
    }
    EXPECT_EQ(CountAttempts(retrying), 1U);
    EXPECT_TRUE(second.Commit());
    EXPECT_EQ(CountAttempts(retrying), 4U);
    EXPECT_EQ(Ids(), "1;7");
}

TEST_F(SqliteTransactionTest, TheFirstObjectsCommitReportsThatSqliteRolledBack)
{
    MakeConflictsRollBack();
    SqliteTransaction first(retrying);
    ASSERT_TRUE(first.Begin());
    MakeSqliteRollBack(retrying);
    {
        SqliteTransaction second(retrying);
        ASSERT_TRUE(second.Begin() && retrying.InsertRecord(Insert(1)));
        EXPECT_FALSE(first.Commit());
        ExpectErr(retrying, 404);
        EXPECT_FALSE(first.Commit());
        ExpectErr(retrying, 401);
        ExpectLines({wasRolledBack,
                     TransactionErr("Commit", "no transaction to commit in db[" + path + "]")});
        EXPECT_EQ(CountAttempts(retrying), 1U);
    }
    EXPECT_EQ(CountAttempts(retrying), 4U);
    EXPECT_EQ(Ids(), "7");  // the second object rolled back its own
}

TEST_F(SqliteTransactionTest, TheFirstObjectsDestructorLeavesTheSecondOnesTransactionOpen)
{
    MakeConflictsRollBack();
    auto first = std::make_unique<SqliteTransaction>(retrying);
    ASSERT_TRUE(first->Begin());
    MakeSqliteRollBack(retrying);
    SqliteTransaction second(retrying);
    ASSERT_TRUE(second.Begin() && retrying.InsertRecord(Insert(1)));
    first.reset();
    EXPECT_EQ(CountAttempts(retrying), 1U);
    EXPECT_TRUE(second.Commit());
    EXPECT_EQ(CountAttempts(retrying), 4U);
    EXPECT_EQ(Ids(), "1;7");
}

TEST_F(SqliteTransactionTest, ATransactionBegunByAStatementBelongsToTheCaller)
{
    MakeConflictsRollBack();
    const std::vector<std::function<void()>> ways{
        [this] {
            MakeSqliteRollBack(db);
            EXPECT_TRUE(db.Exec("BEGIN"));
        },
        [this] {
            MakeSqliteRollBack(db);
            EXPECT_TRUE(db.Exec("SAVEPOINT mine"));
        },
        [this] {
            MakeSqliteRollBack(db);
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

TEST_F(SqliteTransactionTest, SavepointsAndFailedBeginsLeaveTheTransactionToItsOwner)
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

TEST_F(SqliteTransactionTest, MovingTheConnectionSeparatesTheTransactionFromItsObject)
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
        // A moved-from object can be used.
        EXPECT_TRUE(retrying.Open());  // NOLINT(bugprone-use-after-move)
        EXPECT_EQ(CountAttempts(retrying), 4U);
        EXPECT_TRUE(retrying.Exec("BEGIN"));
        EXPECT_FALSE(moved.Commit());
        EXPECT_FALSE(ofTarget.Commit());
        ExpectLines({wasRolledBack, wasRolledBack});
    }
    EXPECT_TRUE(retrying.Exec("COMMIT"));
    EXPECT_EQ(CountAttempts(target), 4U);  // the limit was moved, too
    EXPECT_TRUE(target.InsertRecord(Insert(2)) && target.Exec("COMMIT"));
    EXPECT_EQ(Ids(), "1;2");
}

}  // namespace
