// Statements that run by their shape: what callers see is what the text alone would give.
#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>

#include <algorithm>
#include <stdexcept>

#include "sqlite/sqlite_connection.h"
#include "support/fixtures/as_texts.h"
#include "support/fixtures/sqlite_fixture.h"

namespace {

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteRow;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;

class SqliteConnectionShapeTest : public SqliteFixture {
  protected:
    SqliteConnectionShapeTest()
    {
        Run("CREATE TABLE jobs (id INTEGER PRIMARY KEY, name TEXT UNIQUE, size INTEGER)");
        Run("CREATE TABLE others (id)");
        EXPECT_TRUE(db.Open());
        Select("SELECT count(*) FROM others");  // reads the schema
    }

    // Counts the statements that are prepared from here on.
    void CountPrepared()
    {
        faults.prepare = [this](sqlite3* handle, const char* sql, sqlite3_stmt** statement) {
            prepared.emplace_back(sql);
            return RealPrepare(handle, sql, statement);
        };
    }

    std::vector<std::string> TakePrepared() { return std::exchange(prepared, {}); }

    // The first row of a select.
    std::string Select(const std::string& statement)
    {
        SqliteValueList record;
        EXPECT_TRUE(db.SelectByCommand(statement, record)) << statement;
        return record.ToStr();
    }

    // Everything that callers can see of a statement's failure.
    std::string Failed(const std::string& statement)
    {
        EXPECT_FALSE(db.Exec(statement)) << statement;
        std::string text = std::to_string(db.GetErrCode()) + "/" +
                           std::to_string(db.GetSqliteCode()) + "/" +
                           OrvaDRCore::toString(db.GetErr());
        for (const LogRecord& line : TakeLines()) text += "/" + line.text;
        return text;
    }

    // Changes the schema through another connection. A select of another table notices it.
    void ChangeSchema(const std::string& statement)
    {
        Run(statement);
        Select("SELECT count(*) FROM others");
    }

    static InsertCommand Job(int id, const SqliteValue& name)
    {
        InsertCommand command;
        command.SetTable(SqliteTableHandler("jobs", ""));
        command.AddFieldValue("id", id);
        command.AddFieldValue("name", name);
        return command;
    }

