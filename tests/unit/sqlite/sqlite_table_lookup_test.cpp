// What the table lookup answers: always what its query answers, though it seldom runs it.
#include "sqlite/sqlite_table_lookup.h"

#include <orvadrcore/sqlite_db.h>

#include <cstdio>
#include <fstream>
#include <utility>

#include "sqlite/sqlite_shortcuts.h"
#include "support/fixtures/sqlite_fixture.h"

namespace {

using OrvaDRCore::SqliteValueList;
using OrvaDRCore::TableLookup;

class SqliteTableLookupTest : public SqliteFixture {
  protected:
    // Counts the steps of the query, and what is prepared.
    void CountFromHereOn()
    {
        faults.step = [this](sqlite3_stmt* statement) {
            if (IsStatement(statement, LookFor("jobs"))) ++queries;
            return RealStep(statement);
        };
        faults.prepare = [this](sqlite3* handle, const char* sql, sqlite3_stmt** statement) {
            prepared.emplace_back(sql);
            return RealPrepare(handle, sql, statement);
        };
        queries = 0;
        prepared.clear();
    }

    // A file with a table `jobs`, which the open connection has found.
    void FindJobs()
    {
        Run("CREATE TABLE jobs (id)");
        ASSERT_TRUE(db.Open());
        ASSERT_TRUE(db.IsTableExisted("jobs"));
    }

    // What the query answers on the same connection.
    bool IsQueried()
    {
        std::vector<SqliteValueList> rows;
        EXPECT_TRUE(db.SelectByCommand(LookFor("jobs"), rows));
        return !rows.empty();
    }

    // Looks `jobs` up more than once, since the first lookup may be the one that notices a change.
    void ExpectExists(bool exists)
    {
        for (int time = 0; time < 3; ++time) {
            EXPECT_EQ(db.IsTableExisted("jobs"), exists) << "lookup " << time;
            ExpectErr(db, 0);
        }
        EXPECT_EQ(IsQueried(), exists);
    }

