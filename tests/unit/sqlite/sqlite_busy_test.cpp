// How a connection waits for another one's lock, and what callers see of it.
#include "sqlite/sqlite_busy.h"

#include <orvadrcore/sqlite_db.h>
#include <orvadrcore/sqlite_transaction.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <ctime>
#include <memory>
#include <numeric>

#include "support/fixtures/sqlite_fixture.h"

namespace {

using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteTransaction;
using OrvaDRCore::SqliteValueList;

using Waits = std::vector<unsigned int>;

constexpr unsigned int Second = 1'000'000;
constexpr unsigned int Shortest = 500;
constexpr unsigned int Longest = 2500;         // at first, and between attempts to commit
constexpr unsigned int LongestOfAll = 15'000;  // after a long wait

unsigned int Sum(const Waits& waits)
{
    return std::accumulate(waits.begin(), waits.end(), 0U);
}

bool IsBetween(unsigned int wait, unsigned int shortest, unsigned int longest)
{
    return wait >= shortest && wait <= longest;
}

class SqliteBusyTest : public SqliteFixture {
  protected:
    SqliteBusyTest()
    {
        Run("CREATE TABLE jobs (id)");
        pauses.OnWait([](std::size_t) {});
    }

    // The pauses of a statement that gives up because the file stays locked.
    Waits WaitInVain(SqliteDB& connection)
    {
        const LockHolder holder(path, "BEGIN IMMEDIATE");
        return InsertInVain(connection);
    }

    Waits InsertInVain(SqliteDB& connection)
    {
        pauses.ForgetWaits();
        EXPECT_FALSE(connection.DoExecSqliteCommand(busy.command));
        ExpectErr(connection, 404, ErrorText(busy));
        return pauses.Waits();
    }

    // The library's waiting: up to a second.
    void ExpectOurWaiting(SqliteDB& connection)
    {
        const Waits waits = WaitInVain(connection);
        ASSERT_FALSE(waits.empty());
        EXPECT_TRUE(std::all_of(waits.begin(), waits.end(), [](unsigned int wait) {
            return IsBetween(wait, Shortest, LongestOfAll);
        }));
        EXPECT_TRUE(IsBetween(Sum(waits), Second, Second + LongestOfAll)) << Sum(waits);
    }

    // SQLite's own waiting, with its own pauses.
    void ExpectSqlitesWaiting(SqliteDB& connection, unsigned int milliseconds)
    {
        const Waits waits = WaitInVain(connection);
        const Waits sqlites{1000,   2000,   5000,   10'000, 15'000, 20'000,
                            25'000, 25'000, 25'000, 50'000, 50'000, 100'000};
        const std::size_t count = std::min(waits.size(), sqlites.size()) - 1;
        EXPECT_TRUE(
            std::equal(waits.begin(), waits.begin() + static_cast<long>(count), sqlites.begin()));
        EXPECT_EQ(Sum(waits), milliseconds * 1000);
    }

    std::string Ask(SqliteDB& connection, const std::string& statement)
    {
        SqliteValueList record;
        EXPECT_TRUE(connection.SelectByCommand(statement, record)) << statement;
        return record.ToStr();
    }

    // Inserts a row after one wait: another connection holds the lock until the first pause.
    void InsertAfterAWait(const std::string& begin = "BEGIN IMMEDIATE")
    {
        PlainDb other(path);
        other.Run(begin);
        pauses.OnWait([&other](std::size_t) { other.Run("COMMIT"); });
        pauses.ForgetWaits();
        EXPECT_TRUE(db.DoExecSqliteCommand(busy.command));
        EXPECT_EQ(pauses.Waits().size(), 1U);
        pauses.OnWait([](std::size_t) {});
        pauses.ForgetWaits();
    }

