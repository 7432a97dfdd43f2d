// What cached statements once did otherwise than their texts. tests/shapes found these.
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_db.h>

#include "sqlite/sqlite_connection.h"
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

}  // namespace
}  // namespace OrvaDRCore
