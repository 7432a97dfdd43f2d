// SelectEach and SelectEachByCommand: rows given one by one.
#include <malloc.h>

#include <stdexcept>

#include <orvadrcore/sqlite_db.h>
#include <orvadrcore/sqlite_transaction.h>

#include "support/fixtures/sqlite_fixture.h"

namespace {

using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteRow;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteTransaction;
using OrvaDRCore::SqliteValueList;

using Take = std::function<bool(const SqliteRow&)>;

class SqliteDbEachTest : public SqliteFixture {
  protected:
    void MakeJobs() const { Run("CREATE TABLE jobs (id); INSERT INTO jobs VALUES (1), (2), (3)"); }

    // Notes the id of each row, and wants no more after `most` rows.
    Take NoteIds(int most = 100)
    {
        return [this, most](const SqliteRow& row) mutable {
            int id = 0;
            EXPECT_TRUE(row.GetValue("id", id));
            ids += std::to_string(id) + " ";
            return --most > 0;
        };
    }

    // The ids of a select's rows.
    std::string Ids(SqliteDB& connection, const std::string& select)
    {
        ids.clear();
        EXPECT_TRUE(connection.SelectEachByCommand(select, NoteIds()));
        return ids;
    }

    static SelectCommand AllJobs()
    {
        SelectCommand select;
        select.SetTable(SqliteTableHandler("jobs", "id"));
        select.SelectAll();
        return select;
    }

    static LogLine GaveUp(const Failure& failure, std::size_t tries = 1)
    {
        LogLine line = ManyRowsGaveUp(failure, tries);
        line.function = "SelectEachByCommand";
        return line;
    }

    const std::string all = "SELECT id FROM jobs";
    std::string ids;
};

// -------------------------------------------------------------------------------------------- rows

TEST_F(SqliteDbEachTest, EachRowIsGivenInItsOrder)
{
    MakeJobs();
    EXPECT_TRUE(db.SelectEach(AllJobs(), NoteIds()));
    EXPECT_EQ(ids, "1 2 3 ");
    ExpectErr(db, 0);
    EXPECT_EQ(Ids(db, all + " ORDER BY id DESC"), "3 2 1 ");
    EXPECT_EQ(Ids(db, all + " WHERE id>7"), "");
    ExpectErr(db, 0);
}

TEST_F(SqliteDbEachTest, StoppingEarlyIsASuccess)
{
    MakeJobs();
    EXPECT_TRUE(db.SelectEach(AllJobs(), NoteIds(2)));
    EXPECT_EQ(ids, "1 2 ");
    ExpectErr(db, 0);
    EXPECT_TRUE(db.Exec("DROP TABLE jobs"));  // no statement is left running
}

TEST_F(SqliteDbEachTest, TheTableIsCreatedAsForOtherSelects)
{
    EXPECT_TRUE(db.SelectEach(AllJobs(), NoteIds()));
    EXPECT_EQ(ids, "");
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "0");
}

TEST_F(SqliteDbEachTest, AStatementThatWritesIsCommittedAlsoWhenItsRowsAreNotWanted)
{
    MakeJobs();
    ASSERT_TRUE(db.Open());
    EXPECT_TRUE(db.SelectEachByCommand("UPDATE jobs SET id=id+5 RETURNING id",
                                       [](auto&) { return false; }));
    EXPECT_EQ(Run(all), "6;7;8");
}

TEST_F(SqliteDbEachTest, AMillionRowsNeedNoMoreMemoryThanOne)
{
    constexpr std::int64_t Most = 2 * 1024 * 1024;
    Run("CREATE TABLE jobs (id INTEGER PRIMARY KEY, name TEXT, size INTEGER);"
        "WITH RECURSIVE n (c) AS (VALUES (1) UNION ALL SELECT c+1 FROM n WHERE c<1000000)"
        "INSERT INTO jobs SELECT c, 'job number '||c, c+3000000000 FROM n");
    ASSERT_TRUE(db.Open());
    const auto allocated = [] {
        const struct mallinfo2 info = ::mallinfo2();  // of SQLite, too
        return static_cast<std::int64_t>(info.uordblks + info.hblkhd);
    };
    std::int64_t rows = 0;
    std::int64_t atFirst = 0;
    std::int64_t most = 0;
    std::int64_t sum = 0;
    std::string name;
    EXPECT_TRUE(db.SelectEachByCommand("SELECT * FROM jobs", [&](const SqliteRow& row) {
        std::int64_t size = 0;
        EXPECT_TRUE(row.GetValue("name", name) && row.GetValue("size", size));
        sum += size;
        if (rows == 0) atFirst = allocated();
        if (rows++ % 1000 == 0) most = std::max(most, allocated());
        return true;
    }));
    EXPECT_EQ(rows, 1'000'000);
    EXPECT_EQ(name, "job number 1000000");
    EXPECT_EQ(sum, 3'000'000'000'000'000 + 500'000'500'000);
    EXPECT_LE(most - atFirst, Most);
    RecordProperty("bytes_more_than_one_row", std::to_string(most - atFirst));
}

