// What shortcuts once did otherwise than statements that run as their texts.
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_db.h>

#include "sqlite/sqlite_connection.h"
#include "support/fixtures/as_texts.h"
#include "support/fixtures/sqlite_fixture.h"

namespace OrvaDRCore {
namespace {

class SqliteShortcutsTest : public SqliteFixture {
  protected:
    SqliteShortcutsTest()
    {
        Run("CREATE TABLE t(a, c INTEGER); INSERT INTO t VALUES(1,1),(2,2),(3,3),(4,4)");
        EXPECT_TRUE(db.Open());
    }

    std::size_t CountAbove(int limit)
    {
        std::vector<SqliteValueList> rows;
        EXPECT_TRUE(db.SelectByCommand("SELECT a FROM t WHERE c>" + std::to_string(limit), rows));
        return rows.size();
    }

    // Another connection can get the file for itself.
    bool IsUnlocked() const
    {
        PlainDb other(path);
        return sqlite3_exec(other.Handle(), "BEGIN EXCLUSIVE", nullptr, nullptr, nullptr) ==
               SQLITE_OK;
    }
};

TEST_F(SqliteShortcutsTest, ACachedSelectFindsRowsOutsideOfANewPartialIndex)
{
    EXPECT_EQ(CountAbove(2), 2U);
    EXPECT_EQ(CountAbove(3), 1U);
    Run("CREATE INDEX above ON t(c,a) WHERE c>2");
    EXPECT_EQ(CountAbove(2), 2U);  // uses the index
    EXPECT_EQ(CountAbove(-5), 4U);
}

// Whether the schema was read again before decides when SQLite notices that the column is gone.
class SqliteShortcutsLockTest : public SqliteShortcutsTest,
                                public ::testing::WithParamInterface<const char*> {};

TEST_P(SqliteShortcutsLockTest, AStatementThatFailsInATransactionKeepsNoLock)
{
    const std::string statement = GetParam();
    ASSERT_TRUE(db.Exec("UPDATE t SET c=5 WHERE c=7"));
    ASSERT_TRUE(db.Exec("DELETE FROM t WHERE c=7"));
    ASSERT_TRUE(db.Exec("INSERT INTO t (a,c) VALUES (8,9)"));
    ASSERT_EQ(CountAbove(8), 1U);
    Run("ALTER TABLE t RENAME COLUMN c TO gone");
    EXPECT_FALSE(db.Exec("DELETE FROM nosuch"));  // reads the new schema
    ASSERT_TRUE(db.Exec("BEGIN"));
    EXPECT_FALSE(db.Exec(statement));
    EXPECT_TRUE(IsUnlocked());
    EXPECT_TRUE(db.Exec("ROLLBACK"));
    TakeLines();
}

INSTANTIATE_TEST_SUITE_P(Statements, SqliteShortcutsLockTest,
                         ::testing::Values("UPDATE t SET c=6 WHERE c=8", "DELETE FROM t WHERE c=8",
                                           "INSERT INTO t (a,c) VALUES (3,4)",
                                           "SELECT a FROM t WHERE c>9"));

TEST_F(SqliteShortcutsTest, AFailedSelectInATransactionKeepsNoLock)
{
    ASSERT_EQ(CountAbove(8), 0U);
    Run("ALTER TABLE t RENAME COLUMN c TO gone");
    EXPECT_FALSE(db.Exec("DELETE FROM nosuch"));
    ASSERT_TRUE(db.Exec("BEGIN"));
    SqliteValueList row;
    EXPECT_FALSE(db.SelectByCommand("SELECT a FROM t WHERE c>8", row));
    EXPECT_TRUE(IsUnlocked());
    EXPECT_TRUE(db.Exec("ROLLBACK"));
    TakeLines();
}

// SQLite compares the schema with the file's when a column is missing, and waits for that.
TEST_F(SqliteShortcutsTest, AColumnThatIsMissingIsAwaitedFromTheHolderOfTheLock)
{
    ASSERT_TRUE(db.Exec("DELETE FROM t WHERE c=7"));
    ASSERT_TRUE(db.Exec("ALTER TABLE t RENAME COLUMN c TO d"));
    PlainDb other(path);
    other.Run("BEGIN EXCLUSIVE; ALTER TABLE t RENAME COLUMN d TO c");
    pauses.OnWait([&other](std::size_t number) {
        if (number == 2) other.Run("COMMIT");
    });
    EXPECT_TRUE(db.Exec("DELETE FROM t WHERE c=8"));
}

// ------------------------------------------------------------------------------- the order of rows

struct PartialIndex {
    const char* index;  // its condition
    const char* query;  // that of the statement
};

std::ostream& operator<<(std::ostream& out, const PartialIndex& partial)
{
    return out << partial.index << " and " << partial.query;
}

// Whether SQLite uses a partial index, and so the order of rows, depends on the literals.
class SqliteOrderTest : public SqliteShortcutsTest,
                        public ::testing::WithParamInterface<PartialIndex> {
  protected:
    SqliteOrderTest()
    {
        Run("CREATE TABLE r(a REAL, b); INSERT INTO r VALUES(5,30),(7,20),(5,10),(8,15)");
        Run("CREATE TABLE log(b); CREATE VIEW v AS SELECT * FROM r");
        Run("CREATE TRIGGER d INSTEAD OF DELETE ON v BEGIN INSERT INTO log VALUES(old.b); END");
    }

    std::string Selected()
    {
        std::string selected;
        std::vector<SqliteValueList> rows;
        EXPECT_TRUE(db.SelectByCommand("SELECT b FROM r WHERE " + query, rows));
        for (const SqliteValueList& row : rows) selected += row.ToStr() + " ";
        return selected;
    }

    std::string Deleted()
    {
        EXPECT_TRUE(db.Exec("DELETE FROM log") && db.Exec("DELETE FROM v WHERE " + query));
        return Run("SELECT b FROM log ORDER BY rowid");
    }

    const std::string makeIndex = "CREATE INDEX i ON r(b) WHERE " + std::string(GetParam().index);
    const std::string query = GetParam().query;
};

TEST_P(SqliteOrderTest, IsThatOfTheTexts)
{
    ASSERT_TRUE(db.Exec(makeIndex));
    for (int run = 0; run < 2; ++run) {
        const std::string selected = Selected();
        const std::string deleted = Deleted();
        const AsTexts asTexts;
        EXPECT_EQ(selected, Selected());
        EXPECT_EQ(deleted, Deleted());
    }
}

TEST_P(SqliteOrderTest, IsThatOfTheTextsAfterAnotherConnectionHasMadeTheIndex)
{
    Selected();
    Run(makeIndex);
    const std::string selected = Selected();
    const AsTexts asTexts;
    EXPECT_EQ(selected, Selected());
}

TEST_P(SqliteOrderTest, IsThatOfTheTextsForATriggerAfterAnotherConnectionHasMadeTheIndex)
{
    Deleted();
    Run(makeIndex + "; DELETE FROM log");
    EXPECT_TRUE(db.Exec("DELETE FROM v WHERE " + query));
    const std::string deleted = Run("SELECT b FROM log ORDER BY rowid");
    const AsTexts asTexts;
    EXPECT_EQ(deleted, Deleted());
}

INSTANTIATE_TEST_SUITE_P(Conditions, SqliteOrderTest,
                         ::testing::Values(PartialIndex{"a=5", "a=5"}, PartialIndex{"a=5.0", "a=5"},
                                           PartialIndex{"a=+5", "a=5"},
                                           PartialIndex{"a IN (5,7)", "a IN (5,7)"},
                                           PartialIndex{"a IN (5,7)", "a=5 OR a=7"},
                                           PartialIndex{"a IN (1,7)", "a=1 OR a=7"},
                                           PartialIndex{"a NOT IN (7,9)", "a NOT IN (7,9)"},
                                           PartialIndex{"a IN (5)", "a=5"},
                                           PartialIndex{"a>5", "a>6"}));

// ---------------------------------------------------------------------------- failures of the text

TEST_F(SqliteShortcutsTest, AConditionThatSqliteCannotParseFails)
{
    const auto fails = [this](const std::string& condition) {
        const bool failed = !db.Exec("DELETE FROM t WHERE " + condition);
        TakeLines();
        return failed;
    };
    std::string chain = "a=-5";
    for (int terms = 1; terms < 999; ++terms) chain += " AND c=1";
    std::string nested = "a=-5";
    for (int depth = 0; depth < 87; ++depth) nested = "(" + nested + ")";
    for (const std::string& condition : {chain, nested}) {
        const bool failed = fails(condition);
        const AsTexts asTexts;
        EXPECT_EQ(failed, fails(condition)) << condition;
    }
}

TEST_F(SqliteShortcutsTest, ForeignKeysThatAnExplainSwitchesOnAreEnforced)
{
    ASSERT_TRUE(db.Exec("CREATE TABLE p(id INTEGER PRIMARY KEY); CREATE TABLE k(a REFERENCES p)"));
    EXPECT_TRUE(db.Exec("INSERT INTO k (a) VALUES (7)"));
    EXPECT_TRUE(db.Exec("EXPLAIN PRAGMA foreign_keys=ON"));
    EXPECT_FALSE(db.Exec("INSERT INTO k (a) VALUES (8)"));
    EXPECT_EQ(db.GetSqliteCode(), SQLITE_CONSTRAINT_FOREIGNKEY);
    TakeLines();
}

// A failed command to a full-text table keeps its lock, until the next statement of the connection ends
// or is prepared again.
TEST_F(SqliteShortcutsTest, ALookupUsesTheLockThatAFullTextTableHasKept)
{
    if (sqlite3_compileoption_used("ENABLE_FTS5") == 0) return;
    Run("CREATE VIRTUAL TABLE words USING fts5(a)");
    EXPECT_TRUE(db.IsTableExisted("t"));
    EXPECT_FALSE(db.Upgrade({"CREATE TABLE u(a)", "ALTER TABLE words ADD COLUMN b"}));
    EXPECT_FALSE(db.Exec("INSERT INTO words(a,words) VALUES(3,6)"));
    PlainDb writer(path);
    writer.Run("BEGIN IMMEDIATE");
    EXPECT_EQ(sqlite3_exec(writer.Handle(), "COMMIT", nullptr, nullptr, nullptr), SQLITE_BUSY);
    EXPECT_TRUE(db.IsTableExisted("t"));
    TakeLines();
}

// What fails while another connection to a shared cache changes the schema.
void ExpectSameLockAsForText(const std::string& path, const std::function<bool(SqliteDB&)>& run)
{
    if (sqlite3_compileoption_used("USE_URI") == 0) return;
    SqliteDB one("file:" + path + "?cache=shared", 0);
    SqliteDB other("file:" + path + "?cache=shared", 0);
    ASSERT_TRUE(one.Open() && other.Open());
    ASSERT_TRUE(run(other));
    ASSERT_TRUE(one.Exec("BEGIN; CREATE TABLE u(a)"));
    EXPECT_FALSE(run(other));
    const std::string record = toString(other.GetErr());
    const AsTexts asTexts;
    EXPECT_FALSE(run(other));
    EXPECT_EQ(record, toString(other.GetErr()));
}

TEST_F(SqliteShortcutsTest, ALockOfASharedCacheIsReportedAsForTheText)
{
    ExpectSameLockAsForText(
        path, [](SqliteDB& other) { return other.Exec("UPDATE t SET c=5 WHERE a=7"); });
    TakeLines();
}

TEST_F(SqliteShortcutsTest, ALookupReportsALockOfASharedCacheAsTheQueryDoes)
{
    ExpectSameLockAsForText(path, [](SqliteDB& other) { return other.IsTableExisted("t"); });
    TakeLines();
}

}  // namespace
}  // namespace OrvaDRCore
