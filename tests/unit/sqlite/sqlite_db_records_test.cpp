// SqliteDB's table and record operations.
#include <orvadrcore/sqlite_db.h>

#include <filesystem>
#include <fstream>
#include <functional>

#include "support/fixtures/sqlite_fixture.h"

namespace {

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;

using Records = std::vector<SqliteValueList>;

template <class Command = InsertCommand>
Command Insert(const SqliteTableHandler& table, int id, const std::string& name)
{
    Command command;
    command.SetTable(table);
    command.AddFieldValue("id", id);
    command.AddFieldValue("name", name);
    return command;
}

template <class Command = UpdateCommand>
Command Update(const SqliteTableHandler& table, int id, const std::string& name)
{
    Command command;
    command.SetTable(table);
    command.AddFieldValue("name", name);
    command.SetCondition(SqliteEqual("id", id));
    return command;
}

SelectCommand SelectAll(const SqliteTableHandler& table)
{
    SelectCommand command;
    command.SetTable(table);
    command.SelectAll();
    return command;
}

// A command whose text says how often GetCommand() was called.
template <class Command>
class Counting : public Command {
  public:
    std::string GetCommand() const override
    {
        return Command::GetCommand() + " -- " + std::to_string(++asked);
    }

    mutable int asked = 0;
};

// A command that claims to be valid but has no text.
template <class Command>
class Hollow : public Command {
  public:
    bool IsValid() const override { return true; }
    std::string GetCommand() const override { return {}; }
};

// A record operation, for tests of what all of them have in common.
struct Operation {
    std::string function;   // in the log lines
    std::string statement;  // on the table jobs
    std::function<bool(SqliteDB&, const SqliteTableHandler&)> run;
    LogLine (*gaveUp)(const Failure&, std::size_t);
    bool namesTable;  // in the line about a table that cannot be created

    LogLine Failed(const std::string& path) const
    {
        return Err(function, gaveUp == ExecGaveUp
                                 ? "Failed to exec [" + statement + "] in db[" + path + "]"
                                 : "Failed to select by command [" + statement + "]");
    }