// ---------------------------------------------------------------------------------------- failures

TEST_F(SqliteDbEachTest, WhatIsNotValidIsRefused)
{
    EXPECT_FALSE(db.SelectEach(SelectCommand(), NoteIds()));
    ExpectErr(db, 401);
    ExpectLines({Err("SelectEach", "invalid select command [" + SelectCommand().ToStr() + "]")});

    EXPECT_FALSE(db.SelectEachByCommand("", NoteIds()));
    ExpectErr(db, 401);
    ExpectLines({Err("SelectEachByCommand", "Empty command to select records")});

    EXPECT_FALSE(db.SelectEachByCommand(all, nullptr));
    ExpectErr(db, 401);
    const LogLine nobody =
        Err("SelectEachByCommand", "no function takes the rows of [" + all + "]");
    ExpectLines({nobody});

    MakeJobs();
    EXPECT_FALSE(db.SelectEach(AllJobs(), nullptr));
    ExpectErr(db, 401);
    ExpectLines({Err("SelectEachByCommand", "no function takes the rows of [SELECT  * FROM jobs]"),
                 Err("SelectEach", "Failed to select by command [SELECT  * FROM jobs]")});
}

TEST_F(SqliteDbEachTest, AFileThatCannotBeOpenedIsReported)
{
    const std::string nowhere = dir.File("none/jobs.db");
    SqliteDB connection(nowhere, 3);
    EXPECT_FALSE(connection.SelectEach(AllJobs(), NoteIds()));
    ExpectErr(connection, 404);
    ExpectLines({Warn("Open", "Failed to open db[" + nowhere + "]"),
                 Err("SelectEach", "Failed to open db [" + nowhere + "]")});
}

TEST_F(SqliteDbEachTest, AttemptsThatFailBeforeTheFirstRowAreRepeated)
{
    const Failure noTable{all, SQLITE_ERROR, "no such table: jobs"};
    ASSERT_TRUE(retrying.Open());
    EXPECT_FALSE(retrying.SelectEachByCommand(all, NoteIds()));
    ExpectErr(retrying, 404, TriesText(noTable, 4));
    ExpectLines({GaveUp(noTable, 4)});
    ExpectPauses(3);

    pauses.OnPause([&](std::size_t number) {
        if (number == 5) MakeJobs();
    });
    EXPECT_EQ(Ids(retrying, all), "1 2 3 ");
    ExpectErr(retrying, 0);
    ExpectLines({Info("SelectEachByCommand",
                      "After retry [2] times, success to select command, previous errs [" +
                          TriesText(noTable, 2) + "]")});
}

TEST_F(SqliteDbEachTest, NothingIsRepeatedAfterTheFirstRow)
{
    const Failure overflow{"SELECT abs(id) AS id FROM jobs", SQLITE_ERROR, "integer overflow"};
    Run("CREATE TABLE jobs (id); INSERT INTO jobs VALUES (1), (2), (-9223372036854775808), (4)");
    ASSERT_TRUE(retrying.Open());
    EXPECT_FALSE(retrying.SelectEachByCommand(overflow.command, NoteIds()));
    EXPECT_EQ(ids, "1 2 ");
    ExpectErr(retrying, 404, TriesText(overflow));
    ExpectLines({GaveUp(overflow)});
    ExpectPauses(0);
}

TEST_F(SqliteDbEachTest, ALockThatComesBeforeTheFirstRowIsWaitedFor)
{
    MakeJobs();
    LockHolder holder(path);
    pauses.OnPause([&](std::size_t) { holder.Release(); });
    ASSERT_TRUE(retrying.Open());
    EXPECT_EQ(Ids(retrying, all), "1 2 3 ");
    ExpectPauses(1);
    EXPECT_EQ(TakeLines().size(), 1U);
}

