// SqliteDB's InsertRecords: all rows or none.
#include <orvadrcore/sqlite_db.h>

#include <filesystem>
#include <fstream>
#include <map>

#include "support/fixtures/sqlite_fixture.h"

namespace {

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;

using Records = std::vector<SqliteValueList>;

SqliteValueList Job(int id, const std::string& name)
{
    SqliteValueList record;
    record.AddValue("id", id);
    record.AddValue("name", name);
    return record;
}

SqliteValueList Only(const std::string& field, const SqliteValue& value)
{
    SqliteValueList record;
    record.AddValue(field, value);
    return record;
}

class SqliteDbInsertTest : public SqliteFixture {
  protected:
    LogLine GaveUp(std::size_t records) const
    {
        return Err("InsertRecords", "Failed to insert [" + std::to_string(records) +
                                        "] records in db[" + path + "]");
    }

    void MakeTable(const std::string& schema = "id INTEGER PRIMARY KEY, name TEXT") const
    {
        Run("CREATE TABLE jobs (" + schema + ")");
    }

    const SqliteTableHandler jobs{"jobs", "id INTEGER PRIMARY KEY, name TEXT"};
    const std::string insert = "INSERT INTO jobs (id,name) VALUES (?,?);";
    const Failure begin{"BEGIN IMMEDIATE", SQLITE_BUSY, Locked};
    const Failure duplicate{insert, SQLITE_CONSTRAINT, "UNIQUE constraint failed: jobs.id"};
};

// ------------------------------------------------------------------------------- what is stored

TEST_F(SqliteDbInsertTest, AMissingFileAndTableAreCreatedAndRowsKeepTheirOrder)
{
    db.SetDBErr("", 0, "earlier");
    EXPECT_TRUE(db.InsertRecords(jobs, {Job(3, "c"), Job(1, "a"), Job(2, "b")}));
    ExpectErr(db, 0);
    EXPECT_EQ(Run("SELECT sql FROM sqlite_master"),
              "CREATE TABLE jobs (id INTEGER PRIMARY KEY, name TEXT)");
    EXPECT_EQ(Run("SELECT * FROM jobs"), "1,a;2,b;3,c");
    EXPECT_EQ(Opened(), 1);

    const SqliteTableHandler notes("notes", "id, name");
    EXPECT_TRUE(db.InsertRecords(notes, {Job(3, "c"), Job(1, "a"), Job(3, "c")}));
    EXPECT_EQ(Run("SELECT rowid, * FROM notes"), "1,3,c;2,1,a;3,3,c");
    EXPECT_EQ(Opened(), 1);
    EXPECT_EQ(Closed(), 0);
}

TEST_F(SqliteDbInsertTest, InsertingNoRecordsSucceedsWithoutOpeningTheFile)
{
    db.SetDBErr("", 0, "earlier");
    EXPECT_TRUE(db.InsertRecords(jobs, {}));
    ExpectErr(db, 0);
    EXPECT_TRUE(db.InsertRecords(SqliteTableHandler(), {}));
    EXPECT_EQ(Opened(), 0);
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(SqliteDbInsertTest, NumbersAndBooleansAreStoredAsTheirLiteralsWouldBe)
{
    const SqliteValueList values = [] {
        SqliteValueList record;
        record.AddValue("low", -2147483647 - 1);
        record.AddValue("high", 2147483647);
        record.AddValue("most", 4294967295U);
        record.AddValue("none", 0U);
        record.AddValue("yes", true);
        record.AddValue("no", false);
        record.AddValue("text", "12");
        record.AddValue("blank", "");
        return record;
    }();
    const std::string rows =
        "SELECT low, high, most, none, yes, no, text, blank, typeof(low), typeof(most), "
        "typeof(yes),"
        " typeof(text), typeof(blank) FROM ";
    // Column types: none, two that turn texts into numbers, and one for texts.
    for (const std::string type : {"", " INTEGER", " TEXT", " REAL"}) {
        SCOPED_TRACE(type);
        std::string schema;
        for (const auto& [field, value] : values.GetValues()) {
            schema.append(schema.empty() ? "" : ",").append(field).append(type);
        }
        std::filesystem::remove(path);
        SqliteDB fresh(path, 0);
        InsertCommand one;
        one.SetTable({"one", schema});
        one.SetFieldValues(values);
        EXPECT_TRUE(fresh.InsertRecord(one));
        EXPECT_TRUE(fresh.InsertRecords({"many", schema}, {values}));
        EXPECT_EQ(Run(rows + "many"), Run(rows + "one"));
    }
    EXPECT_EQ(Run("SELECT low, high, most, none, yes, no, text FROM many"),
              "-2147483648.0,2147483647.0,4294967295.0,0.0,1.0,0.0,12.0");
}

TEST_F(SqliteDbInsertTest, TextsAreStoredByteForByte)
{
    const std::string injection = "'); DROP TABLE jobs; --";
    EXPECT_TRUE(
        db.InsertRecords(jobs, {Job(1, "O'Brien's NAS"), Job(2, injection), Job(3, "?"),
                                Job(4, std::string("a\0b", 3)), Job(5, "\xff"), Job(6, "''")}));
    EXPECT_EQ(Run("SELECT name FROM jobs WHERE id IN (1,2,3,6)"),
              "O'Brien's NAS;" + injection + ";?;''");
    EXPECT_EQ(Run("SELECT hex(name) FROM jobs WHERE id IN (4,5)"), "610062;FF");
}

TEST_F(SqliteDbInsertTest, EachSetOfFieldsIsPreparedOnce)
{
    MakeTable("id INTEGER DEFAULT 7, name TEXT DEFAULT 'none'");
    std::map<std::string, int> prepared;
    Records records;
    for (int round = 1; round <= 3; ++round) {
        records.push_back(Job(round, "a"));
        records.push_back(Only("name", "b"));
        records.push_back(Only("name", "c"));
        records.push_back(Only("id", round));
    }
    {
        SqliteFaults faults;
        faults.prepare = [&](sqlite3* handle, const char* sql, sqlite3_stmt** statement) {
            const bool isSchemaRead = std::string(sql).rfind("SELECT", 0) == 0;  // by SQLite itself
            if (!isSchemaRead) ++prepared[sql];
            return RealPrepare(handle, sql, statement);
        };
        EXPECT_TRUE(db.InsertRecords({"jobs", ""}, records));
    }
    EXPECT_EQ(Run("SELECT * FROM jobs"),
              "1,a;7,b;7,c;1,none;2,a;7,b;7,c;2,none;3,a;7,b;7,c;3,none");
    const std::map<std::string, int> once = {{"BEGIN IMMEDIATE", 1},
                                             {insert, 1},
                                             {"INSERT INTO jobs (name) VALUES (?);", 1},
                                             {"INSERT INTO jobs (id) VALUES (?);", 1},
                                             {"COMMIT", 1}};
    EXPECT_EQ(prepared, once);
}

TEST_F(SqliteDbInsertTest, ExistingRowsAreReplacedWhenAllowed)
{
    EXPECT_TRUE(db.InsertRecords(jobs, {Job(1, "a"), Job(2, "b")}));
    EXPECT_TRUE(db.InsertRecords(jobs, {Job(2, "c"), Job(3, "d"), Job(3, "e")}, true));
    ExpectErr(db, 0);
    EXPECT_EQ(Run("SELECT * FROM jobs"), "1,a;2,c;3,e");
}

// -------------------------------------------------------------------------------- what is refused

TEST_F(SqliteDbInsertTest, ATableWithoutANameOrARecordWithoutFieldsIsRefusedBeforeOpening)
{
    // Only a caller who casts const away can put an invalid value into a record.
    Records broken = {Job(1, "a")};
    // NOLINTNEXTLINE(cppcoreguidelines-pro-type-const-cast)
    const_cast<SqliteValue&>(broken.front().GetValue("name")) = SqliteValue();
    struct Row {
        SqliteTableHandler table;
        Records records;
    };
    const std::vector<Row> rows = {
        {{"", "id"}, {Job(1, "a")}},
        {jobs, {SqliteValueList()}},
        {jobs, {Job(1, "a"), SqliteValueList(), Job(2, "b")}},
        {jobs, broken},
    };
    for (const Row& row : rows) {
        retrying.SetDBErr("", 0, "earlier");
        EXPECT_FALSE(retrying.InsertRecords(row.table, row.records));
        ExpectErr(retrying, 401);
        ExpectLines(
            {Err("InsertRecords", "invalid insert records: table[" + row.table.GetName() + "]")});
    }
    EXPECT_EQ(Opened(), 0);
    EXPECT_FALSE(std::filesystem::exists(path));
    ExpectPauses(0);
}

TEST_F(SqliteDbInsertTest, AFileThatCannotBeOpenedIsLoggedByBothLayers)
{
    SqliteDB refused(dir.Path(), 3);
    refused.SetDBErr("", 0, "earlier");
    EXPECT_FALSE(refused.InsertRecords(jobs, {Job(1, "a")}));
    ExpectErr(refused, 404);
    ExpectLines({Warn("Open", "Failed to open db[" + dir.Path() + "]"),
                 Err("InsertRecords", "Failed to open db [" + dir.Path() + "]")});
    ExpectPauses(0);
}

TEST_F(SqliteDbInsertTest, ATableThatCannotBeCreatedIsLoggedByAllLayers)
{
    std::ofstream(path) << "text, and nothing that SQLite wrote\n";
    const std::string create =
        "CREATE TABLE IF NOT EXISTS jobs (id INTEGER PRIMARY KEY, name TEXT)";
    const Failure look{"SELECT 1 FROM sqlite_master WHERE type='table' AND name='jobs';",
                       SQLITE_NOTADB, NoDatabase};
    const Failure made{create, SQLITE_NOTADB, NoDatabase};
    EXPECT_FALSE(db.InsertRecords(jobs, {Job(1, "a")}));
    ExpectErr(db, 404, TriesText(made));
    ExpectLines({ManyRowsGaveUp(look, 1), ExecGaveUp(made, 1),
                 Err("CreateTable", "Failed to create table [jobs] with cmd[" + create + "]"),
                 Err("InsertRecords", "Failed to create table")});
}

// ---------------------------------------------------------------------------------- all or nothing

TEST_F(SqliteDbInsertTest, OneRefusedRowRollsBackAllAndEverythingIsRetried)
{
    MakeTable();
    Run("INSERT INTO jobs VALUES (2,'old')");
    EXPECT_FALSE(retrying.InsertRecords(jobs, {Job(1, "a"), Job(2, "b"), Job(3, "c")}));
    ExpectErr(retrying, 404, TriesText(duplicate, 4));
    ExpectLines({GaveUp(3)});
    ExpectPauses(3);
    EXPECT_EQ(Run("SELECT * FROM jobs"), "2,old");

    // The connection still works and holds no lock.
    Run("DELETE FROM jobs");
    EXPECT_TRUE(retrying.InsertRecords(jobs, {Job(2, "b")}));
    ExpectErr(retrying, 0);
}

TEST_F(SqliteDbInsertTest, ReplacedRowsAreRestoredWhenALaterRowIsRefused)
{
    MakeTable("id INTEGER PRIMARY KEY, name TEXT NOT NULL");
    Run("INSERT INTO jobs VALUES (1,'old')");
    const Failure noName{"INSERT OR REPLACE INTO jobs (id) VALUES (?);", SQLITE_CONSTRAINT,
                         "NOT NULL constraint failed: jobs.name"};
    EXPECT_FALSE(db.InsertRecords(jobs, {Job(1, "new"), Only("id", 2)}, true));
    ExpectErr(db, 404, TriesText(noName));
    ExpectLines({GaveUp(2)});
    EXPECT_EQ(Run("SELECT * FROM jobs"), "1,old");
}

TEST_F(SqliteDbInsertTest, ARefusedStatementIsRecordedWithItsPlaceholders)
{
    MakeTable();
    const Failure noColumn{"INSERT INTO jobs (size) VALUES (?);", SQLITE_ERROR,
                           "table jobs has no column named size"};
    const Failure noTable{insert, SQLITE_ERROR, "no such table: jobs"};
    EXPECT_FALSE(db.InsertRecords(jobs, {Job(1, "a"), Only("size", 3)}));
    ExpectErr(db, 404, TriesText(noColumn));
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "0");
    Run("DROP TABLE jobs");
    EXPECT_FALSE(db.InsertRecords({"jobs", ""}, {Job(1, "a")}));
    ExpectErr(db, 404, TriesText(noTable));
    ExpectLines({GaveUp(2), GaveUp(1)});
}

TEST_F(SqliteDbInsertTest, AFieldNameIsWrittenAsItIsButCannotAddAStatement)
{
    MakeTable();
    const std::string field = "id) VALUES (1); --";
    const Failure noPlace{"INSERT INTO jobs (" + field + ") VALUES (?);", SQLITE_RANGE,
                          "column index out of range"};
    EXPECT_FALSE(db.InsertRecords(jobs, {Only(field, 3)}));
    ExpectErr(db, 404, TriesText(noPlace));
    ExpectLines({GaveUp(1)});
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "0");
}