    SqliteFaults faults;
    std::vector<std::string> prepared;
    const std::string insert5 = "INSERT INTO jobs (id,name) VALUES (5,'five');";
    const std::string insert6 = "INSERT INTO jobs (id,name) VALUES (6,'six');";
    const std::string insertShape = "INSERT INTO jobs (id,name) VALUES (?,?)";
};

// ---------------------------------------------------------------------------------------- preparing

TEST_F(SqliteConnectionShapeTest, AStatementIsPreparedOncePerShape)
{
    CountPrepared();
    EXPECT_TRUE(db.Exec(insert5) && db.Exec(insert6));
    EXPECT_TRUE(db.InsertRecord(Job(7, "seven")));
    EXPECT_EQ(TakePrepared(), std::vector<std::string>{insertShape});
    EXPECT_EQ(Select("SELECT name FROM jobs WHERE id=5"), "name:'five'");
    EXPECT_EQ(Select("SELECT name FROM jobs WHERE id=6"), "name:'six'");
    EXPECT_TRUE(db.Exec("UPDATE jobs SET name='sixth' WHERE id=6"));
    EXPECT_TRUE(db.Exec("UPDATE jobs SET name='fifth' WHERE id=5"));
    EXPECT_TRUE(db.Exec("DELETE FROM jobs WHERE id=6;") && db.Exec("DELETE FROM jobs WHERE id=7"));
    EXPECT_EQ(TakePrepared(), (std::vector<std::string>{"SELECT name FROM jobs WHERE id=?",
                                                        "UPDATE jobs SET name=? WHERE id=?",
                                                        "DELETE FROM jobs WHERE id=?"}));
    EXPECT_EQ(Run("SELECT id, name FROM jobs"), "5,fifth");
}

TEST_F(SqliteConnectionShapeTest, AStatementRunsAsItStandsWhenTheShortcutIsOff)
{
    const AsTexts asTexts;
    CountPrepared();
    EXPECT_TRUE(db.InsertRecord(Job(5, "five")) && db.Exec(insert6));
    EXPECT_EQ(Select("SELECT name FROM jobs WHERE id=5"), "name:'five'");
    EXPECT_EQ(TakePrepared(),
              (std::vector<std::string>{insert5, insert6, "SELECT name FROM jobs WHERE id=5"}));
}

TEST_F(SqliteConnectionShapeTest, AStatementRunsAsItStandsWhileADatabaseIsAttached)
{
    EXPECT_TRUE(db.Exec(insert5));
    EXPECT_TRUE(db.Exec("ATTACH ':memory:' AS other"));
    CountPrepared();
    EXPECT_TRUE(db.Exec(insert6));
    EXPECT_EQ(Select("SELECT name FROM jobs WHERE id=5"), "name:'five'");
    EXPECT_EQ(TakePrepared(),
              (std::vector<std::string>{insert6, "SELECT name FROM jobs WHERE id=5"}));
}

TEST_F(SqliteConnectionShapeTest, AStatementRunsAsItStandsAfterTheProgramHasSetTheBusyTimeout)
{
    Select("PRAGMA busy_timeout=100");
    CountPrepared();
    EXPECT_TRUE(db.Exec(insert5));
    EXPECT_EQ(TakePrepared(), std::vector<std::string>{insert5});
}

TEST_F(SqliteConnectionShapeTest, TheStatementsOfAConnectionTakeLittleMemory)
{
    std::vector<std::string> inserts;
    std::string names = "a";
    std::string values = "5";
    for (int column = 0; column < 100; ++column) {
        names += ",a" + std::to_string(column);
        values += ",6";
        const std::string table = "t" + std::to_string(column) + " (" + names + ")";
        Run("CREATE TABLE " + table);
        inserts.push_back("INSERT INTO " + table + " VALUES (" + values + ")");
    }
    for (const std::string& insert : inserts) ASSERT_TRUE(db.Exec(insert));
    int count = 0;
    int bytes = 0;
    sqlite3_stmt* statement = nullptr;
    while ((statement = sqlite3_next_stmt(db.Connection().GetHandle(), statement)) != nullptr) {
        ++count;
        bytes += sqlite3_stmt_status(statement, SQLITE_STMTSTATUS_MEMUSED, 0);
    }
    EXPECT_GT(count, 1);
    EXPECT_LE(bytes, 36 * 1024);
}

// ----------------------------------------------------------------------------------------- failures

TEST_F(SqliteConnectionShapeTest, AFailureLooksLikeThatOfTheText)
{
    ASSERT_TRUE(db.Exec(insert5) && db.Exec(insert6));
    ASSERT_TRUE(
        db.Exec("CREATE TRIGGER no BEFORE DELETE ON jobs BEGIN SELECT RAISE(ABORT,'no'); END"));
    for (const std::string& statement :
         {insert5, std::string("INSERT INTO jobs (id,name) VALUES (9,'five')"),
          std::string("INSERT INTO jobs (id,name) VALUES ('x','y')"),
          std::string("UPDATE jobs SET id=8,name='five' WHERE id=6"),
          std::string("DELETE FROM jobs WHERE id=6"),
          std::string("INSERT INTO jobs (id,nothing) VALUES (7,'x')"),
          std::string("INSERT INTO jobs (id) VALUES (7,8)"),
          std::string("DELETE FROM nothing WHERE id=5"),
          std::string("UPDATE jobs SET order=5 WHERE id=5")}) {
        const std::string failed = Failed(statement);
        const AsTexts asTexts;
        EXPECT_EQ(failed, Failed(statement));
        EXPECT_NE(failed.find("\"" + statement + "\""), std::string::npos) << failed;
    }
}

TEST_F(SqliteConnectionShapeTest, AFailedInsertRecordLooksLikeThatOfTheText)
{
    ASSERT_TRUE(db.InsertRecord(Job(5, "five")));
    const Failure failure{insert5, SQLITE_CONSTRAINT, "UNIQUE constraint failed: jobs.id"};
    EXPECT_FALSE(db.InsertRecord(Job(5, "five")));
    ExpectErr(db, 404, TriesText(failure));
    EXPECT_EQ(db.GetSqliteCode(), SQLITE_CONSTRAINT_PRIMARYKEY);
    ExpectLines({ExecGaveUp(failure),
                 Err("InsertRecord", "Failed to exec [" + insert5 + "] in db[" + path + "]")});
}

TEST_F(SqliteConnectionShapeTest, AFailedStatementOfATransactionTakesBackItsOwnChangesOnly)
{
    ASSERT_TRUE(db.Exec("BEGIN IMMEDIATE") && db.Exec(insert5));
    Failed(insert5);
    ASSERT_TRUE(db.Exec(insert6) && db.Exec("COMMIT"));
    EXPECT_EQ(Run("SELECT id FROM jobs"), "5;6");
}

TEST_F(SqliteConnectionShapeTest, ALockedStatementWaitsAndFailsLikeItsText)
{
    ASSERT_TRUE(db.Exec(insert5));
    EXPECT_EQ(Select("SELECT name FROM jobs WHERE id=5"), "name:'five'");
    LockHolder holder(path);
    const std::string failed = Failed(insert6);
    {
        const AsTexts asTexts;
        EXPECT_EQ(failed, Failed(insert6));
    }
    EXPECT_NE(failed.find(Locked), std::string::npos);
    SqliteValueList record;
    EXPECT_FALSE(db.SelectByCommand("SELECT name FROM jobs WHERE id=6", record));
    ExpectErr(db, 404, TriesText({"SELECT name FROM jobs WHERE id=6", SQLITE_BUSY, Locked}));
    EXPECT_EQ(TakeLines().size(), 1U);
    holder.Release();
    CountPrepared();
    EXPECT_TRUE(db.Exec(insert6));
    EXPECT_EQ(Select("SELECT name FROM jobs WHERE id=6"), "name:'six'");
    EXPECT_EQ(TakePrepared(), std::vector<std::string>{});  // both are still cached
}

TEST_F(SqliteConnectionShapeTest, AStatementThatHasBecomeWrongFailsBeforeItNeedsALock)
{
    ASSERT_TRUE(db.Exec(insert5));
    EXPECT_EQ(Select("SELECT name FROM jobs WHERE id=5"), "name:'five'");
    ChangeSchema("ALTER TABLE jobs RENAME COLUMN name TO title");
    LockHolder holder(path);
    EXPECT_NE(Failed(insert6).find("table jobs has no column named name"), std::string::npos);
    SqliteValueList record;
    EXPECT_FALSE(db.SelectByCommand("SELECT name FROM jobs WHERE id=6", record));
    EXPECT_EQ(TakeLines().at(0).text.find(Locked), std::string::npos);
    EXPECT_TRUE(pauses.Taken().empty());
    holder.Release();
}

TEST_F(SqliteConnectionShapeTest, AStatementThatHasBecomeWrongLeavesNoLockInATransaction)
{
    ASSERT_TRUE(db.Exec(insert5));
    EXPECT_EQ(Select("SELECT name FROM jobs WHERE id=5"), "name:'five'");
    ChangeSchema("ALTER TABLE jobs RENAME COLUMN name TO title");
    ASSERT_TRUE(db.Exec("BEGIN"));
    Failed(insert6);
    SqliteValueList record;
    EXPECT_FALSE(db.SelectByCommand("SELECT name FROM jobs WHERE id=6", record));
    TakeLines();
    PlainDb other(path);
    other.Run("BEGIN EXCLUSIVE");
    other.Run("COMMIT");
    EXPECT_TRUE(db.Exec("COMMIT"));
}

// ------------------------------------------------------------------------------------ what has changed

TEST_F(SqliteConnectionShapeTest, ChangedRowsAreCountedAsForTheText)
{
    ASSERT_TRUE(
        db.Exec("CREATE TRIGGER more AFTER UPDATE ON jobs BEGIN "
                "INSERT INTO others VALUES (new.id); END"));
    for (int round = 0; round < 2; ++round) {  // prepared and cached
        const std::string id = std::to_string(10 * round + 5);
        EXPECT_TRUE(db.Exec("INSERT INTO jobs (id,size) VALUES (" + id + ",7)"));
        EXPECT_EQ(db.GetAffectedRows(), 1);
        EXPECT_EQ(db.GetLastInsertId(), std::stoi(id));
        EXPECT_TRUE(db.Exec("UPDATE jobs SET size=8 WHERE size=7"));
        EXPECT_EQ(db.GetAffectedRows(), round + 1);
        EXPECT_EQ(db.GetLastInsertId(), std::stoi(id));
        EXPECT_TRUE(db.Exec("UPDATE jobs SET size=8 WHERE size=9"));
        EXPECT_EQ(db.GetAffectedRows(), 0);
        EXPECT_TRUE(db.Exec("UPDATE jobs SET size=7 WHERE size=8"));
        Select("SELECT size FROM jobs WHERE id=5");
        EXPECT_EQ(db.GetAffectedRows(), round + 1);
    }
    Failed("INSERT INTO jobs (id,size) VALUES (5,7)");
    EXPECT_EQ(db.GetAffectedRows(), 0);
    EXPECT_EQ(db.GetLastInsertId(), 15);
    EXPECT_TRUE(db.Exec("DELETE FROM jobs WHERE size=7"));
    EXPECT_EQ(db.GetAffectedRows(), 2);
}

TEST_F(SqliteConnectionShapeTest, AStatementThatGivesTheNumberOfItsRowsRunsToItsEnd)
{
    Select("PRAGMA count_changes=1");
    EXPECT_TRUE(db.Exec(insert5) && db.Exec(insert6));
    EXPECT_EQ(db.GetAffectedRows(), 1);
    EXPECT_TRUE(db.InsertRecord(Job(7, "seven")));
    EXPECT_EQ(Run("SELECT id FROM jobs ORDER BY id"), "5;6;7");
}

TEST_F(SqliteConnectionShapeTest, ACachedStatementSeesAChangedSchema)
{
    const std::string all = "SELECT * FROM jobs WHERE id>4";
    ASSERT_TRUE(db.Exec(insert5));
    EXPECT_EQ(Select(all), "id:5, name:'five'");
    TakeLines();  // NULL is left out
    Run("ALTER TABLE jobs ADD COLUMN state DEFAULT 'new'");
    EXPECT_TRUE(db.Exec(insert6));
    EXPECT_EQ(Select(all), "id:5, name:'five', state:'new'");
    TakeLines();
    Run("CREATE TRIGGER copy AFTER INSERT ON jobs BEGIN INSERT INTO others VALUES (new.id); END");
    EXPECT_TRUE(db.Exec("INSERT INTO jobs (id,name) VALUES (7,'seven')"));
    EXPECT_EQ(Run("SELECT id FROM others"), "7");
    EXPECT_TRUE(db.Exec("CREATE TEMP TABLE jobs (id, name)"));
    EXPECT_TRUE(db.Exec("INSERT INTO jobs (id,name) VALUES (8,'eight')"));
    EXPECT_EQ(Run("SELECT max(id) FROM jobs"), "7");
}

TEST_F(SqliteConnectionShapeTest, APartialIndexIsUsedForItsValueOnly)
{
    EXPECT_TRUE(db.Exec("CREATE INDEX large ON jobs (name) WHERE size=7"));
    EXPECT_TRUE(db.Exec("INSERT INTO jobs VALUES (5,'b',7), (6,'a',7), (8,'d',8), (9,'c',8)"));
    for (int round = 0; round < 2; ++round) {
        EXPECT_EQ(Select("SELECT id FROM jobs WHERE size=8 AND name>'a'"), "id:9");
        EXPECT_EQ(Select("SELECT id FROM jobs WHERE size=7 AND name>'A'"), "id:6");
    }
}

// --------------------------------------------------------------------------------- what a select's taker does

class SqliteConnectionShapeSelectTest : public SqliteConnectionShapeTest {
  protected:
    SqliteConnectionShapeSelectTest()
    {
        EXPECT_TRUE(db.Exec(insert5) && db.Exec(insert6));
        EXPECT_EQ(Select(over4), "id:5");
    }