// ------------------------------------------------------------------------- what the callback may do

TEST_F(SqliteDbEachTest, WhatTheCallbackThrowsPassesThroughAndEndsTheSelect)
{
    MakeJobs();
    ASSERT_TRUE(retrying.Open());
    for (int time = 0; time < 2; ++time) {
        EXPECT_THROW((void)retrying.SelectEachByCommand(
                         all, [](const SqliteRow&) -> bool { throw std::runtime_error("enough"); }),
                     std::runtime_error);
        ExpectErr(retrying, 404);
        Run("INSERT INTO jobs VALUES (4)");  // nothing is locked
    }
    EXPECT_EQ(Ids(retrying, all), "1 2 3 4 4 ");
    ExpectPauses(0);
}

TEST_F(SqliteDbEachTest, SelectsMayBeNestedOnOneConnection)
{
    MakeJobs();
    ASSERT_TRUE(db.Open());
    for (int time = 0; time < 3; ++time) {
        ids.clear();
        EXPECT_TRUE(db.SelectEachByCommand(all, [&](const SqliteRow& outer) {
            int id = 0;
            EXPECT_TRUE(outer.GetValue("id", id));
            EXPECT_TRUE(db.SelectEachByCommand(all, NoteIds(2)));  // the same statement
            SqliteValueList record;
            EXPECT_TRUE(db.SelectByCommand(all + " WHERE id=3", record));
            EXPECT_EQ(record.ToStr(), "id:3");
            int again = 0;
            EXPECT_TRUE(outer.GetValue("id", again));
            EXPECT_EQ(again, id);
            ids += "in " + std::to_string(id) + ", ";
            return true;
        }));
        ExpectErr(db, 0);
        EXPECT_EQ(ids, "1 2 in 1, 1 2 in 2, 1 2 in 3, ");
    }
    EXPECT_TRUE(db.Exec("DROP TABLE jobs"));
}

TEST_F(SqliteDbEachTest, AFailedNestedSelectDoesNotEndTheOuterOne)
{
    MakeJobs();
    ASSERT_TRUE(db.Open());
    int rows = 0;
    EXPECT_TRUE(db.SelectEachByCommand(all, [&](const SqliteRow&) {
        EXPECT_FALSE(db.SelectEachByCommand("BAD", NoteIds()));
        EXPECT_EQ(db.GetErrCode(), 404);
        return ++rows < 3;
    }));
    ExpectErr(db, 0);
    EXPECT_EQ(TakeLines().size(), 3U);
}

TEST_F(SqliteDbEachTest, OtherConnectionsMayBeUsed)
{
    MakeJobs();
    ASSERT_TRUE(retrying.Open());
    EXPECT_TRUE(db.SelectEach(AllJobs(), [&](const SqliteRow& row) {
        int id = 0;
        EXPECT_TRUE(row.GetValue("id", id));
        return Ids(retrying, all + " WHERE id=" + std::to_string(id)) == std::to_string(id) + " ";
    }));
    EXPECT_EQ(ids, "3 ");
}

TEST_F(SqliteDbEachTest, WritesOfTheCallbackAreStored)
{
    MakeJobs();
    ASSERT_TRUE(db.Open());
    EXPECT_TRUE(db.SelectEachByCommand(all + " ORDER BY id", [&](const SqliteRow& row) {
        std::string id;
        int number = 0;
        EXPECT_TRUE(row.GetValue("id", number));
        SqliteTransaction transaction(db);
        return transaction.Begin() &&
               db.Exec("UPDATE jobs SET id=id+10 WHERE id=" + std::to_string(number)) &&
               transaction.Commit();
    }));
    EXPECT_EQ(Run(all), "11;12;13");
}

TEST_F(SqliteDbEachTest, ARollbackOfTheCallbackEndsTheSelect)
{
    MakeJobs();
    ASSERT_TRUE(retrying.Open());
    EXPECT_TRUE(retrying.Exec("BEGIN"));
    EXPECT_TRUE(retrying.Exec("INSERT INTO jobs VALUES (4)"));
    EXPECT_TRUE(retrying.Exec("CREATE TABLE others (id)"));
    EXPECT_FALSE(retrying.SelectEachByCommand(all, [&](const SqliteRow&) {
        EXPECT_TRUE(retrying.Exec("ROLLBACK"));
        return true;
    }));
    EXPECT_EQ(retrying.GetErr().size(), 1U);
    EXPECT_EQ(TakeLines().size(), 1U);
    EXPECT_EQ(Ids(retrying, all), "1 2 3 ");
}