    LogLine NoTable() const
    {
        return Err(function,
                   namesTable ? "Failed to create table [jobs]" : "Failed to create table");
    }
};

std::vector<Operation> Operations()
{
    using Table = const SqliteTableHandler&;
    return {
        {"InsertRecord", "INSERT INTO jobs (id,name) VALUES (1,'a');",
         [](SqliteDB& db, Table table) { return db.InsertRecord(Insert(table, 1, "a")); },
         ExecGaveUp, false},
        {"UpdateRecord", "UPDATE jobs SET name='b' WHERE id=1",
         [](SqliteDB& db, Table table) { return db.UpdateRecord(Update(table, 1, "b")); },
         ExecGaveUp, false},
        {"SelectRecords", "SELECT  * FROM jobs",
         [](SqliteDB& db, Table table) {
             Records records;
             return db.SelectRecords(SelectAll(table), records);
         },
         ManyRowsGaveUp, false},
        {"SelectRecord", "SELECT  * FROM jobs",
         [](SqliteDB& db, Table table) {
             SqliteValueList record;
             return db.SelectRecord(SelectAll(table), record);
         },
         OneRowGaveUp, false},
        {"DoDelete", "DELETE FROM jobs WHERE id = 1;",
         [](SqliteDB& db, Table table) { return db.DeleteRecord("id = 1", table); }, ExecGaveUp,
         true},
        {"DoDelete", "DELETE FROM jobs;",
         [](SqliteDB& db, Table table) { return db.DeleteAllRecords(table); }, ExecGaveUp, true},
        {"DoDelete", "DELETE FROM jobs;",
         [](SqliteDB& db, Table table) { return db.DoDelete(table, ""); }, ExecGaveUp, true},
    };
}

class SqliteDbRecordsTest : public SqliteFixture {
  protected:
    const SqliteTableHandler jobs{"jobs", "id INTEGER PRIMARY KEY, name TEXT"};
    const SqliteTableHandler jobsWithoutSchema{"jobs", ""};
    const std::string create =
        "CREATE TABLE IF NOT EXISTS jobs (id INTEGER PRIMARY KEY, name TEXT)";
};

// --------------------------------------------------------------------------------- all operations

TEST_F(SqliteDbRecordsTest, AMissingFileAndTableAreCreated)
{
    for (const Operation& operation : Operations()) {
        SCOPED_TRACE(operation.statement);
        std::filesystem::remove(path);
        SqliteDB fresh(path, 3);
        fresh.SetDBErr("", 0, "earlier");
        EXPECT_TRUE(operation.run(fresh, jobs));
        ExpectErr(fresh, 0);
        EXPECT_EQ(Run("SELECT sql FROM sqlite_master"),
                  "CREATE TABLE jobs (id INTEGER PRIMARY KEY, name TEXT)");
    }
    ExpectPauses(0);
}

TEST_F(SqliteDbRecordsTest, TheConnectionIsOpenedOnFirstUseAndStaysOpen)
{
    for (const Operation& operation : Operations()) EXPECT_TRUE(operation.run(db, jobs));
    EXPECT_TRUE(db.Exec("SELECT 1"));
    EXPECT_EQ(Opened(), 1);
    EXPECT_EQ(Closed(), 0);
}

TEST_F(SqliteDbRecordsTest, AFileThatCannotBeOpenedIsLoggedByBothLayers)
{
    for (const Operation& operation : Operations()) {
        SCOPED_TRACE(operation.statement);
        SqliteDB refused(dir.Path(), 3);
        refused.SetDBErr("", 0, "earlier");
        EXPECT_FALSE(operation.run(refused, jobs));
        ExpectErr(refused, 404);
        ExpectLines({Warn("Open", "Failed to open db[" + dir.Path() + "]"),
                     Err(operation.function, "Failed to open db [" + dir.Path() + "]")});
    }
    ExpectPauses(0);
}

TEST_F(SqliteDbRecordsTest, ABusyTimeoutThatCannotBeSetFailsTheFirstOperationOnly)
{
    SqliteFaults faults;
    faults.busyTimeout = [](sqlite3*, int) { return SQLITE_MISUSE; };
    for (const Operation& operation : Operations()) {
        SCOPED_TRACE(operation.statement);
        SqliteDB fresh(path, 3);
        EXPECT_FALSE(operation.run(fresh, jobs));
        ExpectErr(fresh, 404);
        ExpectLines({Warn("Open", "Failed to set busy timeout with error"),
                     Err(operation.function, "Failed to open db [" + path + "]")});
        EXPECT_TRUE(operation.run(fresh, jobs));  // the contract: the connection is open
        ExpectErr(fresh, 0);
        Run("DELETE FROM jobs");
    }
}

TEST_F(SqliteDbRecordsTest, ATableThatCannotBeCreatedIsLoggedByAllLayers)
{
    std::ofstream(path) << "text, and nothing that SQLite wrote\n";
    const Failure look{LookFor("jobs"), SQLITE_NOTADB, NoDatabase};
    const Failure made{create, SQLITE_NOTADB, NoDatabase};
    for (const Operation& operation : Operations()) {
        SCOPED_TRACE(operation.statement);
        EXPECT_FALSE(operation.run(db, jobs));
        ExpectErr(db, 404, TriesText(made));
        ExpectLines({ManyRowsGaveUp(look, 1), ExecGaveUp(made, 1),
                     Err("CreateTable", "Failed to create table [jobs] with cmd[" + create + "]"),
                     operation.NoTable()});
    }
}

TEST_F(SqliteDbRecordsTest, AFailedStatementIsLoggedByAllLayers)
{
    for (const Operation& operation : Operations()) {
        SCOPED_TRACE(operation.statement);
        const Failure noTable{operation.statement, SQLITE_ERROR, "no such table: jobs"};
        EXPECT_FALSE(operation.run(retrying, jobsWithoutSchema));
        ExpectErr(retrying, 404, TriesText(noTable, 4));
        ExpectLines({operation.gaveUp(noTable, 4), operation.Failed(path)});
    }
    EXPECT_EQ(Run("SELECT count(*) FROM sqlite_master"), "0");
    ExpectPauses(3 * Operations().size());
}

TEST_F(SqliteDbRecordsTest, EachOperationLooksTheTableUpOnceAndNeverWithoutASchema)
{
    Run("CREATE TABLE jobs (id, name)");
    std::size_t looks = 0;
    SqliteFaults faults;
    faults.step = [&](sqlite3_stmt* statement) {
        if (IsStatement(statement, SchemaCheck)) ++looks;
        return RealStep(statement);
    };
    for (const Operation& operation : Operations()) {
        SCOPED_TRACE(operation.statement);
        EXPECT_TRUE(operation.run(db, jobsWithoutSchema));
        ExpectErr(db, 0);
    }
    EXPECT_EQ(looks, 0U);
    for (const Operation& operation : Operations()) EXPECT_TRUE(operation.run(db, jobs));
    EXPECT_EQ(looks, Operations().size());
}

TEST_F(SqliteDbRecordsTest, OnALockedFileLookupAndCreationEachUseAllAttempts)
{
    const LockHolder holder(path);
    const Failure look{LookFor("jobs"), SQLITE_BUSY, Locked};
    const Failure made{create, SQLITE_BUSY, Locked};
    std::size_t pausesBefore = 0;
    for (const Operation& operation : Operations()) {
        SCOPED_TRACE(operation.statement);
        EXPECT_FALSE(operation.run(retrying, jobs));
        ExpectErr(retrying, 404, TriesText(made, 4));
        ExpectLines({ManyRowsGaveUp(look, 4), ExecGaveUp(made, 4),
                     Err("CreateTable", "Failed to create table [jobs] with cmd[" + create + "]"),
                     operation.NoTable()});
        ExpectPauses(pausesBefore += 6);
    }
}

TEST_F(SqliteDbRecordsTest, AFileUnlockedDuringTheCreationIsUsedAlthoughTheLookupFailed)
{
    LockHolder holder(path);
    pauses.OnPause([&](std::size_t number) {
        if (number == 6) holder.Release();
    });
    EXPECT_TRUE(retrying.InsertRecord(Insert(jobs, 1, "a")));
    ExpectErr(retrying, 0);
    ExpectLines({ManyRowsGaveUp({LookFor("jobs"), SQLITE_BUSY, Locked}, 4),
                 Info("Exec", "After retry [3] times, success to exec command [" + create +
                                  "], previous errors[" +
                                  TriesText({create, SQLITE_BUSY, Locked}, 3) + "]")});
    ExpectPauses(6);
    EXPECT_EQ(Run("SELECT * FROM jobs"), "1,a");
}

TEST_F(SqliteDbRecordsTest, WhenTheLookupSucceedsOnlyTheStatementIsRetried)
{
    Run("CREATE TABLE jobs (id INTEGER PRIMARY KEY, name TEXT)");
    LockHolder holder(path, "BEGIN IMMEDIATE");
    const Failure busy{"INSERT INTO jobs (id,name) VALUES (1,'a');", SQLITE_BUSY, Locked};
    EXPECT_FALSE(retrying.InsertRecord(Insert(jobs, 1, "a")));
    ExpectErr(retrying, 404, TriesText(busy, 4));
    ExpectLines({ExecGaveUp(busy, 4),
                 Err("InsertRecord", "Failed to exec [" + busy.command + "] in db[" + path + "]")});
    ExpectPauses(3);
    holder.Release();
    EXPECT_TRUE(retrying.InsertRecord(Insert(jobs, 1, "a")));
}

// -------------------------------------------------------------------------------- invalid commands

TEST_F(SqliteDbRecordsTest, AnInvalidCommandIsRefusedBeforeTheFileIsOpened)
{
    struct Row {
        std::function<bool()> run;
        int code;
        LogLine line;
    };
    InsertCommand insert;
    UpdateCommand update;
    SelectCommand select;
    insert.SetTable(jobs);
    update.SetTable(jobs);
    update.AddFieldValue("name", "a");
    SqliteValueList record;
    Records records;
    const std::vector<Row> rows = {
        // By contract only the insert gives 404.
        {[&] { return retrying.InsertRecord(insert); }, 404,
         Err("InsertRecord", "invalid insert command [jobs]values:[]]")},
        {[&] { return retrying.UpdateRecord(update); }, 401,
         Err("UpdateRecord", "invalid update command [jobs]condition:[]/values:[name='a']]")},
        {[&] { return retrying.SelectRecords(select, records); }, 401,
         Err("SelectRecords", "invalid select command []condition:[]/fields:[]]")},
        {[&] { return retrying.SelectRecord(select, record); }, 401,
         Err("SelectRecord", "invalid select command []condition:[]/fields:[]]")},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.line.function);
        retrying.SetDBErr("", 0, "earlier");
        EXPECT_FALSE(row.run());
        ExpectErr(retrying, row.code);
        ExpectLines({row.line});
    }
    EXPECT_EQ(Opened(), 0);
    EXPECT_FALSE(std::filesystem::exists(path));
    ExpectPauses(0);
}