TEST_F(SqliteDbInsertTest, NoPreparedInsertOutlivesTheCall)
{
    MakeTable();
    sqlite3* handle = nullptr;
    SqliteFaults faults;
    faults.prepare = [&](sqlite3* connection, const char* sql, sqlite3_stmt** statement) {
        handle = connection;
        return RealPrepare(connection, sql, statement);
    };
    const auto expectNoneLeft = [&] {
        sqlite3_stmt* left = nullptr;
        while ((left = sqlite3_next_stmt(handle, left)) != nullptr) {
            EXPECT_TRUE(IsStatement(left, LookFor("jobs")) || IsStatement(left, SchemaCheck))
                << sqlite3_sql(left);
        }
    };
    EXPECT_TRUE(db.InsertRecords(jobs, {Job(1, "a"), Only("id", 2)}));
    expectNoneLeft();
    EXPECT_FALSE(db.InsertRecords(jobs, {Only("id", 3), Job(1, "a")}));
    expectNoneLeft();
    EXPECT_FALSE(db.InsertRecords(jobs, {Only("id", 3), Only("size", 1)}));
    expectNoneLeft();
    ExpectLines({GaveUp(2), GaveUp(2)});
}

// ---------------------------------------------------------------------------------------- locks

TEST_F(SqliteDbInsertTest, AnotherWriterIsWaitedForBeforeTheFirstRow)
{
    MakeTable();
    LockHolder holder(path, "BEGIN IMMEDIATE");
    EXPECT_FALSE(retrying.InsertRecords(jobs, {Job(1, "a")}));
    ExpectErr(retrying, 404, TriesText(begin, 4));
    ExpectLines({GaveUp(1)});
    ExpectPauses(3);
    holder.Release();
    EXPECT_TRUE(retrying.InsertRecords(jobs, {Job(1, "a")}));
}

