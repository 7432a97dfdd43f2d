// SqliteDB's selects: how a row becomes a record, and both forms of SelectByCommand.
#include <orvadrcore/sqlite_db.h>

#include "support/fixtures/sqlite_fixture.h"

namespace {

using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteValueList;

using Records = std::vector<SqliteValueList>;

std::string ToText(const Records& records)
{
    std::string text;
    for (const SqliteValueList& record : records) text += "{" + record.ToStr() + "}";
    return text;
}

class SqliteDbSelectTest : public SqliteFixture {
  protected:
    SqliteDbSelectTest() { earlier.AddValue("kept", 1); }

    // Expects one row, which both forms read alike, each with these log lines.
    void ExpectRow(const std::string& statement, const std::string& row,
                   const std::vector<LogLine>& lines = {})
    {
        SCOPED_TRACE(statement);
        EXPECT_TRUE(db.Open());
        SqliteValueList record;
        EXPECT_TRUE(db.SelectByCommand(statement, record));
        ExpectErr(db, 0);
        EXPECT_EQ(record.ToStr(), row);
        ExpectLines(lines);

        Records records;
        EXPECT_TRUE(db.SelectByCommand(statement, records));
        ExpectErr(db, 0);
        EXPECT_EQ(ToText(records), "{" + row + "}");
        ExpectLines(lines);
    }

    // Expects a failure after so many attempts, in both forms, with the outputs unchanged.
    void ExpectGivenUp(SqliteDB& connection, const Failure& failure, std::size_t tries)
    {
        SCOPED_TRACE(failure.command);
        SqliteValueList record(earlier);
        EXPECT_FALSE(connection.SelectByCommand(failure.command, record));
        ExpectErr(connection, 404, TriesText(failure, tries));
        EXPECT_EQ(record.ToStr(), "kept:1");
        ExpectLines({OneRowGaveUp(failure, tries)});

        Records records{earlier};
        EXPECT_FALSE(connection.SelectByCommand(failure.command, records));
        ExpectErr(connection, 404, TriesText(failure, tries));
        EXPECT_EQ(ToText(records), "{kept:1}");
        ExpectLines({ManyRowsGaveUp(failure, tries)});
    }