TEST_F(SqliteDbRecordsTest, ACommandWithoutATextIsRefusedByExecAndSelect)
{
    struct Row {
        std::function<bool()> run;
        LogLine refused;
        LogLine failed;
    };
    const Hollow<InsertCommand> insert;
    const Hollow<UpdateCommand> update;
    const Hollow<SelectCommand> select;
    SqliteValueList record;
    Records records;
    const LogLine empty = Err("Exec", "empty command to exec db[" + path + "]");
    const std::vector<Row> rows = {
        {[&] { return retrying.InsertRecord(insert); }, empty,
         Err("InsertRecord", "Failed to exec [] in db[" + path + "]")},
        {[&] { return retrying.UpdateRecord(update); }, empty,
         Err("UpdateRecord", "Failed to exec [] in db[" + path + "]")},
        {[&] { return retrying.SelectRecords(select, records); },
         Err("SelectByCommand", "Empty command to select records"),
         Err("SelectRecords", "Failed to select by command []")},
        {[&] { return retrying.SelectRecord(select, record); },
         Err("SelectByCommand", "Empty command to select record"),
         Err("SelectRecord", "Failed to select by command []")},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.failed.function);
        EXPECT_FALSE(row.run());
        ExpectErr(retrying, 401);
        ExpectLines({row.refused, row.failed});
    }
    ExpectPauses(0);
}