TEST_F(SqliteDbInsertTest, AnotherWriterMayFinishBetweenTwoAttempts)
{
    MakeTable();
    LockHolder holder(path, "BEGIN IMMEDIATE");
    pauses.OnPause([&](std::size_t number) {
        if (number == 3) holder.Release();
    });
    EXPECT_TRUE(retrying.InsertRecords(jobs, {Job(1, "a"), Job(2, "b")}));
    ExpectErr(retrying, 0);
    ExpectPauses(3);
    EXPECT_EQ(Run("SELECT * FROM jobs"), "1,a;2,b");
}

TEST_F(SqliteDbInsertTest, ACommitThatReadersBlockIsRetriedAsAWhole)
{
    const SqliteTableHandler notes("notes", "id INTEGER, name TEXT");  // allows duplicate rows
    Run("CREATE TABLE notes (id INTEGER, name TEXT)");
    LockHolder holder(path, "BEGIN; SELECT * FROM notes");
    pauses.OnPause([&](std::size_t number) {
        if (number == 2) holder.Release();
    });
    EXPECT_TRUE(retrying.InsertRecords(notes, {Job(1, "a"), Job(2, "b")}));
    ExpectPauses(2);
    EXPECT_EQ(Run("SELECT * FROM notes"), "1,a;2,b");

    LockHolder staying(path, "BEGIN; SELECT * FROM notes");
    EXPECT_FALSE(db.InsertRecords(notes, {Job(3, "c")}));
    ExpectErr(db, 404, TriesText({"COMMIT", SQLITE_BUSY, Locked}));
    ExpectLines({GaveUp(1)});
    EXPECT_EQ(Run("SELECT count(*) FROM notes"), "2");
    staying.Release();
}

