// Upgrade: each step once, in a transaction with the new version. Several processes at once are in
// tests/process/upgrade_process_test.cpp.
#include <orvadrcore/sqlite_db.h>
#include <orvadrcore/sqlite_transaction.h>

#include "support/fixtures/sqlite_fixture.h"
#include "support/fixtures/test_files.h"

namespace {

using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteRow;
using OrvaDRCore::SqliteTransaction;

using Steps = std::vector<std::string>;

class SqliteDbUpgradeTest : public SqliteFixture {
  protected:
    std::string Version() const { return Run("PRAGMA user_version"); }
    std::string Tables() const { return Run("SELECT name FROM sqlite_master ORDER BY name"); }

    LogLine Failed(const Failure& failure, std::size_t last, std::size_t tries = 1) const
    {
        return Err("Upgrade", "Failed to upgrade db[" + path + "] to version [" +
                                  std::to_string(last) + "] with errors[" +
                                  TriesText(failure, tries) + "]");
    }

    const Steps steps = {"CREATE TABLE jobs (id); CREATE TABLE nodes (name)",
                         "ALTER TABLE jobs ADD COLUMN state; INSERT INTO jobs VALUES (1, 'new')",
                         "INSERT INTO jobs VALUES (2, 'new'), (3, 'new')"};
};

// ------------------------------------------------------------------------------------------- steps

TEST_F(SqliteDbUpgradeTest, ANewFileGetsAllSteps)
{
    EXPECT_TRUE(db.Upgrade(steps));
    ExpectErr(db, 0);
    EXPECT_EQ(Version(), "3");
    EXPECT_EQ(Tables(), "jobs;nodes");
    EXPECT_EQ(Run("SELECT * FROM jobs"), "1,new;2,new;3,new");
    EXPECT_EQ(db.GetAffectedRows(), 3);
}

TEST_F(SqliteDbUpgradeTest, AnOldFileGetsTheStepsThatItLacks)
{
    ASSERT_TRUE(db.Upgrade({steps[0]}));
    EXPECT_EQ(Version(), "1");
    EXPECT_EQ(db.GetAffectedRows(), 0);
    ASSERT_TRUE(db.Upgrade(steps));
    EXPECT_EQ(Version(), "3");
    EXPECT_EQ(Run("SELECT id FROM jobs"), "1;2;3");
    ASSERT_TRUE(db.Upgrade(steps));
    EXPECT_EQ(Run("SELECT id FROM jobs"), "1;2;3");
    EXPECT_EQ(db.GetAffectedRows(), 0);
}

TEST_F(SqliteDbUpgradeTest, WithoutStepsAFileOfVersionZeroIsUpToDate)
{
    EXPECT_TRUE(db.Upgrade({}));
    EXPECT_EQ(Version(), "0");
}

TEST_F(SqliteDbUpgradeTest, AFileThatIsUpToDateIsNotLocked)
{
    ASSERT_TRUE(db.Upgrade(steps));
    const LockHolder writer(path, "BEGIN IMMEDIATE");
    EXPECT_TRUE(db.Upgrade(steps));
}

TEST_F(SqliteDbUpgradeTest, ANegativeVersionIsBelowTheFirstStep)
{
    Run("PRAGMA user_version=-7");
    EXPECT_TRUE(db.Upgrade({steps[0]}));
    EXPECT_EQ(Version(), "1");
}

TEST_F(SqliteDbUpgradeTest, TheVersionOfAStepIsItsNumberWhateverItSets)
{
    EXPECT_TRUE(db.Upgrade({"PRAGMA user_version=77", "-- nothing"}));
    EXPECT_EQ(Version(), "2");
}

TEST_F(SqliteDbUpgradeTest, AnotherProcessMayUpgradeBetweenTheLookAndTheLock)
{
    LockHolder holder(path, "BEGIN IMMEDIATE");
    pauses.OnPause([&](std::size_t) {
        holder.Release();
        SqliteDB other(path, 0);
        EXPECT_TRUE(other.Upgrade({steps[0], steps[1]}));
    });
    EXPECT_TRUE(retrying.Upgrade(steps));
    ExpectPauses(1);
    EXPECT_EQ(Run("SELECT id FROM jobs"), "1;2;3");
    EXPECT_EQ(retrying.GetAffectedRows(), 2);
}

// ----------------------------------------------------------------------------------------- refusals

TEST_F(SqliteDbUpgradeTest, AFileBeyondTheLastStepIsRefused)
{
    Run("PRAGMA user_version=4");
    EXPECT_FALSE(retrying.Upgrade(steps));
    ExpectErr(retrying, 404);
    EXPECT_EQ(retrying.GetSqliteCode(), 0);
    ExpectLines({Err("Upgrade", "db[" + path + "] has version [4], newer than [3]")});
    ExpectPauses(0);
    EXPECT_EQ(Tables(), "");

    EXPECT_FALSE(db.Upgrade({}));
    ExpectLines({Err("Upgrade", "db[" + path + "] has version [4], newer than [0]")});
}

TEST_F(SqliteDbUpgradeTest, AFileThatANewerProgramUpgradesMeanwhileIsRefused)
{
    LockHolder holder(path, "BEGIN IMMEDIATE");
    pauses.OnPause([&](std::size_t) {
        holder.Release();
        Run("PRAGMA user_version=9");
    });
    EXPECT_FALSE(retrying.Upgrade(steps));
    ExpectErr(retrying, 404);
    ExpectLines({Err("Upgrade", "db[" + path + "] has version [9], newer than [3]")});
    EXPECT_EQ(Tables(), "");
}

TEST_F(SqliteDbUpgradeTest, AnEmptyStepIsRefusedBeforeAnyIsRun)
{
    EXPECT_FALSE(db.Upgrade({steps[0], ""}));
    ExpectErr(db, 401);
    ExpectLines({Err("Upgrade", "empty step [2] to upgrade db[" + path + "]")});
    EXPECT_EQ(Opened(), 0);
}

TEST_F(SqliteDbUpgradeTest, AnOpenTransactionIsLeftAlone)
{
    SqliteTransaction transaction(db);
    ASSERT_TRUE(transaction.Begin());
    ASSERT_TRUE(db.Exec("CREATE TABLE others (id)"));
    EXPECT_FALSE(db.Upgrade(steps));
    ExpectErr(db, 401);
    ExpectLines({Err("Upgrade", "transaction is already open in db[" + path + "]")});
    EXPECT_TRUE(transaction.Commit());
    EXPECT_EQ(Tables(), "others");
}

TEST_F(SqliteDbUpgradeTest, AFileThatCannotBeOpenedIsReported)
{
    const std::string nowhere = dir.File("none/jobs.db");
    SqliteDB connection(nowhere, 3);
    EXPECT_FALSE(connection.Upgrade(steps));
    ExpectErr(connection, 404);
    EXPECT_EQ(connection.GetSqliteCode(), SQLITE_CANTOPEN);
    ExpectLines({Warn("Open", "Failed to open db[" + nowhere + "]"),
                 Err("Upgrade", "Failed to open db [" + nowhere + "]")});
}

TEST_F(SqliteDbUpgradeTest, AFileThatIsNoDatabaseIsReported)
{
    const Failure noDatabase{"PRAGMA user_version", SQLITE_NOTADB, NoDatabase};
    WriteFile(path, std::string(4096, 'x'));
    EXPECT_FALSE(retrying.Upgrade(steps));
    ExpectErr(retrying, 404, TriesText(noDatabase, 4));
    ExpectLines({Failed(noDatabase, 3, 4)});
}

// ------------------------------------------------------------------------------------ failed steps

TEST_F(SqliteDbUpgradeTest, AStepThatFailsIsRolledBackAndThoseBeforeItStay)
{
    const Failure bad{"CREATE TABLE third (id); INSERT INTO nowhere VALUES (1)", SQLITE_ERROR,
                      "no such table: nowhere"};
    const Steps failing = {steps[0], steps[1], bad.command};
    EXPECT_FALSE(retrying.Upgrade(failing));
    ExpectErr(retrying, 404, TriesText(bad, 4));
    ExpectLines({Failed(bad, 3, 4)});
    ExpectPauses(3);
    EXPECT_EQ(retrying.GetAffectedRows(), 0);
    EXPECT_EQ(Version(), "2");
    EXPECT_EQ(Tables(), "jobs;nodes");

    EXPECT_TRUE(retrying.Upgrade(steps));  // no transaction is left open
    EXPECT_EQ(Version(), "3");
}

TEST_F(SqliteDbUpgradeTest, AStepCanNeitherBeginNorEndATransaction)
{
    for (const std::string statement :
         {"BEGIN", "COMMIT", "END", "ROLLBACK", "commit; BEGIN IMMEDIATE"}) {
        const Failure refused{"CREATE TABLE jobs (id); " + statement + "; CREATE TABLE nodes (id)",
                              SQLITE_AUTH, "not authorized"};
        EXPECT_FALSE(db.Upgrade({refused.command})) << statement;
        ExpectErr(db, 404, TriesText(refused));
        EXPECT_EQ(db.GetSqliteCode(), SQLITE_AUTH);
        ExpectLines({Failed(refused, 1)});
        EXPECT_EQ(Tables(), "");
        EXPECT_EQ(Version(), "0");
    }
    EXPECT_TRUE(db.Exec("BEGIN"));  // elsewhere they are as allowed as ever
    EXPECT_TRUE(db.Exec("COMMIT"));
}

TEST_F(SqliteDbUpgradeTest, AStepMayUseSavepoints)
{
    EXPECT_TRUE(
        db.Upgrade({"SAVEPOINT a; CREATE TABLE jobs (id); ROLLBACK TO a;"
                    "CREATE TABLE nodes (id); RELEASE a"}));
    EXPECT_EQ(Tables(), "nodes");
}

TEST_F(SqliteDbUpgradeTest, AStepAtWhichSqliteRollsBackLeavesTheFileAsItWas)
{
    ASSERT_TRUE(db.Upgrade({steps[0]}));
    const Failure unique{
        "CREATE TABLE others (id UNIQUE);"
        "INSERT OR ROLLBACK INTO others VALUES (1), (1); SELECT 1",
        SQLITE_CONSTRAINT, "UNIQUE constraint failed: others.id"};
    EXPECT_FALSE(db.Upgrade({steps[0], unique.command}));
    ExpectErr(db, 404, TriesText(unique));
    EXPECT_EQ(db.GetSqliteCode(), SQLITE_CONSTRAINT_UNIQUE);
    ExpectLines({Failed(unique, 2)});
    EXPECT_EQ(Version(), "1");
    EXPECT_EQ(Tables(), "jobs;nodes");
}

TEST_F(SqliteDbUpgradeTest, ACommitThatWaitsForAReaderIsRetriedWithItsStep)
{
    ASSERT_TRUE(db.Upgrade({steps[0], steps[1]}));
    LockHolder reader(path, "BEGIN; SELECT * FROM jobs");
    pauses.OnPause([&](std::size_t number) {
        if (number == 2) reader.Release();
    });
    EXPECT_TRUE(retrying.Upgrade(steps));
    ExpectErr(retrying, 0);
    ExpectPauses(2);
    EXPECT_EQ(Run("SELECT id FROM jobs"), "1;2;3");
    EXPECT_EQ(retrying.GetAffectedRows(), 2);
}

TEST_F(SqliteDbUpgradeTest, InsideOfASelectAnUpgradeFailsCleanlyOrSucceeds)
{
    ASSERT_TRUE(db.Upgrade({steps[0], steps[1]}));
    EXPECT_TRUE(db.SelectEachByCommand("SELECT id FROM jobs", [&](const SqliteRow&) {
        EXPECT_FALSE(db.Upgrade({steps[0], steps[1], "DROP TABLE jobs"}));
        EXPECT_EQ(db.GetSqliteCode(), SQLITE_LOCKED);
        return true;
    }));
    EXPECT_EQ(Version(), "2");
    TakeLines();
    EXPECT_TRUE(db.Upgrade(steps));
}

}  // namespace