    const Failure noTable{"SELECT id FROM jobs", SQLITE_ERROR, "no such table: jobs"};
    SqliteValueList earlier;  // what a caller's output holds before the call: {kept:1}
};

// ------------------------------------------------------------------------------- rows to records

TEST_F(SqliteDbSelectTest, ColumnsAreKeyedByTheirNames)
{
    ExpectRow("SELECT 1 AS x", "x:1");
    ExpectRow("SELECT 2 AS \"two words\", 'a' AS X, 'b' AS x", "X:'a', two words:2, x:'b'");
    Run("CREATE TABLE jobs (id INTEGER, name TEXT); INSERT INTO jobs VALUES (7, 'seven')");
    ExpectRow("SELECT * FROM jobs", "id:7, name:'seven'");
    ExpectRow("SELECT name AS label FROM jobs", "label:'seven'");
    ExpectRow("SELECT count(*) FROM jobs", "count(*):1");
}

TEST_F(SqliteDbSelectTest, IntegersAreSignedNumbersAndTextsAreTexts)
{
    SqliteValueList record;
    ASSERT_TRUE(db.Open());
    ASSERT_TRUE(db.SelectByCommand("SELECT 1 AS one, '1' AS text, '' AS empty", record));
    int number = 0;
    EXPECT_TRUE(record.GetValue("one", number));
    EXPECT_EQ(number, 1);
    EXPECT_EQ(record.GetValue("one").ToFormatedValue(), "1");
    EXPECT_EQ(record.GetValue("text").ToFormatedValue(), "'1'");
    EXPECT_EQ(record.GetValue("empty").ToFormatedValue(), "''");
    ExpectLines({});
}

TEST_F(SqliteDbSelectTest, IntegersBeyond32BitsAreTruncated)
{
    // The contract; CAST(... AS TEXT) gives the whole number.
    struct Row {
        std::string stored;
        std::string read;
    };
    const std::vector<Row> rows = {
        {"2147483647", "2147483647"},  {"-2147483648", "-2147483648"},
        {"2147483648", "-2147483648"}, {"3000000000", "-1294967296"},
        {"4294967303", "7"},           {"-4294967297", "-1"},
        {"9223372036854775807", "-1"}, {"4294967296", "0"},
    };
    for (const Row& row : rows) {
        ExpectRow("SELECT " + row.stored + " AS x", "x:" + row.read);
        ExpectRow("SELECT CAST(" + row.stored + " AS TEXT) AS x", "x:'" + row.stored + "'");
    }
}

TEST_F(SqliteDbSelectTest, ATextIsReadUpToItsFirstZeroByte)
{
    ExpectRow("SELECT 'ab' || char(0) || 'cd' AS x", "x:'ab'");
    ExpectRow("SELECT char(0) || 'cd' AS x", "x:''");
}

TEST_F(SqliteDbSelectTest, TextsKeepTheirBytesAndQuotes)
{
    ExpectRow("SELECT 'it''s' AS x", "x:'it's'");
    ExpectRow("SELECT 'Z\xC3\xBCrich' AS x", "x:'Z\xC3\xBCrich'");
    ExpectRow("SELECT CAST(x'FF61' AS TEXT) AS x", "x:'\xFF\x61'");  // not UTF-8
}

TEST_F(SqliteDbSelectTest, NullsRealsAndBlobsAreLeftOutAndLogged)
{
    ExpectRow("SELECT NULL AS x", "", {Warn("ParseRecord", "field [x] has null value")});
    ExpectRow("SELECT 1.5 AS x", "",
              {Warn("ParseRecord", "Not supported type [2] with field [x]")});
    ExpectRow("SELECT x'00' AS x", "",
              {Warn("ParseRecord", "Not supported type [4] with field [x]")});

    Run("CREATE TABLE jobs (id INTEGER, name TEXT, note TEXT, ratio REAL, body BLOB, last INTEGER);"
        "INSERT INTO jobs VALUES (7, 'seven', NULL, 0.5, x'07', 8)");
    ExpectRow("SELECT * FROM jobs", "id:7, last:8, name:'seven'",
              {Warn("ParseRecord", "field [note] has null value"),
               Warn("ParseRecord", "Not supported type [2] with field [ratio]"),
               Warn("ParseRecord", "Not supported type [4] with field [body]")});
}

TEST_F(SqliteDbSelectTest, OfColumnsWithTheSameNameTheLastNonNullCounts)
{
    ExpectRow("SELECT 1 AS x, 'two' AS x", "x:'two'");
    ExpectRow("SELECT 1 AS x, NULL AS x", "x:1", {Warn("ParseRecord", "field [x] has null value")});
    ExpectRow("SELECT NULL AS x, 2 AS x", "x:2", {Warn("ParseRecord", "field [x] has null value")});
}

TEST_F(SqliteDbSelectTest, AColumnWithoutANameIsLeftOut)
{
    ExpectRow("SELECT 7 AS \"\", 'a' AS \"\", 8 AS x", "x:8",
              {Err("AddValue", "Bad Field[] or value [7]").In("sqlite_value.cpp"),
               Err("AddValue", "Bad Field[] or value ['a']").In("sqlite_value.cpp")});
}

TEST_F(SqliteDbSelectTest, AColumnIsLeftOutWhenItsNameCannotBeRead)
{
    SqliteFaults faults;
    faults.columnName = [](sqlite3_stmt*, int column) { return column == 2 ? "last" : nullptr; };
    ExpectRow("SELECT 7 AS a, NULL AS b, 9 AS c", "last:9",
              {Err("AddValue", "Bad Field[] or value [7]").In("sqlite_value.cpp"),
               Warn("ParseRecord", "field [] has null value")});
}

TEST_F(SqliteDbSelectTest, ATextIsLeftOutWhenItCannotBeRead)
{
    SqliteFaults faults;
    faults.columnText = [](sqlite3_stmt*, int) -> const unsigned char* { return nullptr; };
    ExpectRow("SELECT 'text' AS name, 7 AS id", "id:7",
              {Warn("ParseRecord", "field [name] has null value")});
}

TEST_F(SqliteDbSelectTest, ARowWithoutAStatementIsEmpty)
{
    int steps = 0;
    SqliteFaults faults;
    faults.step = [&](sqlite3_stmt* statement) {
        EXPECT_EQ(statement, nullptr);
        return ++steps % 3 == 0 ? SQLITE_DONE : SQLITE_ROW;
    };
    ASSERT_TRUE(db.Open());
    SqliteValueList record(earlier);
    EXPECT_TRUE(db.SelectByCommand(" ", record));  // takes one step; the other form takes two
    EXPECT_EQ(record.ToStr(), "");
    ExpectErr(db, 0);
    ExpectLines({Err("ParseRecord", "Null Pointer")});

    Records records;
    EXPECT_TRUE(db.SelectByCommand(" ", records));
    EXPECT_EQ(ToText(records), "{}");
    ExpectErr(db, 0);
    ExpectLines({Err("ParseRecord", "Null Pointer")});
}

// -------------------------------------------------------------------------------- the two forms

TEST_F(SqliteDbSelectTest, WithoutARowTheOutputsAreUnchanged)
{
    Run("CREATE TABLE jobs (id)");
    ASSERT_TRUE(db.Open());
    SqliteValueList record(earlier);
    db.SetDBErr("", 0, "earlier");
    EXPECT_TRUE(db.SelectByCommand("SELECT id FROM jobs", record));
    ExpectErr(db, 0);
    EXPECT_EQ(record.ToStr(), "kept:1");

    Records records{earlier};
    db.SetDBErr("", 0, "earlier");
    EXPECT_TRUE(db.SelectByCommand("SELECT id FROM jobs", records));
    ExpectErr(db, 0);
    EXPECT_EQ(ToText(records), "{kept:1}");
}

TEST_F(SqliteDbSelectTest, TheOneRowFormReplacesTheRecordByTheFirstRow)
{
    Run("CREATE TABLE jobs (id); INSERT INTO jobs VALUES (3), (1), (2)");
    ASSERT_TRUE(db.Open());
    SqliteValueList record(earlier);
    EXPECT_TRUE(db.SelectByCommand("SELECT id FROM jobs ORDER BY id", record));
    EXPECT_EQ(record.ToStr(), "id:1");
}

TEST_F(SqliteDbSelectTest, TheOneRowFormReadsOnlyTheFirstRow)
{
    // The second row cannot be computed.
    Run("CREATE TABLE jobs (id); INSERT INTO jobs VALUES (-1), (-9223372036854775808)");
    ExpectLines({});
    ASSERT_TRUE(db.Open());
    SqliteValueList record;
    EXPECT_TRUE(db.SelectByCommand("SELECT abs(id) AS id FROM jobs", record));
    EXPECT_EQ(record.ToStr(), "id:1");
    ExpectErr(db, 0);
}

TEST_F(SqliteDbSelectTest, TheManyRowsFormAppendsAllRows)
{
    Run("CREATE TABLE jobs (id); INSERT INTO jobs VALUES (3), (1), (2)");
    ASSERT_TRUE(db.Open());
    Records records{earlier};
    EXPECT_TRUE(db.SelectByCommand("SELECT id FROM jobs ORDER BY id", records));
    EXPECT_EQ(ToText(records), "{kept:1}{id:1}{id:2}{id:3}");
    EXPECT_TRUE(db.SelectByCommand("SELECT id FROM jobs ORDER BY id", records));
    EXPECT_EQ(ToText(records), "{kept:1}{id:1}{id:2}{id:3}{id:1}{id:2}{id:3}");
}

TEST_F(SqliteDbSelectTest, OnlyTheFirstStatementOfATextIsRun)
{
    Run("CREATE TABLE jobs (id)");
    ExpectRow("SELECT 1 AS x; DROP TABLE jobs", "x:1");
    ExpectRow(std::string("SELECT 2 AS x\0 BAD", 18), "x:2");
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "0");
}