// ------------------------------------------------------------------------------- open transactions

TEST_F(SqliteDbInsertTest, InsideATransactionTheRowsAreCommittedOrRolledBackWithIt)
{
    MakeTable();
    ASSERT_TRUE(db.Open() && db.Exec("BEGIN"));
    EXPECT_TRUE(db.InsertRecords(jobs, {Job(1, "a"), Job(2, "b")}));
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "0");
    EXPECT_TRUE(db.Exec("ROLLBACK"));
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "0");

    ASSERT_TRUE(db.Exec("BEGIN"));
    EXPECT_TRUE(db.InsertRecords(jobs, {Job(1, "a")}));
    EXPECT_TRUE(db.InsertRecords(jobs, {Job(2, "b")}));
    EXPECT_TRUE(db.Exec("COMMIT"));
    EXPECT_EQ(Run("SELECT * FROM jobs"), "1,a;2,b");
}

TEST_F(SqliteDbInsertTest, InsideATransactionAFailureRollsBackItsOwnRowsOnly)
{
    MakeTable();
    ASSERT_TRUE(retrying.Open() && retrying.Exec("BEGIN") &&
                retrying.Exec("INSERT INTO jobs VALUES (1,'before')"));
    EXPECT_FALSE(retrying.InsertRecords(jobs, {Job(2, "a"), Job(1, "b")}));
    ExpectErr(retrying, 404, TriesText(duplicate, 4));
    ExpectLines({GaveUp(2)});
    ExpectPauses(3);
    EXPECT_TRUE(retrying.Exec("INSERT INTO jobs VALUES (3,'after')"));
    EXPECT_TRUE(retrying.Exec("COMMIT"));
    EXPECT_EQ(Run("SELECT * FROM jobs"), "1,before;3,after");
}