TEST_F(SqliteDbRecordsTest, AFailedInsertOrUpdateBuildsItsTextAgainForTheLog)
{
    const Failure insertFailed{"INSERT INTO jobs (id,name) VALUES (1,'a'); -- 1", SQLITE_ERROR,
                               "no such table: jobs"};
    const Failure updateFailed{"UPDATE jobs SET name='a' WHERE id=1 -- 1", SQLITE_ERROR,
                               "no such table: jobs"};
    auto insert = Insert<Counting<InsertCommand>>(jobsWithoutSchema, 1, "a");
    auto update = Update<Counting<UpdateCommand>>(jobsWithoutSchema, 1, "a");
    EXPECT_FALSE(retrying.InsertRecord(insert));
    EXPECT_FALSE(retrying.UpdateRecord(update));
    EXPECT_EQ(insert.asked, 2);
    EXPECT_EQ(update.asked, 2);
    ExpectLines(
        {ExecGaveUp(insertFailed, 4),
         Err("InsertRecord",
             "Failed to exec [INSERT INTO jobs (id,name) VALUES (1,'a'); -- 2] in db[" + path +
                 "]"),
         ExecGaveUp(updateFailed, 4),
         Err("UpdateRecord",
             "Failed to exec [UPDATE jobs SET name='a' WHERE id=1 -- 2] in db[" + path + "]")});

    Run("CREATE TABLE jobs (id, name)");
    EXPECT_TRUE(retrying.InsertRecord(insert));
    EXPECT_TRUE(retrying.UpdateRecord(update));
    EXPECT_EQ(insert.asked, 3);
    EXPECT_EQ(update.asked, 3);
}

// -------------------------------------------------------------------------------------- records

TEST_F(SqliteDbRecordsTest, InsertsAddARow)
{
    EXPECT_TRUE(db.InsertRecord(Insert(jobs, 1, "a")));
    EXPECT_TRUE(db.InsertRecord(Insert(jobs, 2, "b")));
    EXPECT_EQ(Run("SELECT * FROM jobs ORDER BY id"), "1,a;2,b");
}

TEST_F(SqliteDbRecordsTest, InsertingAnExistingKeyFailsUnlessItMayReplace)
{
    const Failure unique{"INSERT INTO jobs (id,name) VALUES (1,'b');", SQLITE_CONSTRAINT,
                         "UNIQUE constraint failed: jobs.id"};
    InsertCommand second = Insert(jobs, 1, "b");
    EXPECT_TRUE(db.InsertRecord(Insert(jobs, 1, "a")));
    EXPECT_FALSE(db.InsertRecord(second));
    ExpectErr(db, 404, TriesText(unique));
    ExpectLines({ExecGaveUp(unique), Err("InsertRecord", "Failed to exec [" + unique.command +
                                                             "] in db[" + path + "]")});
    EXPECT_EQ(Run("SELECT * FROM jobs"), "1,a");

    second.SetReplacable(true);
    EXPECT_TRUE(db.InsertRecord(second));
    ExpectErr(db, 0);
    EXPECT_EQ(Run("SELECT * FROM jobs"), "1,b");
}