    SqliteFaults faults;
    int queries = 0;
    std::vector<std::string> prepared;
};

TEST_F(SqliteTableLookupTest, ATableThatWasFoundIsNotQueriedForAgain)
{
    FindJobs();
    CountFromHereOn();
    for (int time = 0; time < 3; ++time) EXPECT_TRUE(db.IsTableExisted("jobs"));
    EXPECT_EQ(queries, 0);
    EXPECT_EQ(prepared, std::vector<std::string>());
}

TEST_F(SqliteTableLookupTest, ATableThatIsMissingIsQueriedForEachTime)
{
    ASSERT_TRUE(db.Open());
    CountFromHereOn();
    for (int time = 0; time < 3; ++time) EXPECT_FALSE(db.IsTableExisted("jobs"));
    EXPECT_EQ(queries, 3);
    Run("CREATE TABLE jobs (id)");
    ExpectExists(true);
}

TEST_F(SqliteTableLookupTest, ATransactionChecksTheSchemaOnceUntilItMayHaveChanged)
{
    FindJobs();
    ASSERT_TRUE(db.Exec("BEGIN"));
    int checks = 0;
    faults.step = [&checks](sqlite3_stmt* statement) {
        if (IsStatement(statement, SchemaCheck)) ++checks;
        return RealStep(statement);
    };
    ExpectExists(true);
    EXPECT_EQ(checks, 1);
    ASSERT_TRUE(db.Exec("SAVEPOINT s; DROP TABLE jobs"));
    ExpectExists(false);
    ASSERT_TRUE(db.Exec("ROLLBACK TO s"));
    ExpectExists(true);
    ASSERT_TRUE(db.Exec("ROLLBACK"));
    checks = 0;
    ExpectExists(true);
    EXPECT_EQ(checks, 3);
}

TEST_F(SqliteTableLookupTest, WithoutTheShortcutEachLookupIsTheQuery)
{
    FindJobs();
    OrvaDRCore::ShortcutsInUse().lookups = false;
    CountFromHereOn();
    EXPECT_TRUE(db.IsTableExisted("jobs"));
    EXPECT_EQ(queries, 2);  // a row, and the end
    OrvaDRCore::ShortcutsInUse().lookups = true;
    EXPECT_TRUE(db.IsTableExisted("jobs"));
    EXPECT_EQ(queries, 2);
}

struct Change {
    std::vector<std::string> statements;
    bool exists;  // the table `jobs`, afterwards
};

// Statements that a connection runs after it, or another one, has found `jobs`.
const std::vector<Change>& Changes()
{
    static const std::vector<Change> all = {
        {{"CREATE TABLE others (id)"}, true},
        {{"CREATE INDEX sorted ON jobs (id)"}, true},
        {{"ALTER TABLE jobs ADD COLUMN size"}, true},
        {{"DROP TABLE jobs"}, false},
        {{"DROP TABLE jobs", "CREATE TABLE jobs (other)"}, true},
        {{"DROP TABLE jobs", "CREATE TABLE Jobs (id)"}, false},
        {{"DROP TABLE jobs", "CREATE VIEW jobs AS SELECT 1"}, false},
        {{"DROP TABLE jobs", "CREATE VIRTUAL TABLE jobs USING fts5(text)"}, true},
        {{"ALTER TABLE jobs RENAME TO others"}, false},
        {{"ALTER TABLE jobs RENAME TO others", "CREATE INDEX jobs ON others (id)"}, false},
        {{"VACUUM"}, true},
        {{"DROP TABLE jobs", "VACUUM"}, false},
        {{"BEGIN", "DROP TABLE jobs", "COMMIT"}, false},
        {{"BEGIN", "DROP TABLE jobs", "ROLLBACK"}, true},
        {{"SAVEPOINT a", "DROP TABLE jobs", "ROLLBACK TO a", "RELEASE a"}, true},
        {{"SAVEPOINT a", "DROP TABLE jobs", "RELEASE a"}, false},
    };
    return all;
}

class EachChange : public SqliteTableLookupTest {
  protected:
    // Tries each change in a file of its own. `apply` runs its statements.
    template <class Apply>
    void Try(Apply apply, const std::string& journalMode = "DELETE")
    {
        for (const Change& change : Changes()) {
            SCOPED_TRACE(change.statements.back());
            db.Close();
            std::remove(path.c_str());
            Run("PRAGMA journal_mode=" + journalMode);
            FindJobs();
            apply(change.statements);
            ExpectExists(change.exists);
        }
    }

    void RunHere(const std::vector<std::string>& statements)
    {
        for (const std::string& statement : statements) EXPECT_TRUE(db.Exec(statement));
    }