TEST_F(SqliteDbInsertTest, NoRowIsStoredAfterSqliteRolledBackByItself)
{
    MakeTable("id INTEGER PRIMARY KEY ON CONFLICT ROLLBACK, name TEXT");
    Run("INSERT INTO jobs VALUES (1,'old')");
    EXPECT_FALSE(retrying.InsertRecords(jobs, {Job(2, "a"), Job(1, "b"), Job(3, "c")}));
    ExpectErr(retrying, 404, TriesText(duplicate, 4));
    ExpectLines({GaveUp(3)});
    EXPECT_EQ(Run("SELECT * FROM jobs"), "1,old");
}

TEST_F(SqliteDbInsertTest, NoRowIsStoredAfterSqliteRolledBackTheCallersTransaction)
{
    MakeTable("id INTEGER PRIMARY KEY ON CONFLICT ROLLBACK, name TEXT");
    ASSERT_TRUE(retrying.Open() && retrying.Exec("BEGIN") &&
                retrying.Exec("INSERT INTO jobs VALUES (1,'before')"));
    // After the first attempt the transaction and its row 1 are gone, so all of these would fit.
    EXPECT_FALSE(retrying.InsertRecords(jobs, {Job(2, "a"), Job(1, "b"), Job(3, "c")}));
    const Failure lost{"SAVEPOINT orvadr_insert", SQLITE_ABORT, "the transaction was rolled back"};
    ExpectErr(retrying, 404, TriesText({duplicate, lost, lost, lost}));
    ExpectLines({GaveUp(3)});
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "0");
    EXPECT_TRUE(retrying.Exec("BEGIN"));  // none is open
}