TEST_F(SqliteDbEachTest, AConnectionThatTheCallbackClosesGivesNoMoreRows)
{
    const Failure closed{all, SQLITE_ABORT, "the connection was closed"};
    MakeJobs();
    ASSERT_TRUE(retrying.Open());
    EXPECT_FALSE(retrying.SelectEachByCommand(all, [&](const SqliteRow& row) {
        retrying.Close();
        return NoteIds()(row);  // the row stays good
    }));
    EXPECT_EQ(ids, "1 ");
    ExpectErr(retrying, 404, TriesText(closed));
    ExpectLines({GaveUp(closed)});
    EXPECT_EQ(Closed(), 1);
    EXPECT_FALSE(retrying.Exec("SELECT 1"));
    EXPECT_EQ(retrying.GetErrCode(), 403);
    ExpectLines({Err("Exec", "DB[" + path + "] is not opened")});
}

// Its commit, at its end, meets the reader.
TEST_F(SqliteDbEachTest, ADeleteWhoseConnectionTheCallbackClosesMayFail)
{
    MakeJobs();
    ASSERT_TRUE(db.Open());
    PlainDb reader(path);
    reader.Run("BEGIN; SELECT id FROM jobs");
    EXPECT_FALSE(db.SelectEachByCommand("DELETE FROM jobs RETURNING id", [this](const SqliteRow&) {
        db.Close();
        return false;
    }));
    EXPECT_EQ(db.GetSqliteCode(), SQLITE_BUSY);
    reader.Run("COMMIT");
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "3");
    TakeLines();
}

TEST_F(SqliteDbEachTest, AConnectionIsClosedByTheLastOfNestedSelects)
{
    MakeJobs();
    ASSERT_TRUE(db.Open());
    EXPECT_TRUE(db.SelectEachByCommand(all, [&](const SqliteRow& outer) {
        EXPECT_TRUE(db.SelectEachByCommand("PRAGMA busy_timeout", [&](const SqliteRow&) {
            db.Close();
            EXPECT_TRUE(db.Open());  // another connection
            return false;
        }));
        EXPECT_EQ(Closed(), 0);
        EXPECT_EQ(Ids(db, all), "1 2 3 ");
        ids.clear();
        return NoteIds(1)(outer);
    }));
    EXPECT_EQ(ids, "1 ");
    EXPECT_EQ(Opened(), 2);
    EXPECT_EQ(Closed(), 1);
    EXPECT_EQ(Ids(db, all), "1 2 3 ");
}

TEST_F(SqliteDbEachTest, AClosedConnectionTakesNoPartInSettingsOfItsTimeout)
{
    ASSERT_TRUE(db.Open());
    EXPECT_TRUE(db.SelectEachByCommand("PRAGMA busy_timeout", [&](const SqliteRow& row) {
        int timeout = 0;
        EXPECT_TRUE(row.GetValue("timeout", timeout));
        EXPECT_EQ(timeout, 1000);
        db.Close();
        return false;
    }));
    EXPECT_EQ(Closed(), 1);
}

TEST_F(SqliteDbEachTest, AConnectionMayBeMovedMeanwhile)
{
    MakeJobs();
    ASSERT_TRUE(db.Open());
    SqliteDB other("", 0);
    EXPECT_TRUE(db.SelectEachByCommand(all, [&](const SqliteRow& row) {
        if (ids.empty()) other = std::move(db);
        return NoteIds()(row);
    }));
    EXPECT_EQ(ids, "1 2 3 ");
    ExpectErr(other, 0);
    EXPECT_EQ(Ids(other, all), "1 2 3 ");
    other.Close();
}

TEST_F(SqliteDbEachTest, InsideATransactionNothingIsRepeated)
{
    MakeJobs();
    SqliteTransaction transaction(retrying);
    ASSERT_TRUE(transaction.Begin());
    EXPECT_FALSE(retrying.SelectEachByCommand("BAD", NoteIds()));
    EXPECT_EQ(retrying.GetErr().size(), 1U);
    EXPECT_EQ(TakeLines().size(), 1U);
    EXPECT_EQ(Ids(retrying, all), "1 2 3 ");
    EXPECT_TRUE(transaction.Commit());
    ExpectPauses(0);
}

}  // namespace