TEST_F(SqliteDbSelectTest, AStatementThatGivesNoRowsRunsOnceAndSucceeds)
{
    Run("CREATE TABLE jobs (id)");
    ASSERT_TRUE(db.Open());
    SqliteValueList record(earlier);
    EXPECT_TRUE(db.SelectByCommand("INSERT INTO jobs VALUES (1)", record));
    ExpectErr(db, 0);
    EXPECT_EQ(record.ToStr(), "kept:1");
    Records records{earlier};
    EXPECT_TRUE(db.SelectByCommand("INSERT INTO jobs VALUES (2)", records));
    ExpectErr(db, 0);
    EXPECT_EQ(ToText(records), "{kept:1}");
    EXPECT_EQ(Run("SELECT id FROM jobs ORDER BY id"), "1;2");
}

TEST_F(SqliteDbSelectTest, AStatementThatWritesGivesItsRowOnceItIsCommitted)
{
    Run("CREATE TABLE jobs (id)");
    ASSERT_TRUE(db.Open());
    SqliteValueList record(earlier);
    EXPECT_TRUE(db.SelectByCommand("INSERT INTO jobs VALUES (1),(2) RETURNING id", record));
    ExpectErr(db, 0);
    EXPECT_EQ(record.ToStr(), "id:1");
    Records records;
    EXPECT_TRUE(db.SelectByCommand("UPDATE jobs SET id=id+5 RETURNING id", records));
    EXPECT_EQ(ToText(records), "{id:6}{id:7}");
    EXPECT_EQ(Run("SELECT id FROM jobs"), "6;7");
}