TEST_F(SqliteDbInsertTest, AFailedRollbackClosesTheConnection)
{
    MakeTable();
    Run("INSERT INTO jobs VALUES (1,'old')");
    for (const std::string begun : {"", "BEGIN"}) {
        SCOPED_TRACE(begun);
        ASSERT_TRUE(db.Open() && (begun.empty() || db.Exec(begun)));
        const int closedBefore = Closed();
        {
            SqliteFaults faults;
            faults.prepare = [](sqlite3* handle, const char* sql, sqlite3_stmt** statement) {
                if (std::string(sql).rfind("ROLLBACK", 0) == 0) return SQLITE_NOMEM;
                return RealPrepare(handle, sql, statement);
            };
            EXPECT_FALSE(db.InsertRecords({"jobs", ""}, {Job(2, "a"), Job(1, "b")}));
        }
        ExpectErr(db, 404, TriesText(duplicate));
        ExpectLines({GaveUp(2)});
        EXPECT_EQ(Closed(), closedBefore + 1);
        EXPECT_EQ(Run("SELECT * FROM jobs"), "1,old");
    }
    EXPECT_TRUE(db.InsertRecords(jobs, {Job(2, "a")}));
}

// ----------------------------------------------------------------------------------- two processes

TEST(SqliteDbInsertProcessesTest, OfTwoProcessesInsertingTheSameRowsOneStoresAllAndTheOtherNone)
{
    constexpr int Rounds = 20;
    constexpr int RowsEach = 50;
    const TempDir dir;
    const std::string path = dir.File("test.db");
    const SqliteTableHandler jobs("jobs", "id INTEGER PRIMARY KEY, name TEXT");
    PlainDb(path).Run("CREATE TABLE jobs (id INTEGER PRIMARY KEY, name TEXT)");
    const auto insertAs = [&](const std::string& name) {
        return [&jobs, &path, name](ChildProcess::Link& link) {
            link.Await();
            SqliteDB db(path, 0);
            // Without waits for the disk the two contend for the lock more often.
            if (!db.Open() || !db.Exec("PRAGMA synchronous = OFF")) throw std::runtime_error(path);
            for (int round = 0; round < Rounds; ++round) {
                // The first row of each round is unique, so a failure must roll it back.
                Records records = {Job(-1 - round * 2 - (name == "one" ? 0 : 1), name)};
                for (int row = 0; row < RowsEach; ++row) {
                    records.push_back(Job(round * RowsEach + row, name));
                }
                bool isLocked = true;
                while (isLocked) {
                    isLocked = !db.InsertRecords(jobs, records) &&
                               db.GetErr()[0]["err_msg"]["sqlite_errcode"].asInt() == SQLITE_BUSY;
                }
            }
        };
    };
    ChildProcess one(insertAs("one"));
    ChildProcess two(insertAs("two"));
    one.Tell();
    two.Tell();
    EXPECT_EQ(one.Join(), 0);
    EXPECT_EQ(two.Join(), 0);
    PlainDb db(path);
    EXPECT_EQ(db.Run("SELECT count(*) FROM jobs"), std::to_string(Rounds * (RowsEach + 1)));
    EXPECT_EQ(db.Run("SELECT count(*) FROM (SELECT id/50 AS round FROM jobs WHERE id>=0"
                     " GROUP BY round HAVING count(DISTINCT name)<>1)"),
              "0");
}

}  // namespace