TEST_F(SqliteDbRecordsTest, AnUpdateChangesTheRowsThatMeetItsCondition)
{
    EXPECT_TRUE(db.InsertRecord(Insert(jobs, 1, "a")));
    EXPECT_TRUE(db.InsertRecord(Insert(jobs, 2, "b")));
    EXPECT_TRUE(db.UpdateRecord(Update(jobs, 2, "c")));
    EXPECT_TRUE(db.UpdateRecord(Update(jobs, 3, "no row is not an error")));
    ExpectErr(db, 0);
    EXPECT_EQ(Run("SELECT * FROM jobs ORDER BY id"), "1,a;2,c");
}

TEST_F(SqliteDbRecordsTest, SelectsGiveAllRowsOrTheFirst)
{
    Run("CREATE TABLE jobs (id INTEGER PRIMARY KEY, name TEXT);"
        "INSERT INTO jobs VALUES (1, 'a'), (2, NULL), (3, 'c')");
    SelectCommand odd;
    odd.SetTable(jobs);
    odd.AddField("id");
    odd.AddField("upper(name) AS label");
    odd.SetCondition("id != 2");

    Records records;
    EXPECT_TRUE(db.SelectRecords(odd, records));
    EXPECT_TRUE(db.SelectRecords(SelectAll(jobs), records));
    std::string all;
    for (const SqliteValueList& record : records) all += "{" + record.ToStr() + "}";
    EXPECT_EQ(all, "{id:1, label:'A'}{id:3, label:'C'}{id:1, name:'a'}{id:2}{id:3, name:'c'}");
    ExpectLines({Warn("ParseRecord", "field [name] has null value")});

    SqliteValueList record;
    EXPECT_TRUE(db.SelectRecord(odd, record));
    EXPECT_EQ(record.ToStr(), "id:1, label:'A'");
    odd.SetCondition("id > 3");
    EXPECT_TRUE(db.SelectRecord(odd, record));
    EXPECT_EQ(record.ToStr(), "id:1, label:'A'");
    ExpectErr(db, 0);
}

TEST_F(SqliteDbRecordsTest, ADeleteRemovesTheRowsThatMeetItsCondition)
{
    for (const int id : {1, 2, 3, 4}) EXPECT_TRUE(db.InsertRecord(Insert(jobs, id, "a")));
    EXPECT_TRUE(db.DeleteRecord(SqliteEqual("id", 1).GetCondition(), jobs));
    EXPECT_EQ(Run("SELECT id FROM jobs"), "2;3;4");
    EXPECT_TRUE(db.DoDelete(jobs, "id = 2 OR id = 9"));
    EXPECT_EQ(Run("SELECT id FROM jobs"), "3;4");
    EXPECT_TRUE(db.DeleteRecord("id = 9", jobs));
    EXPECT_EQ(Run("SELECT id FROM jobs"), "3;4");
    EXPECT_TRUE(db.DeleteAllRecords(jobs));
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "0");
    ExpectErr(db, 0);
}