TEST_F(SqliteDbSelectTest, AStatementThatWritesGivesNoRowWhenItsCommitFails)
{
    const Failure busy{"INSERT INTO jobs VALUES (1),(2) RETURNING id", SQLITE_BUSY, Locked};
    Run("CREATE TABLE jobs (id)");
    LockHolder reader(path, "BEGIN; SELECT * FROM jobs");
    ASSERT_TRUE(retrying.Open());
    SqliteValueList record(earlier);
    EXPECT_FALSE(retrying.SelectByCommand(busy.command, record));
    ExpectErr(retrying, 404, TriesText(busy, 4));
    EXPECT_EQ(record.ToStr(), "kept:1");
    ExpectLines({OneRowGaveUp(busy, 4)});
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "0");

    pauses.OnPause([&](std::size_t number) {
        if (number == 5) reader.Release();
    });
    EXPECT_TRUE(retrying.SelectByCommand(busy.command, record));
    ExpectErr(retrying, 0);
    EXPECT_EQ(record.ToStr(), "id:1");
    ExpectLines(
        {Info("SelectByCommand", "After retry [2] times, success to exec command [" + busy.command +
                                     "], previous errs[" + TriesText(busy, 2) + "]")});
    EXPECT_EQ(Run("SELECT id FROM jobs"), "1;2");
}

TEST_F(SqliteDbSelectTest, SideEffectsHappenInEachAttempt)
{
    const std::string insert = "INSERT INTO jobs VALUES (1)";
    Run("CREATE TABLE jobs (id)");
    ASSERT_TRUE(retrying.Open());
    int steps = 0;
    std::string message;
    {
        SqliteFaults faults;
        faults.step = [&](sqlite3_stmt* statement) {
            const int code = RealStep(statement);
            if (!IsStatement(statement, insert) || ++steps % 2 == 0) return code;
            message = sqlite3_errmsg(sqlite3_db_handle(statement));
            return SQLITE_IOERR;  // after the insert
        };
        SqliteValueList record;
        EXPECT_TRUE(retrying.SelectByCommand(insert, record));
        const std::string tries = TriesText({insert, SQLITE_IOERR, message});
        ExpectLines({Info("SelectByCommand", "After retry [1] times, success to exec command [" +
                                                 insert + "], previous errs[" + tries + "]")});
        Records records;
        EXPECT_TRUE(retrying.SelectByCommand(insert, records));
        ExpectLines({Info(
            "SelectByCommand",
            "After retry [1] times, success to select command, previous errs [" + tries + "]")});
    }
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "4");
}

// -------------------------------------------------------------------------- failures and retries