    void RunElsewhere(const std::vector<std::string>& statements)
    {
        PlainDb other(path);
        for (const std::string& statement : statements) other.Run(statement);
    }
};

TEST_F(EachChange, OfTheSameConnectionIsNoticed)
{
    Try([this](const auto& statements) { RunHere(statements); });
}

TEST_F(EachChange, OfTheSameConnectionIsNoticedAfterEachStatement)
{
    Try([this](const auto& statements) {
        for (const std::string& statement : statements) {
            EXPECT_TRUE(db.Exec(statement));
            EXPECT_EQ(db.IsTableExisted("jobs"), IsQueried()) << statement;
        }
    });
}

TEST_F(EachChange, OfAnotherConnectionIsNoticed)
{
    Try([this](const auto& statements) { RunElsewhere(statements); });
}

TEST_F(EachChange, IsNoticedWithAWriteAheadLog)
{
    Try([this](const auto& statements) { RunHere(statements); }, "WAL");
    Try([this](const auto& statements) { RunElsewhere(statements); }, "WAL");
}

TEST_F(SqliteTableLookupTest, ATableThatAnotherProcessDropsIsMissing)
{
    FindJobs();
    ChildProcess other([&](ChildProcess::Link&) { Run("DROP TABLE jobs"); });
    ASSERT_EQ(other.Join(), 0);
    ExpectExists(false);
    ChildProcess another([&](ChildProcess::Link&) { Run("CREATE TABLE jobs (id)"); });
    ASSERT_EQ(another.Join(), 0);
    ExpectExists(true);
}

TEST_F(SqliteTableLookupTest, ATableWhoseCreationIsRolledBackIsMissing)
{
    for (const char* rollback : {"ROLLBACK", "ROLLBACK TO inner"}) {
        SCOPED_TRACE(rollback);
        ASSERT_TRUE(db.Open());
        ASSERT_TRUE(db.Exec("BEGIN"));
        ASSERT_TRUE(db.Exec("SAVEPOINT inner"));
        ASSERT_TRUE(db.Exec("CREATE TABLE jobs (id)"));
        EXPECT_TRUE(db.IsTableExisted("jobs"));
        EXPECT_TRUE(db.IsTableExisted("jobs"));
        ASSERT_TRUE(db.Exec(rollback));
        ExpectExists(false);
        db.Close();
    }
}

TEST_F(SqliteTableLookupTest, ATableIsMissingThoughTheSchemaHasTheNumberThatItHadWithIt)
{
    ASSERT_TRUE(db.Open());
    for (const char* rollback : {"ROLLBACK", "ROLLBACK TO inner"}) {
        ASSERT_TRUE(db.Exec("SAVEPOINT inner"));
        ASSERT_TRUE(db.Exec("CREATE TABLE jobs (id)"));
        EXPECT_TRUE(db.IsTableExisted("jobs"));
        ASSERT_TRUE(db.Exec(rollback));
        ASSERT_TRUE(db.Exec("CREATE TABLE others (id)"));  // gives it the same number
        ExpectExists(false);
        db.Close();
        std::remove(path.c_str());
        ASSERT_TRUE(db.Open());
    }
}

TEST_F(SqliteTableLookupTest, ARollbackBySqliteItselfIsNoticed)
{
    Run("CREATE TABLE others (id UNIQUE)");
    ASSERT_TRUE(db.Open());
    ASSERT_TRUE(db.Exec("INSERT INTO others VALUES (1)"));
    ASSERT_TRUE(db.Exec("BEGIN"));
    ASSERT_TRUE(db.Exec("CREATE TABLE jobs (id)"));
    EXPECT_TRUE(db.IsTableExisted("jobs"));
    EXPECT_FALSE(db.Exec("INSERT OR ROLLBACK INTO others VALUES (1)"));
    TakeLines();
    ExpectExists(false);
}

TEST_F(SqliteTableLookupTest, TemporaryTablesDoNotCount)
{
    ASSERT_TRUE(db.Open());
    ASSERT_TRUE(db.Exec("CREATE TEMP TABLE jobs (id)"));
    ExpectExists(false);
    Run("CREATE TABLE jobs (id)");
    ExpectExists(true);
    ASSERT_TRUE(db.Exec("DROP TABLE temp.jobs"));
    ExpectExists(true);
    ASSERT_TRUE(db.Exec("CREATE TEMP TABLE jobs (id)"));
    Run("DROP TABLE jobs");
    ExpectExists(false);
}

TEST_F(SqliteTableLookupTest, WhileADatabaseIsAttachedEachLookupIsTheQuery)
{
    FindJobs();
    PlainDb(dir.File("other.db")).Run("CREATE TABLE jobs (id); CREATE TABLE others (id)");
    ASSERT_TRUE(db.Exec("ATTACH '" + dir.File("other.db") + "' AS other"));
    CountFromHereOn();
    EXPECT_TRUE(db.IsTableExisted("jobs"));
    EXPECT_EQ(queries, 2);
    EXPECT_FALSE(db.IsTableExisted("others"));
    ASSERT_TRUE(db.Exec("DROP TABLE main.jobs"));
    ExpectExists(false);
    ASSERT_TRUE(db.Exec("DETACH other"));
    ExpectExists(false);
}

TEST_F(SqliteTableLookupTest, ADatabaseThatIsRestoredOverTheFileIsNoticed)
{
    FindJobs();
    PlainDb empty(dir.File("empty.db"));
    empty.Run("CREATE TABLE others (id)");
    PlainDb file(path);
    sqlite3_backup* backup = sqlite3_backup_init(file.Handle(), "main", empty.Handle(), "main");
    EXPECT_EQ(sqlite3_backup_step(backup, -1), SQLITE_DONE);
    EXPECT_EQ(sqlite3_backup_finish(backup), SQLITE_OK);
    ExpectExists(false);
}

TEST_F(SqliteTableLookupTest, ANewFileIsLookedAtAfterOpeningAgain)
{
    FindJobs();
    db.Close();
    std::remove(path.c_str());
    ASSERT_TRUE(db.Open());
    ExpectExists(false);
}

// ----------------------------------------------------------------------------------------- failures

TEST_F(SqliteTableLookupTest, AFileThatIsOverwrittenFailsAsTheQueryFails)
{
    FindJobs();
    std::ofstream(path) << std::string(8192, 'x');
    const Failure noDatabase{LookFor("jobs"), SQLITE_NOTADB, NoDatabase};
    for (int time = 0; time < 2; ++time) {
        EXPECT_FALSE(db.IsTableExisted("jobs"));
        ExpectErr(db, 404, TriesText(noDatabase));
        ExpectLines({ManyRowsGaveUp(noDatabase)});
    }
}

TEST_F(SqliteTableLookupTest, ADamagedSchemaFailsAsTheQueryFails)
{
    FindJobs();
    // One text for all lookups, and one connection each, since an error may depend on earlier ones.
    PlainDb other(path);
    other.Run("PRAGMA writable_schema=ON");
    other.Run("INSERT INTO sqlite_master VALUES ('table', 'bad', 'bad', 2, 'CREATE TABLE bad (')");
    other.Run("PRAGMA schema_version=1000");
    const Failure damaged{LookFor("jobs"), SQLITE_CORRUPT,
                          "malformed database schema (bad) - incomplete input"};
    for (const bool isShort : {true, false, true}) {
        OrvaDRCore::ShortcutsInUse().lookups = isShort;
        EXPECT_FALSE(db.IsTableExisted("jobs"));
        ExpectErr(db, 404, TriesText(damaged));
        ExpectLines({ManyRowsGaveUp(damaged)});
    }
}

TEST_F(SqliteTableLookupTest, AFailedCheckIsAFailedAttemptOfTheQuery)
{
    Run("CREATE TABLE jobs (id)");
    ASSERT_TRUE(retrying.Open());
    // The first attempt cannot prepare the check, the second cannot run it.
    bool isPrepared = false;
    faults.prepare = [&](sqlite3* handle, const char* sql, sqlite3_stmt** statement) {
        return std::exchange(isPrepared, true) ? RealPrepare(handle, sql, statement) : SQLITE_NOMEM;
    };
    bool isRun = false;
    faults.step = [&](sqlite3_stmt* statement) {
        if (!IsStatement(statement, SchemaCheck)) return RealStep(statement);
        return std::exchange(isRun, true) ? RealStep(statement) : SQLITE_IOERR;
    };
    const std::string message = "not an error";  // SQLite itself has not failed
    EXPECT_TRUE(retrying.IsTableExisted("jobs"));
    ExpectErr(retrying, 0);
    ExpectLines({Info("SelectByCommand",
                      "After retry [2] times, success to select command, previous errs [" +
                          TriesText({{LookFor("jobs"), SQLITE_NOMEM, message},
                                     {LookFor("jobs"), SQLITE_IOERR, message}}) +
                          "]")});
    ExpectPauses(2);
}

// --------------------------------------------------------------------- changes that SQLite overlooks

TEST_F(SqliteTableLookupTest, AfterAChangeOfItsOwnInTheSchemaTableEachLookupIsTheQuery)
{
    FindJobs();
    ASSERT_TRUE(db.Exec("PRAGMA Writable_Schema=ON"));
    ASSERT_TRUE(db.Exec("UPDATE sqlite_master SET name='other' WHERE name='jobs'"));
    ExpectExists(false);
    ASSERT_TRUE(db.Exec("UPDATE sqlite_master SET name='jobs' WHERE name='other'"));
    ExpectExists(true);
    ASSERT_TRUE(db.Exec("DELETE FROM sqlite_master"));
    ExpectExists(false);
}

TEST_F(SqliteTableLookupTest, ASchemaWhoseNumberIsSetBackIsQueried)
{
    FindJobs();
    const std::string number = Run("PRAGMA schema_version");
    ASSERT_TRUE(db.Exec("DROP TABLE jobs"));
    ASSERT_TRUE(db.Exec("PRAGMA schema_version=" + number));
    EXPECT_FALSE(db.IsTableExisted("jobs"));
}

// -------------------------------------------------------------------------------------------- names

TEST_F(SqliteTableLookupTest, NamesThatArePartOfTheQueryAreAlwaysQueried)
{
    Run("CREATE TABLE \"o'brien\" (id); CREATE TABLE jobs (id); CREATE TABLE \"two words\" (id)");
    ASSERT_TRUE(db.Open());
    const std::string first = "x' OR EXISTS (SELECT 1 FROM jobs) OR '";
    for (int time = 0; time < 2; ++time) {
        EXPECT_TRUE(db.IsTableExisted("o''brien"));
        EXPECT_TRUE(db.IsTableExisted("two words"));
        EXPECT_FALSE(db.IsTableExisted(first));
    }
    Run("INSERT INTO jobs VALUES (1)");  // which leaves the schema as it is
    EXPECT_TRUE(db.IsTableExisted(first));
    Run("DELETE FROM jobs");
    EXPECT_FALSE(db.IsTableExisted(first));
}

TEST_F(SqliteTableLookupTest, ANameEndsTheQueryAtItsZeroByte)
{
    FindJobs();
    const std::string name("jobs'\0x", 7);
    EXPECT_TRUE(db.IsTableExisted(name));
    EXPECT_FALSE(db.IsTableExisted(std::string("jobs\0x", 6)));
    EXPECT_EQ(TakeLines().size(), 1U);  // the quote is never closed
    Run("DROP TABLE jobs");
    EXPECT_FALSE(db.IsTableExisted(name));
}

TEST_F(SqliteTableLookupTest, NamesOfAnyLengthAndEveryByteAreFound)
{
    std::string every;
    for (int byte = 1; byte < 128; ++byte) {
        if (byte != '\'' && byte != '"') every += static_cast<char>(byte);
    }
    for (const std::string& name : {every, std::string("\u00fc\u4e2d"), std::string(64, 'n'),
                                    std::string(65, 'n'), std::string(5000, 'n')}) {
        Run("CREATE TABLE \"" + name + "\" (id)");
        ASSERT_TRUE(db.Open());
        for (int time = 0; time < 2; ++time) EXPECT_TRUE(db.IsTableExisted(name));
        Run("DROP TABLE \"" + name + "\"");
        EXPECT_FALSE(db.IsTableExisted(name));
    }
}

TEST_F(SqliteTableLookupTest, TheNamesThatAreRememberedAreLimited)
{
    TableLookup lookup;
    lookup.Remember("first");
    for (int number = 1; number < 128; ++number) lookup.Remember("t" + std::to_string(number));
    EXPECT_TRUE(lookup.IsKnown("first"));
    lookup.Remember("last");
    EXPECT_FALSE(lookup.IsKnown("first"));
    EXPECT_TRUE(lookup.IsKnown("last"));
}

}  // namespace