    const Failure busy{"INSERT INTO jobs VALUES (1)", SQLITE_BUSY, Locked};
};

// ----------------------------------------------------------------------------------------- waiting

TEST_F(SqliteBusyTest, AWaitingConnectionRetriesEveryFewMillisecondsForASecond)
{
    ASSERT_TRUE(db.Open());
    ExpectOurWaiting(db);
}

TEST_F(SqliteBusyTest, PausesAreRandom)
{
    ASSERT_TRUE(db.Open());
    ASSERT_TRUE(retrying.Open());
    const Waits waits = WaitInVain(db);
    ASSERT_FALSE(waits.empty());
    EXPECT_NE(std::count(waits.begin(), waits.end(), waits.front()),
              static_cast<long>(waits.size()));
    EXPECT_NE(waits, WaitInVain(db));
    EXPECT_NE(waits, WaitInVain(retrying));
}

TEST_F(SqliteBusyTest, PausesGrowWithTheWaitAndShrinkAsTheSecondRunsOut)
{
    ASSERT_TRUE(db.Open());
    const Waits waits = WaitInVain(db);
    ASSERT_GT(waits.size(), 100U);
    EXPECT_TRUE(std::all_of(waits.begin(), waits.begin() + 20,
                            [](unsigned int wait) { return wait <= Longest; }));
    const auto meanOf20 = [](auto begin) { return std::accumulate(begin, begin + 20, 0U) / 20; };
    const unsigned int inTheMiddle = meanOf20(waits.begin() + static_cast<long>(waits.size()) / 2);
    EXPECT_GT(inTheMiddle, 2 * Shortest);
    EXPECT_GT(inTheMiddle, meanOf20(waits.begin()));
    EXPECT_GT(inTheMiddle, meanOf20(waits.end() - 20));
    EXPECT_LT(waits.back(), 2 * Shortest);
}

TEST_F(SqliteBusyTest, PausesCountAsLongAsTheyReallyTook)
{
    pauses.OnWait([](std::size_t) {
        const timespec tenthOfASecond{0, 100'000'000};
        ::nanosleep(&tenthOfASecond, nullptr);
    });
    ASSERT_TRUE(db.Open());
    EXPECT_LE(WaitInVain(db).size(), 10U);
}

TEST_F(SqliteBusyTest, EachStatementWaitsForASecondOfItsOwn)
{
    ASSERT_TRUE(db.Open());
    const LockHolder holder(path);
    const std::size_t waits = InsertInVain(db).size();
    for (const char* statement : {"INSERT INTO jobs VALUES (1)", "SELECT id FROM jobs"}) {
        pauses.ForgetWaits();
        SqliteValueList record;
        EXPECT_FALSE(db.DoSelectSqliteRecord(statement, record));
        EXPECT_GT(pauses.Waits().size(), waits / 2) << statement;
    }
}

TEST_F(SqliteBusyTest, ACommitRetriesAtOnceAndThenLessAndLessOften)
{
    ASSERT_TRUE(db.Open());
    const LockHolder reader(path, "BEGIN; SELECT * FROM jobs");
    const Waits waits = InsertInVain(db);
    ASSERT_GT(waits.size(), 100U);
    EXPECT_TRUE(std::all_of(waits.begin(), waits.begin() + 3,
                            [](unsigned int wait) { return IsBetween(wait, 10, 50); }));
    EXPECT_TRUE(std::all_of(waits.end() - 100, waits.end(), [](unsigned int wait) {
        return IsBetween(wait, Longest / 5, Longest);
    }));
    EXPECT_TRUE(IsBetween(Sum(waits), Second, Second + Longest)) << Sum(waits);
}

TEST_F(SqliteBusyTest, ACommitRetriesAtOnceEvenAfterALongWaitForTheLock)
{
    // First another writer, which finishes after half of the second, then a reader.
    ASSERT_TRUE(db.Open());
    PlainDb other(path);
    PlainDb reader(path);
    reader.Run("BEGIN");
    other.Run("BEGIN IMMEDIATE");
    std::size_t turn = 0;
    pauses.OnWait([&](std::size_t number) {
        if (turn != 0 || Sum(pauses.Waits()) < Second / 2) return;
        turn = number;
        reader.Run("SELECT * FROM jobs");
        other.Run("ROLLBACK");
    });
    const Waits waits = InsertInVain(db);
    ASSERT_GT(turn, 0U);
    ASSERT_GT(waits.size(), turn);
    EXPECT_TRUE(IsBetween(waits[turn], 10, 50)) << waits[turn];
    EXPECT_TRUE(IsBetween(Sum(waits), Second, Second + Longest)) << Sum(waits);
}

// ------------------------------------------------------------------------------------------- yield

TEST_F(SqliteBusyTest, AConnectionThatWaitedWritesForATurnAndThenYieldsOnce)
{
    ASSERT_TRUE(db.Open());
    constexpr std::chrono::milliseconds Turn(6);
    // If this process does not run for a while, there is no need to yield any more: try again.
    for (int attempt = 0; attempt < 1000 && pauses.Waits().empty(); ++attempt) {
        const auto begin = std::chrono::steady_clock::now();
        InsertAfterAWait();
        auto now = begin;
        while (now < begin + 10 * Turn && pauses.Waits().empty()) {
            EXPECT_TRUE(db.DoExecSqliteCommand(busy.command));
            now = std::chrono::steady_clock::now();
        }
        if (!pauses.Waits().empty()) {
            EXPECT_GT(now, begin + Turn);
        }
    }
    ASSERT_EQ(pauses.Waits().size(), 1U);
    EXPECT_TRUE(IsBetween(pauses.Waits()[0], 1, Longest)) << pauses.Waits()[0];
    EXPECT_TRUE(db.DoExecSqliteCommand(busy.command));
    EXPECT_EQ(pauses.Waits().size(), 1U);
}

TEST_F(SqliteBusyTest, NoConnectionYieldsThatReadsOrDidNotWaitOrHoldsTheLock)
{
    ASSERT_TRUE(db.Open());
    EXPECT_TRUE(db.DoExecSqliteCommand(busy.command) && db.DoExecSqliteCommand(busy.command));
    EXPECT_EQ(pauses.Waits(), Waits{});
    InsertAfterAWait();
    EXPECT_EQ(Ask(db, "SELECT id FROM jobs"), "id:1");
    EXPECT_EQ(pauses.Waits(), Waits{});

    PlainDb other(path);
    other.Run("BEGIN IMMEDIATE");
    SqliteTransaction transaction(db);
    pauses.OnWait([&other](std::size_t number) {
        if (number == 1) other.Run("COMMIT");
    });
    ::usleep(1);  // takes the place of the pause by which BEGIN may yield
    ASSERT_TRUE(transaction.Begin());
    pauses.ForgetWaits();
    EXPECT_TRUE(db.Exec(busy.command) && db.Exec(busy.command) && transaction.Commit());
    EXPECT_EQ(pauses.Waits(), Waits{});
}

// ----------------------------------------------------------------------------- PRAGMA busy_timeout

TEST_F(SqliteBusyTest, EveryWayToReadTheBusyTimeoutGives1000)
{
    ASSERT_TRUE(db.Open());
    for (const char* statement :
         {"PRAGMA busy_timeout", "pragma main.\"BUSY_timeout\" ;", "PRAGMA/**/[busy_timeout]",
          "SELECT timeout FROM pragma_busy_timeout", "SELECT * FROM Pragma_Busy_Timeout()"}) {
        for (int time = 0; time < 2; ++time) {
            EXPECT_EQ(Ask(db, statement), "timeout:1000") << statement;
            std::vector<SqliteValueList> records;
            EXPECT_TRUE(db.SelectByCommand(statement, records));
            EXPECT_EQ(records.at(0).ToStr(), "timeout:1000") << statement;
        }
    }
    EXPECT_TRUE(db.Exec("PRAGMA busy_timeout; PRAGMA busy_timeout"));
    EXPECT_TRUE(db.Exec("INSERT INTO jobs SELECT timeout FROM pragma_busy_timeout"));
    EXPECT_EQ(Run("SELECT id FROM jobs"), "1000");
    ExpectOurWaiting(db);

    SqliteDB moved(std::move(db));
    EXPECT_EQ(Ask(moved, "PRAGMA busy_timeout"), "timeout:1000");
    ExpectOurWaiting(moved);
}

TEST_F(SqliteBusyTest, SettingTheBusyTimeoutGivesSqlitesOwnWaitingUntilTheNextOpen)
{
    for (const char* statement :
         {"PRAGMA busy_timeout=300", "pragma main.\"BUSY_timeout\"(300)",
          "SELECT 1; PRAGMA busy_timeout = 300; SELECT 2",
          "PRAGMA busy_timeout=7; PRAGMA busy_timeout=300", "PRAGMA busy_timeout=300; BAD",
          "PRAGMA busy_timeout; PRAGMA busy_timeout=300"}) {
        SCOPED_TRACE(statement);
        ASSERT_TRUE(db.Open());
        db.DoExecSqliteCommand(statement);
        EXPECT_EQ(Ask(db, "PRAGMA busy_timeout"), "timeout:300");
        ExpectSqlitesWaiting(db, 300);
        EXPECT_EQ(Ask(db, "SELECT timeout FROM pragma_busy_timeout"), "timeout:300");
        ExpectSqlitesWaiting(db, 300);
        db.Close();
        ASSERT_TRUE(db.Open());
        EXPECT_EQ(Ask(db, "PRAGMA busy_timeout"), "timeout:1000");
        ExpectOurWaiting(db);
        db.Close();
    }
    ASSERT_TRUE(db.Open());
    EXPECT_EQ(Ask(db, "PRAGMA busy_timeout=1000"), "timeout:1000");
    ExpectSqlitesWaiting(db, 1000);
    EXPECT_EQ(Ask(db, "PRAGMA busy_timeout=0"), "timeout:0");
    EXPECT_EQ(WaitInVain(db), Waits{});
}

TEST_F(SqliteBusyTest, ATextThatOnlyMentionsTheNameChangesNothing)
{
    ASSERT_TRUE(db.Open());
    for (const char* statement :
         {"INSERT INTO jobs VALUES ('busy_timeout=5')",
          "SELECT 'PRAGMA busy_timeout=5' -- busy_timeout",
          "SELECT 1 AS y_time, 2 AS _timeout, 'busy_timeou'", "PRAGMA nowhere.busy_timeout=5"}) {
        db.DoExecSqliteCommand(statement);
    }
    EXPECT_EQ(Ask(db, "PRAGMA busy_timeout"), "timeout:1000");
    ExpectOurWaiting(db);
}

TEST_F(SqliteBusyTest, WhenTheTimeoutCannotBeSetNothingIsWaitedFor)
{
    {
        SqliteFaults faults;
        faults.busyTimeout = [](sqlite3*, int) { return SQLITE_MISUSE; };
        EXPECT_FALSE(db.Open());
        ExpectLines({Warn("Open", "Failed to set busy timeout with error")});
    }
    EXPECT_EQ(WaitInVain(db), Waits{});
    EXPECT_EQ(Ask(db, "PRAGMA busy_timeout"), "timeout:0");
    EXPECT_EQ(Ask(db, "PRAGMA busy_timeout=20"), "timeout:20");
    ExpectSqlitesWaiting(db, 20);
}

TEST_F(SqliteBusyTest, AStaleCachedStatementLeavesTheWaitingToItsText)
{
    const std::string update = "UPDATE jobs SET id=1 WHERE id=2";
    ASSERT_TRUE(db.Open());
    ASSERT_TRUE(db.Exec(update));
    Run("DROP TABLE jobs");
    SqliteValueList record;
    ASSERT_TRUE(db.SelectByCommand("SELECT 1 FROM sqlite_master", record));
    const LockHolder holder(path);
    pauses.ForgetWaits();
    // SQLite waits even for a table that it does not know, to see whether the schema has changed.
    EXPECT_FALSE(db.DoExecSqliteCommand(update));
    EXPECT_GE(Sum(pauses.Waits()), Second);
    ExpectErr(db, 404, ErrorText({update, SQLITE_ERROR, "no such table: jobs"}));
}

}  // namespace