TEST_F(SqliteDbSelectTest, AnEmptyStatementIsRefusedEvenOnAClosedObject)
{
    SqliteValueList record(earlier);
    Records records{earlier};
    for (const bool open : {false, true}) {
        if (open) {
            ASSERT_TRUE(retrying.Open());
        }
        retrying.SetDBErr("", 0, "earlier");
        EXPECT_FALSE(retrying.SelectByCommand("", record));
        ExpectErr(retrying, 401);
        ExpectLines({Err("SelectByCommand", "Empty command to select record")});

        retrying.SetDBErr("", 0, "earlier");
        EXPECT_FALSE(retrying.SelectByCommand("", records));
        ExpectErr(retrying, 401);
        ExpectLines({Err("SelectByCommand", "Empty command to select records")});
    }
    EXPECT_EQ(record.ToStr(), "kept:1");
    EXPECT_EQ(ToText(records), "{kept:1}");
    ExpectPauses(0);
}

TEST_F(SqliteDbSelectTest, TheTwoFormsLogDifferentMessages)
{
    const std::string tries =
        R"([{"err_code":404,"err_code_str":"ERR_DATABASE_OPERATION","err_msg":{"command":"BAD",)"
        R"("sqlite_errcode":1,"sqlite_errmsg":"near \"BAD\": syntax error"}}])";
    ASSERT_TRUE(db.Open());
    SqliteValueList record;
    EXPECT_FALSE(db.SelectByCommand("BAD", record));
    ExpectErr(db, 404, tries);
    ExpectLines(
        {Warn("SelectByCommand",
              "Reach retry limit [1], failed to select command with errors[" + tries + "] ")});

    Records records;
    EXPECT_FALSE(db.SelectByCommand("BAD", records));
    ExpectErr(db, 404, tries);
    ExpectLines({Warn("SelectByCommand",
                      "Reach retry limit [1], failed to exec command [BAD] "
                      "with errors [" +
                          tries + "]")});
    ExpectPauses(0);
}

TEST_F(SqliteDbSelectTest, ALimitOfThreeMeansFourAttemptsAndThreePauses)
{
    ASSERT_TRUE(retrying.Open());
    ExpectGivenUp(retrying, noTable, 4);
    ExpectPauses(6);  // three for each form
}

TEST_F(SqliteDbSelectTest, AClosedObjectFailsInEachAttemptAndStaysClosed)
{
    ExpectGivenUp(retrying, {"SELECT 1", SQLITE_MISUSE, sqlite3_errmsg(nullptr)}, 4);
    ExpectPauses(6);
    EXPECT_EQ(Opened(), 0);
}

TEST_F(SqliteDbSelectTest, ATextWithoutAStatementFailsInEachAttempt)
{
    // SQLite prepares nothing and reports no error.
    ASSERT_TRUE(db.Open());
    for (const char* statement : {" ", "\n", ";", "-- nothing", "/* nothing */"}) {
        ExpectGivenUp(db, {statement, SQLITE_MISUSE, "not an error"}, 1);
    }
    ASSERT_TRUE(retrying.Open());
    ExpectGivenUp(retrying, {" ", SQLITE_MISUSE, "not an error"}, 4);
}

TEST_F(SqliteDbSelectTest, AStatementOnAFileThatStaysLockedGivesUp)
{
    Run("CREATE TABLE jobs (id)");
    const LockHolder holder(path);
    ASSERT_TRUE(retrying.Open());
    ExpectGivenUp(retrying, {"SELECT id FROM jobs", SQLITE_BUSY, Locked}, 4);
}

TEST_F(SqliteDbSelectTest, TheOneRowFormLogsASuccessAfterAFailedAttempt)
{
    Run("CREATE TABLE jobs (id); INSERT INTO jobs VALUES (7)");
    LockHolder holder(path);
    pauses.OnPause([&](std::size_t) { holder.Release(); });
    ASSERT_TRUE(retrying.Open());
    SqliteValueList record(earlier);
    EXPECT_TRUE(retrying.SelectByCommand("SELECT id FROM jobs", record));
    ExpectErr(retrying, 0);
    EXPECT_EQ(record.ToStr(), "id:7");
    ExpectLines({Info("SelectByCommand",
                      "After retry [1] times, success to exec command [SELECT id FROM jobs], "
                      "previous errs["
                      R"([{"err_code":404,"err_code_str":"ERR_DATABASE_OPERATION","err_msg":)"
                      R"({"command":"SELECT id FROM jobs","sqlite_errcode":5,)"
                      R"("sqlite_errmsg":"database is locked"}}]])")});
    ExpectPauses(1);
}