    const std::string over4 = "SELECT id FROM jobs WHERE id>4";
};

TEST_F(SqliteConnectionShapeSelectTest, ItMayRunTheSameSelectAndWrite)
{
    std::string seen;
    EXPECT_TRUE(db.SelectEachByCommand(over4, [&](const SqliteRow& row) {
        int id = 0;
        EXPECT_TRUE(row.GetValue("id", id));
        seen += std::to_string(id) + ":" + Select("SELECT id FROM jobs WHERE id>5") + ";";
        EXPECT_TRUE(db.Exec("UPDATE jobs SET size=9 WHERE id=" + std::to_string(id)));
        return true;
    }));
    EXPECT_EQ(seen, "5:id:6;6:id:6;");
    EXPECT_EQ(Run("SELECT size FROM jobs"), "9;9");
}

TEST_F(SqliteConnectionShapeSelectTest, ItMayChangeTheText)
{
    std::string command = "SELECT id FROM jobs WHERE name>='five' AND name<'z'";
    int rows = 0;
    EXPECT_TRUE(db.SelectEachByCommand(command, [&](const SqliteRow&) {
        std::fill(command.begin(), command.end(), 'z');
        return ++rows > 0;
    }));
    EXPECT_EQ(rows, 2);
    EXPECT_EQ(Select("SELECT id FROM jobs WHERE name>='six' AND name<'z'"), "id:6");
}

TEST_F(SqliteConnectionShapeSelectTest, ItMayCloseTheConnection)
{
    EXPECT_FALSE(db.SelectEachByCommand(over4, [&](const SqliteRow&) {
        db.Close();
        return true;
    }));
    EXPECT_EQ(TakeLines().size(), 1U);
    EXPECT_EQ(Closed(), 1);
}

TEST_F(SqliteConnectionShapeSelectTest, ItMayThrowAndLeavesNoLock)
{
    const auto fail = [](const SqliteRow&) -> bool { throw std::runtime_error("enough"); };
    EXPECT_THROW((void)db.SelectEachByCommand(over4, fail), std::runtime_error);
    PlainDb(path).Run("BEGIN EXCLUSIVE; COMMIT");
    EXPECT_EQ(Select(over4), "id:5");
}

TEST_F(SqliteConnectionShapeSelectTest, AFinishedSelectHoldsNoLock)
{
    EXPECT_EQ(Select(over4), "id:5");  // leaves the second row unread
    PlainDb(path).Run("BEGIN EXCLUSIVE; COMMIT");
}

}  // namespace