TEST_F(SqliteDbRecordsTest, ADeleteWithoutConditionOrTableIsRefusedBeforeTheFileIsOpened)
{
    struct Row {
        std::function<bool()> run;
        LogLine line;
    };
    const SqliteTableHandler nameless("", "id INTEGER");
    const LogLine noCondition = Err("DeleteRecord", "invalid delete command: condition[]");
    const LogLine noTable = Err("DoDelete", "invalid table:[]");
    const std::vector<Row> rows = {
        {[&] { return retrying.DeleteRecord("", jobs); }, noCondition},
        {[&] { return retrying.DeleteRecord("", nameless); }, noCondition},  // checked first
        {[&] { return retrying.DeleteRecord("id = 1", nameless); }, noTable},
        {[&] { return retrying.DeleteAllRecords(nameless); }, noTable},
        {[&] { return retrying.DoDelete(nameless, ""); }, noTable},
        {[&] { return retrying.DoDelete(SqliteTableHandler(), "id = 1"); }, noTable},
    };
    for (const Row& row : rows) {
        retrying.SetDBErr("", 0, "earlier");
        EXPECT_FALSE(row.run());
        ExpectErr(retrying, 401);
        ExpectLines({row.line});
    }
    EXPECT_EQ(Opened(), 0);
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(SqliteDbRecordsTest, ADeleteWithoutConditionDeletesNothing)
{
    EXPECT_TRUE(db.InsertRecord(Insert(jobs, 1, "a")));
    EXPECT_FALSE(db.DeleteRecord("", jobs));
    ExpectErr(db, 401);
    ExpectLines({Err("DeleteRecord", "invalid delete command: condition[]")});
    EXPECT_EQ(Run("SELECT * FROM jobs"), "1,a");
}

TEST_F(SqliteDbRecordsTest, TheDeleteStatementHasSingleBlanksAndASemicolon)
{
    const SqliteDB& constant = db;
    EXPECT_EQ(constant.GenerateDeleteCommand("jobs", ""), "DELETE FROM jobs;");
    EXPECT_EQ(constant.GenerateDeleteCommand("jobs", "id = 3"), "DELETE FROM jobs WHERE id = 3;");
    EXPECT_EQ(constant.GenerateDeleteCommand("a b", " x "), "DELETE FROM a b WHERE  x ;");
    ExpectErr(db, 0);
}

TEST_F(SqliteDbRecordsTest, ADeleteStatementWithoutATableIsEmpty)
{
    db.SetDBErr("", 0, "earlier");
    for (const char* condition : {"", "id = 3"}) {
        EXPECT_EQ(db.GenerateDeleteCommand("", condition), "");
        ExpectErr(db, 404, R"({"sqlite_errmsg":"earlier"})");
        ExpectLines({Err("GenerateDeleteCommand", "empty table")});
    }
}

// ---------------------------------------------------------------------------------------- tables

TEST_F(SqliteDbRecordsTest, ATableIsFoundByItsExactName)
{
    Run("CREATE TABLE jobs (id); CREATE VIEW seen AS SELECT id FROM jobs;"
        "CREATE INDEX sorted ON jobs (id)");
    ASSERT_TRUE(db.Open());
    EXPECT_TRUE(db.IsTableExisted("jobs"));
    for (const char* name : {"Jobs", "job", "seen", "sorted", ""}) {
        EXPECT_FALSE(db.IsTableExisted(name)) << name;
        ExpectErr(db, 0);
    }
}

TEST_F(SqliteDbRecordsTest, OnAClosedObjectNoTableIsFoundAndNothingIsOpened)
{
    const Failure closed{LookFor("jobs"), SQLITE_MISUSE, sqlite3_errmsg(nullptr)};
    EXPECT_FALSE(retrying.IsTableExisted("jobs"));
    ExpectErr(retrying, 404, TriesText(closed, 4));
    ExpectLines({ManyRowsGaveUp(closed, 4)});
    ExpectPauses(3);

    EXPECT_FALSE(db.CreateTable(jobs));
    ExpectErr(db, 403);
    ExpectLines({ManyRowsGaveUp(closed, 1), Err("Exec", "DB[" + path + "] is not opened"),
                 Err("CreateTable", "Failed to create table [jobs] with cmd[" + create + "]")});
    EXPECT_EQ(Opened(), 0);
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(SqliteDbRecordsTest, ATableThatWasReadExistsEvenIfTheLookupFailsAfterwards)
{
    // The contract: only the row counts, not the result of the select.
    std::string message;
    Run("CREATE TABLE jobs (id)");
    ASSERT_TRUE(retrying.Open());
    SqliteFaults faults;
    faults.step = [&](sqlite3_stmt* statement) {
        const int code = RealStep(statement);
        if (code != SQLITE_DONE || !IsStatement(statement, LookFor("jobs"))) return code;
        message = sqlite3_errmsg(sqlite3_db_handle(statement));
        return SQLITE_IOERR;
    };
    EXPECT_TRUE(retrying.IsTableExisted("jobs"));
    const Failure broken{LookFor("jobs"), SQLITE_IOERR, message};
    ExpectErr(retrying, 404, TriesText(broken, 4));
    ExpectLines({ManyRowsGaveUp(broken, 4)});
}

TEST_F(SqliteDbRecordsTest, ATableNameIsWrittenIntoTheLookupUnescaped)
{
    // The contract: the caller escapes the name.
    const Failure broken{LookFor("o'brien"), SQLITE_ERROR, R"(near "brien": syntax error)"};
    Run("CREATE TABLE \"o'brien\" (id)");
    ASSERT_TRUE(db.Open());
    EXPECT_FALSE(db.IsTableExisted("o'brien"));
    ExpectErr(db, 404, TriesText(broken));
    ExpectLines({ManyRowsGaveUp(broken)});
    EXPECT_TRUE(db.IsTableExisted("o''brien"));
    EXPECT_TRUE(db.IsTableExisted("x' OR '1'='1"));
}

TEST_F(SqliteDbRecordsTest, AnExistingTableIsNotChanged)
{
    ASSERT_TRUE(db.Open());
    EXPECT_TRUE(db.CreateTable(jobs));
    EXPECT_TRUE(db.CreateTable({"jobs", "another INTEGER"}));
    EXPECT_TRUE(db.CreateTable({"jobs", "no schema at all, )"}));
    ExpectErr(db, 0);
    EXPECT_EQ(Run("SELECT sql FROM sqlite_master"),
              "CREATE TABLE jobs (id INTEGER PRIMARY KEY, name TEXT)");
}

TEST_F(SqliteDbRecordsTest, WithoutASchemaNothingIsCreatedAndNoNameIsNeeded)
{
    ASSERT_TRUE(db.Open());
    db.SetDBErr("", 0, "earlier");
    EXPECT_TRUE(db.CreateTable(jobsWithoutSchema));
    EXPECT_TRUE(db.CreateTable(SqliteTableHandler()));
    ExpectErr(db, 404, R"({"sqlite_errmsg":"earlier"})");
    EXPECT_EQ(Run("SELECT count(*) FROM sqlite_master"), "0");
    db.Close();
    EXPECT_TRUE(db.CreateTable(jobsWithoutSchema));
}

TEST_F(SqliteDbRecordsTest, ATableWithoutANameIsRefusedAndTheErrorStays)
{
    ASSERT_TRUE(db.Open());
    db.SetDBErr("", 0, "earlier");
    EXPECT_FALSE(db.CreateTable({"", "id INTEGER"}));
    ExpectErr(db, 404, R"({"sqlite_errmsg":"earlier"})");
    ExpectLines({Err("CreateTable", "Invalid table []")});
}

TEST_F(SqliteDbRecordsTest, ARefusedSchemaIsLoggedWithItsStatement)
{
    const Failure bad{"CREATE TABLE IF NOT EXISTS jobs (SELECT)", SQLITE_ERROR,
                      R"(near "SELECT": syntax error)"};
    ASSERT_TRUE(retrying.Open());
    EXPECT_FALSE(retrying.CreateTable({"jobs", "SELECT"}));
    ExpectErr(retrying, 404, TriesText(bad, 4));
    ExpectLines({ExecGaveUp(bad, 4), Err("CreateTable", "Failed to create table [jobs] with cmd[" +
                                                            bad.command + "]")});
    ExpectPauses(3);
}

// ----------------------------------------------------------------------------------- two processes

TEST(SqliteDbProcessesTest, TwoProcessesInsertingAtTheSameTimeLoseNothing)
{
    constexpr int RowsEach = 200;
    const TempDir dir;
    const std::string path = dir.File("test.db");
    const SqliteTableHandler jobs("jobs", "id INTEGER PRIMARY KEY, name TEXT");
    const auto insertFrom = [&](int first) {
        return [&jobs, &path, first](ChildProcess::Link& link) {
            link.Await();
            SqliteDB db(path, 5);
            // Without waits for the disk the two contend for the lock more often.
            if (!db.Open() || !db.Exec("PRAGMA synchronous = OFF")) throw std::runtime_error(path);
            for (int id = first; id < first + RowsEach; ++id) {
                if (!db.InsertRecord(Insert(jobs, id, "a"))) {
                    throw std::runtime_error(OrvaDRCore::toString(db.GetErr()));
                }
            }
        };
    };
    ChildProcess one(insertFrom(0));
    ChildProcess two(insertFrom(RowsEach));
    one.Tell();
    two.Tell();
    EXPECT_EQ(one.Join(), 0);
    EXPECT_EQ(two.Join(), 0);
    EXPECT_EQ(PlainDb(path).Run("SELECT count(*), min(id), max(id) FROM jobs"), "400,0,399");
}

}  // namespace