TEST_F(SqliteDbSelectTest, TheManyRowsFormLogsASuccessAfterFailedAttempts)
{
    Run("CREATE TABLE jobs (id); INSERT INTO jobs VALUES (7)");
    LockHolder holder(path);
    pauses.OnPause([&](std::size_t number) {
        if (number == 2) holder.Release();
    });
    ASSERT_TRUE(retrying.Open());
    Records records{earlier};
    EXPECT_TRUE(retrying.SelectByCommand("SELECT id FROM jobs", records));
    ExpectErr(retrying, 0);
    EXPECT_EQ(ToText(records), "{kept:1}{id:7}");
    ExpectLines({Info("SelectByCommand",
                      "After retry [2] times, success to select command, previous errs ["
                      R"([{"err_code":404,"err_code_str":"ERR_DATABASE_OPERATION","err_msg":)"
                      R"({"command":"SELECT id FROM jobs","sqlite_errcode":5,)"
                      R"("sqlite_errmsg":"database is locked"}},)"
                      R"({"err_code":404,"err_code_str":"ERR_DATABASE_OPERATION","err_msg":)"
                      R"({"command":"SELECT id FROM jobs","sqlite_errcode":5,)"
                      R"("sqlite_errmsg":"database is locked"}}]])")});
    ExpectPauses(2);
}

TEST_F(SqliteDbSelectTest, RowsOfAFailedAttemptStayAndTheNextOneAppendsAllAgain)
{
    // The contract: the vector belongs to the caller. The third row cannot be computed and is
    // deleted during the second pause.
    const Failure overflow{"SELECT abs(id) AS id FROM jobs", SQLITE_ERROR, "integer overflow"};
    Run("CREATE TABLE jobs (id); INSERT INTO jobs VALUES (1), (2), (-9223372036854775808), (4)");
    pauses.OnPause([&](std::size_t number) {
        if (number == 2) Run("DELETE FROM jobs WHERE id < 0");
    });
    ASSERT_TRUE(retrying.Open());
    Records records;
    EXPECT_TRUE(retrying.SelectByCommand(overflow.command, records));
    ExpectErr(retrying, 0);
    EXPECT_EQ(ToText(records), "{id:1}{id:2}{id:1}{id:2}{id:1}{id:2}{id:4}");
    ExpectLines({Info("SelectByCommand",
                      "After retry [2] times, success to select command, previous errs [" +
                          TriesText(overflow, 2) + "]")});
}

TEST_F(SqliteDbSelectTest, RowsStayWhenAllAttemptsFail)
{
    const Failure overflow{"SELECT abs(id) AS id FROM jobs", SQLITE_ERROR, "integer overflow"};
    Run("CREATE TABLE jobs (id); INSERT INTO jobs VALUES (1), (-9223372036854775808)");
    ASSERT_TRUE(retrying.Open());
    Records records;
    EXPECT_FALSE(retrying.SelectByCommand(overflow.command, records));
    ExpectErr(retrying, 404, TriesText(overflow, 4));
    EXPECT_EQ(ToText(records), "{id:1}{id:1}{id:1}{id:1}");
    ExpectLines({ManyRowsGaveUp(overflow, 4)});
}

TEST_F(SqliteDbSelectTest, AFailedStepLeavesTheOutputUnchanged)
{
    const Failure overflow{"SELECT abs(-9223372036854775808) AS x", SQLITE_ERROR,
                           "integer overflow"};
    ASSERT_TRUE(db.Open());
    ExpectGivenUp(db, overflow, 1);
}

// -------------------------------------------------------------------------------- single attempt

TEST_F(SqliteDbSelectTest, ASuccessfulSingleAttemptClearsTheError)
{
    ASSERT_TRUE(db.Open());
    SqliteValueList record;
    db.SetDBErr("", 0, "earlier");
    EXPECT_TRUE(db.DoSelectSqliteRecord("SELECT 1 AS x UNION SELECT 2", record));
    ExpectErr(db, 0);
    EXPECT_EQ(record.ToStr(), "x:1");

    Records records;
    db.SetDBErr("", 0, "earlier");
    EXPECT_TRUE(db.DoSelectSqliteRecords("SELECT 1 AS x UNION SELECT 2", records));
    ExpectErr(db, 0);
    EXPECT_EQ(ToText(records), "{x:1}{x:2}");
}

TEST_F(SqliteDbSelectTest, ASingleAttemptLogsNothingAndRecordsOneError)
{
    struct Row {
        bool open;
        Failure failure;
        std::string record;
    };
    const Failure closed{"SELECT 1", SQLITE_MISUSE, sqlite3_errmsg(nullptr)};
    const std::vector<Row> rows = {
        {false, closed, ErrorText(closed)},
        {true, noTable, ErrorText(noTable)},
        {true, {"", 0, ""}, R"({"sqlite_errcode":21,"sqlite_errmsg":"not an error"})"},
    };
    for (const Row& row : rows) {
        if (row.open) {
            ASSERT_TRUE(retrying.Open());
        }
        SqliteValueList record(earlier);
        EXPECT_FALSE(retrying.DoSelectSqliteRecord(row.failure.command, record));
        ExpectErr(retrying, 404, row.record);
        EXPECT_EQ(record.ToStr(), "kept:1");

        Records records{earlier};
        retrying.SetDBErr("", 0, "earlier");
        EXPECT_FALSE(retrying.DoSelectSqliteRecords(row.failure.command, records));
        ExpectErr(retrying, 404, row.record);
        EXPECT_EQ(ToText(records), "{kept:1}");
    }
    ExpectPauses(0);
}

TEST_F(SqliteDbSelectTest, TheErrorIsSetUntilAnAttemptSucceeds)
{
    SqliteFaults faults;
    faults.prepare = [&](sqlite3* handle, const char* sql, sqlite3_stmt** statement) {
        ExpectErr(db, 404);
        return RealPrepare(handle, sql, statement);
    };
    faults.step = [&](sqlite3_stmt* statement) {
        ExpectErr(db, 404);
        return RealStep(statement);
    };
    ExpectRow("SELECT 1 AS x", "x:1");
}

TEST_F(SqliteDbSelectTest, NoStatementIsLeftRunning)
{
    sqlite3* connection = nullptr;
    SqliteFaults faults;
    faults.busyTimeout = [&](sqlite3* handle, int) {
        connection = handle;
        return SQLITE_OK;
    };
    ASSERT_TRUE(db.Open());
    SqliteValueList record;
    Records records;
    const auto countLeft = [&] {
        int left = 0;
        sqlite3_stmt* statement = nullptr;
        while ((statement = sqlite3_next_stmt(connection, statement)) != nullptr) {
            EXPECT_EQ(sqlite3_stmt_busy(statement), 0);
            ++left;
        }
        return left;
    };
    const auto expectLeft = [&](const std::string& statement, int left) {
        SCOPED_TRACE(statement);
        db.DoSelectSqliteRecord(statement, record);
        EXPECT_EQ(countLeft(), left);
        db.DoSelectSqliteRecords(statement, records);
        EXPECT_EQ(countLeft(), left);
    };
    expectLeft("SELECT abs(-9223372036854775808) AS x", 0);  // fails
    expectLeft("SELECT 1 AS x UNION SELECT 2", 1);           // one row is not read
    expectLeft("SELECT 1 AS x WHERE 0", 2);
    expectLeft("SELECT abs(-9223372036854775808) AS x", 2);

    // A failed preparation that gives a statement all the same.
    faults.prepare = [](sqlite3* handle, const char* sql, sqlite3_stmt** statement) {
        EXPECT_EQ(RealPrepare(handle, sql, statement), SQLITE_OK);
        return SQLITE_NOMEM;
    };
    expectLeft("SELECT 1 AS x", 2);
    EXPECT_EQ(db.GetErr()["sqlite_errcode"], SQLITE_NOMEM);
    EXPECT_EQ(ToText(records), "{x:1}{x:2}");
}

}  // namespace
