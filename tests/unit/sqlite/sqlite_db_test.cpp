// The connection, Exec with its retries and the error record. Selecting is tested in
// sqlite_db_select_test.cpp, the table and record operations in sqlite_db_records_test.cpp.
#include <orvadrcore/sqlite_db.h>

#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <functional>
#include <type_traits>
#include <utility>

#include "support/fixtures/sqlite_fixture.h"

namespace {

using OrvaDRCore::SqliteDB;

static_assert(!std::is_copy_constructible_v<SqliteDB> && !std::is_copy_assignable_v<SqliteDB>);
static_assert(std::is_nothrow_move_constructible_v<SqliteDB> &&
              std::is_nothrow_move_assignable_v<SqliteDB>);

class SqliteDbTest : public SqliteFixture {
  protected:
    // Runs `body` in a process of an ordinary user while file and directory have these modes. Root
    // may do anything, whatever the modes.
    void AsOrdinaryUser(mode_t fileMode, mode_t directoryMode, const std::function<void()>& body)
    {
        ASSERT_EQ(::chmod(path.c_str(), fileMode), 0);
        ASSERT_EQ(::chmod(dir.Path().c_str(), directoryMode), 0);
        ChildProcess child([&body](ChildProcess::Link&) {
            constexpr uid_t Nobody = 65534;
            if (::geteuid() == 0 && ::setresuid(Nobody, Nobody, Nobody) != 0) {
                throw std::runtime_error("setresuid");
            }
            body();
            if (HasFailure()) throw std::runtime_error("see above");
        });
        EXPECT_EQ(child.Join(), 0);
        EXPECT_EQ(::chmod(dir.Path().c_str(), 0700), 0);
    }
};

// ---------------------------------------------------------------------------------- connection

TEST_F(SqliteDbTest, ANewObjectIsClosedAndTouchesNoFile)
{
    ExpectErr(db, 0);
    EXPECT_EQ(Opened(), 0);
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(SqliteDbTest, OpenTwiceOpensOneConnectionAndSetsTheBusyTimeoutOnce)
{
    std::vector<int> timeouts;
    SqliteFaults faults;
    faults.busyTimeout = [&](sqlite3*, int milliseconds) {
        timeouts.push_back(milliseconds);
        return SQLITE_OK;
    };
    EXPECT_TRUE(db.Open());
    EXPECT_TRUE(db.Open());
    EXPECT_EQ(Opened(), 1);
    EXPECT_EQ(timeouts, std::vector<int>{1000});
}

TEST_F(SqliteDbTest, AFileThatSqliteCannotOpenLeavesNoConnection)
{
    for (const std::string& unopenable : {dir.Path(), dir.File("missing/test.db")}) {
        SCOPED_TRACE(unopenable);
        const int openedBefore = Opened();
        SqliteDB refused(unopenable, 3);
        EXPECT_FALSE(refused.Open());
        ExpectErr(refused, 0);
        EXPECT_EQ(Opened(), openedBefore + 1);  // SQLite returns a handle although it fails
        EXPECT_EQ(Closed(), Opened());
        EXPECT_FALSE(refused.Exec("SELECT 1"));
        ExpectLines({Warn("Open", "Failed to open db[" + unopenable + "]"),
                     Err("Exec", "DB[" + unopenable + "] is not opened")});
    }
    ExpectPauses(0);
}

TEST_F(SqliteDbTest, AFailedOpenCanBeRepeated)
{
    SqliteDB early(dir.File("later/test.db"), 0);
    EXPECT_FALSE(early.Open());
    ExpectLines({Warn("Open", "Failed to open db[" + dir.File("later/test.db") + "]")});
    std::filesystem::create_directory(dir.File("later"));
    EXPECT_TRUE(early.Open());
    EXPECT_TRUE(early.Exec("CREATE TABLE jobs (id)"));
}

TEST_F(SqliteDbTest, ABusyTimeoutThatCannotBeSetLeavesTheConnectionOpen)
{
    int asked = 0;
    SqliteFaults faults;
    faults.busyTimeout = [&](sqlite3*, int) {
        ++asked;
        return SQLITE_MISUSE;
    };
    EXPECT_FALSE(db.Open());
    ExpectLines({Warn("Open", "Failed to set busy timeout with error")});
    ExpectErr(db, 0);
    EXPECT_EQ(Closed(), 0);

    EXPECT_TRUE(db.Open());  // the contract: the connection is open
    EXPECT_TRUE(db.Exec("CREATE TABLE jobs (id)"));
    EXPECT_EQ(asked, 1);
    EXPECT_EQ(Opened(), 1);
}

TEST_F(SqliteDbTest, OpenAndCloseLeaveTheErrorCodeAndRecord)
{
    const std::string record = R"({"sqlite_errmsg":"earlier"})";
    db.SetDBErr("", 0, "earlier");
    EXPECT_TRUE(db.Open());
    ExpectErr(db, 404, record);
    EXPECT_TRUE(db.Open());
    ExpectErr(db, 404, record);
    db.Close();
    ExpectErr(db, 404, record);

    SqliteDB refused(dir.Path(), 0);
    refused.SetDBErr("", 0, "earlier");
    EXPECT_FALSE(refused.Open());
    ExpectErr(refused, 404, record);
    ExpectLines({Warn("Open", "Failed to open db[" + dir.Path() + "]")});
}

TEST_F(SqliteDbTest, CloseOfAClosedObjectDoesNothing)
{
    db.SetDBErr("", 0, "earlier");
    db.Close();
    ExpectErr(db, 404, R"({"sqlite_errmsg":"earlier"})");
    EXPECT_EQ(Closed(), 0);
    EXPECT_TRUE(db.Open());
    db.Close();
    db.Close();
    EXPECT_EQ(Closed(), 1);
}

TEST_F(SqliteDbTest, AClosedObjectCanBeOpenedAgain)
{
    EXPECT_TRUE(db.Open());
    EXPECT_TRUE(db.Exec("CREATE TABLE jobs (id)"));
    db.Close();
    EXPECT_TRUE(db.Open());
    EXPECT_TRUE(db.Exec("INSERT INTO jobs VALUES (1)"));
    EXPECT_EQ(Opened(), 2);
}

TEST_F(SqliteDbTest, TheDestructorClosesWhatIsOpen)
{
    {
        SqliteDB opened(path, 0);
        SqliteDB never(path, 0);
        EXPECT_TRUE(opened.Open());
        EXPECT_EQ(Closed(), 0);
    }
    EXPECT_EQ(Opened(), 1);
    EXPECT_EQ(Closed(), 1);
}

// --------------------------------------------------------------------------------------- moving

TEST_F(SqliteDbTest, AMoveTakesConnectionErrorAndLimit)
{
    const Failure bad{"BAD", SQLITE_ERROR, R"(near "BAD": syntax error)"};
    ASSERT_TRUE(retrying.Open());
    retrying.SetDBErr("earlier", 0, "why");

    SqliteDB taken(std::move(retrying));
    ExpectErr(taken, 404, R"({"command":"earlier","sqlite_errmsg":"why"})");
    EXPECT_FALSE(taken.Exec(bad.command));
    ExpectLines({ExecGaveUp(bad, 4)});
    EXPECT_EQ(Opened(), 1);
    EXPECT_EQ(Closed(), 0);
}

TEST_F(SqliteDbTest, AMovedFromObjectIsClosedButCanBeOpenedAgain)
{
    ASSERT_TRUE(db.Open());
    SqliteDB taken(std::move(db));
    SqliteDB assigned("", 0);
    assigned = std::move(taken);
    // Moved-from objects can be used. NOLINTBEGIN(bugprone-use-after-move)
    for (SqliteDB* moved : {&db, &taken}) {
        ExpectErr(*moved, 0);
        EXPECT_FALSE(moved->Exec("SELECT 1"));
        ExpectErr(*moved, 403);
        ExpectLines({Err("Exec", "DB[" + path + "] is not opened")});
        EXPECT_TRUE(moved->Open());
        EXPECT_TRUE(moved->Exec("CREATE TABLE IF NOT EXISTS jobs (id)"));
        ExpectErr(*moved, 0);
    }
    // NOLINTEND(bugprone-use-after-move)
    EXPECT_EQ(Run("SELECT name FROM sqlite_master"), "jobs");
}

TEST_F(SqliteDbTest, AMovedFromObjectHasNoError)
{
    const std::string record = R"({"sqlite_errmsg":"why"})";
    db.SetDBErr("", 0, "why");
    SqliteDB built(std::move(db));
    ExpectErr(built, 404, record);
    ExpectErr(db, 0);  // NOLINT(bugprone-use-after-move)
    SqliteDB assigned(path, 0);
    assigned.SetDBErr("", 0, "earlier");
    assigned = std::move(built);
    ExpectErr(assigned, 404, record);
    ExpectErr(built, 0);  // NOLINT(bugprone-use-after-move)
}

TEST_F(SqliteDbTest, AMoveAssignmentClosesWhatWasOpen)
{
    const Failure bad{"BAD", SQLITE_ERROR, R"(near "BAD": syntax error)"};
    const std::string otherPath = dir.File("other.db");
    SqliteDB target(otherPath, 0);
    ASSERT_TRUE(target.Open());
    ASSERT_TRUE(retrying.Open());
    ASSERT_TRUE(retrying.Exec("CREATE TABLE jobs (id)"));

    target = std::move(retrying);
    EXPECT_EQ(Opened(), 2);
    EXPECT_EQ(Closed(), 1);
    EXPECT_TRUE(target.Exec("INSERT INTO jobs VALUES (1)"));
    EXPECT_FALSE(target.Exec(bad.command));
    target.Close();
    EXPECT_FALSE(target.Exec("SELECT 1"));
    ExpectLines({ExecGaveUp(bad, 4), Err("Exec", "DB[" + path + "] is not opened")});
    EXPECT_EQ(Closed(), 2);
}

TEST_F(SqliteDbTest, AssigningAnObjectToItselfChangesNothing)
{
    ASSERT_TRUE(db.Open());
    db.SetDBErr("earlier", 5, "why");
    SqliteDB& same = db;
    db = std::move(same);
    ExpectErr(db, 404, ErrorText({"earlier", 5, "why"}));
    EXPECT_EQ(Closed(), 0);
    EXPECT_TRUE(db.Exec("CREATE TABLE jobs (id)"));
}

// ----------------------------------------------------------------------------------------- Exec

TEST_F(SqliteDbTest, ExecOnAClosedObjectIsRefusedAndTouchesNoFile)
{
    // Also for an empty statement: the connection is checked first.
    for (const char* statement : {"CREATE TABLE jobs (id)", ""}) {
        retrying.SetDBErr("", 0, "earlier");
        EXPECT_FALSE(retrying.Exec(statement));
        ExpectErr(retrying, 403);
        ExpectLines({Err("Exec", "DB[" + path + "] is not opened")});
    }
    EXPECT_EQ(Opened(), 0);
    EXPECT_FALSE(std::filesystem::exists(path));
    ExpectPauses(0);
}

TEST_F(SqliteDbTest, ExecOfAnEmptyStatementIsRefused)
{
    ASSERT_TRUE(retrying.Open());
    retrying.SetDBErr("", 0, "earlier");
    EXPECT_FALSE(retrying.Exec(""));
    ExpectErr(retrying, 401);
    ExpectLines({Err("Exec", "empty command to exec db[" + path + "]")});
    ExpectPauses(0);
}

TEST_F(SqliteDbTest, ASuccessfulExecLogsNothingAndClearsTheError)
{
    ASSERT_TRUE(retrying.Open());
    retrying.SetDBErr("", 0, "earlier");
    EXPECT_TRUE(retrying.Exec("CREATE TABLE jobs (id); INSERT INTO jobs VALUES (1)"));
    ExpectErr(retrying, 0);
    ExpectPauses(0);
    EXPECT_EQ(Run("SELECT id FROM jobs"), "1");
}

TEST_F(SqliteDbTest, ExecDropsTheRowsOfAStatementThatHasSome)
{
    ASSERT_TRUE(db.Open());
    EXPECT_TRUE(db.Exec("SELECT 1 UNION SELECT 2"));
    ExpectErr(db, 0);
}

TEST_F(SqliteDbTest, ATextWithoutAStatementSucceeds)
{
    ASSERT_TRUE(db.Open());
    for (const char* statement : {" ", "\n\t", ";", "-- nothing", "/* nothing */"}) {
        EXPECT_TRUE(db.Exec(statement)) << statement;
        ExpectErr(db, 0);
    }
}

TEST_F(SqliteDbTest, ALimitOfZeroMeansOneAttempt)
{
    ASSERT_TRUE(db.Open());
    EXPECT_FALSE(db.Exec("BAD"));
    const std::string tries =
        R"([{"err_code":404,"err_code_str":"ERR_DATABASE_OPERATION","err_msg":{"command":"BAD",)"
        R"("sqlite_errcode":1,"sqlite_errmsg":"near \"BAD\": syntax error"}}])";
    ExpectErr(db, 404, tries);
    ExpectLines({Warn(
        "Exec", "Reach retry limit [1], failed to exec command [BAD] with err[" + tries + "]")});
    ExpectPauses(0);
}

TEST_F(SqliteDbTest, ALimitOfThreeMeansFourAttemptsAndThreePauses)
{
    const Failure bad{"BAD", SQLITE_ERROR, R"(near "BAD": syntax error)"};
    ASSERT_TRUE(retrying.Open());
    EXPECT_FALSE(retrying.Exec(bad.command));
    ExpectErr(retrying, 404, TriesText(bad, 4));
    ExpectLines({ExecGaveUp(bad, 4)});
    ExpectPauses(3);

    const Json::Value& record = retrying.GetErr();
    ASSERT_EQ(record.size(), 4U);
    EXPECT_EQ(record[0]["err_code"].type(), Json::intValue);
    EXPECT_EQ(record[0]["err_msg"]["sqlite_errcode"].type(), Json::intValue);
}

TEST_F(SqliteDbTest, ASuccessAfterAFailedAttemptIsLogged)
{
    Run("CREATE TABLE jobs (id); INSERT INTO jobs VALUES (1)");
    LockHolder holder(path);
    pauses.OnPause([&](std::size_t) { holder.Release(); });
    ASSERT_TRUE(retrying.Open());
    EXPECT_TRUE(retrying.Exec("DELETE FROM jobs"));
    ExpectErr(retrying, 0);
    ExpectLines(
        {Info("Exec",
              "After retry [1] times, success to exec command [DELETE FROM jobs], previous errors["
              R"([{"err_code":404,"err_code_str":"ERR_DATABASE_OPERATION","err_msg":)"
              R"({"command":"DELETE FROM jobs","sqlite_errcode":5,)"
              R"("sqlite_errmsg":"database is locked"}}]])")});
    ExpectPauses(1);
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "0");
}

TEST_F(SqliteDbTest, TheLastAttemptMaySucceedAndEachFailureIsRecorded)
{
    const std::string insert = "INSERT INTO jobs VALUES (1)";
    pauses.OnPause([&](std::size_t number) {
        if (number == 1) Run("CREATE TABLE jobs (id UNIQUE); INSERT INTO jobs VALUES (1)");
        if (number == 2)
            Run("DROP TABLE jobs; CREATE TABLE jobs (id CONSTRAINT big CHECK (id > 1))");
        if (number == 3) Run("DROP TABLE jobs; CREATE TABLE jobs (id)");
    });
    ASSERT_TRUE(retrying.Open());
    EXPECT_TRUE(retrying.Exec(insert));
    ExpectErr(retrying, 0);
    ExpectLines({Info("Exec", "After retry [3] times, success to exec command [" + insert +
                                  "], previous errors[" +
                                  TriesText({{insert, 1, "no such table: jobs"},
                                             {insert, 19, "UNIQUE constraint failed: jobs.id"},
                                             {insert, 19, "CHECK constraint failed: big"}}) +
                                  "]")});
    ExpectPauses(3);
    EXPECT_EQ(Run("SELECT id FROM jobs"), "1");
}

TEST_F(SqliteDbTest, AStatementOnAFileThatStaysLockedGivesUp)
{
    const Failure busy{"INSERT INTO jobs VALUES (1)", SQLITE_BUSY, Locked};
    Run("CREATE TABLE jobs (id)");
    LockHolder holder(path);
    ASSERT_TRUE(retrying.Open());
    EXPECT_FALSE(retrying.Exec(busy.command));
    ExpectErr(retrying, 404, TriesText(busy, 4));
    ExpectLines({ExecGaveUp(busy, 4)});
    ExpectPauses(3);
    holder.Release();
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "0");

    EXPECT_TRUE(retrying.Exec(busy.command));
    ExpectErr(retrying, 0);
}

TEST_F(SqliteDbTest, AFileThatIsNotADatabaseOpensButRunsNothing)
{
    const Failure noDatabase{"CREATE TABLE jobs (id)", SQLITE_NOTADB, NoDatabase};
    std::ofstream(path) << "text, and nothing that SQLite wrote\n";
    EXPECT_TRUE(db.Open());
    EXPECT_FALSE(db.Exec(noDatabase.command));
    ExpectErr(db, 404, TriesText(noDatabase));
    ExpectLines({ExecGaveUp(noDatabase)});
}

TEST_F(SqliteDbTest, AFileThatMayNotBeWrittenIsReadOnly)
{
    const Failure readOnly{"INSERT INTO jobs VALUES (1)", SQLITE_READONLY,
                           "attempt to write a readonly database"};
    struct Modes {
        mode_t file;
        mode_t directory;
    };
    Run("CREATE TABLE jobs (id)");
    for (const Modes& modes : {Modes{0444, 0555}, Modes{0444, 0777}, Modes{0666, 0555}}) {
        AsOrdinaryUser(modes.file, modes.directory, [&] {
            EXPECT_TRUE(db.Open());
            EXPECT_TRUE(db.Exec("SELECT * FROM jobs"));
            EXPECT_FALSE(db.Exec(readOnly.command));
            ExpectErr(db, 404, TriesText(readOnly));
            ExpectLines({ExecGaveUp(readOnly)});
        });
    }
}

TEST_F(SqliteDbTest, AFileThatMayNotBeReadIsNotOpened)
{
    Run("CREATE TABLE jobs (id)");
    AsOrdinaryUser(0000, 0777, [&] {
        EXPECT_FALSE(db.Open());
        ExpectErr(db, 0);
        ExpectLines({Warn("Open", "Failed to open db[" + path + "]")});
    });
}

TEST_F(SqliteDbTest, AnyStatementIsCompleteInLogLineAndRecord)
{
    struct Row {
        std::string statement;
        std::string json;
    };
    const std::vector<Row> rows = {
        {R"(SELECT "a\b" FROM t)", R"(SELECT \"a\\b\" FROM t)"},
        {"SELECT 1\n\tFROM t", R"(SELECT 1\n\tFROM t)"},
        {"SELECT '%s%n%d' FROM t", "SELECT '%s%n%d' FROM t"},
        {"SELECT 'Z\xC3\xBCrich' FROM t", "SELECT 'Z\xC3\xBCrich' FROM t"},
    };
    ASSERT_TRUE(db.Open());
    for (const Row& row : rows) {
        const std::string tries =
            R"([{"err_code":404,"err_code_str":"ERR_DATABASE_OPERATION","err_msg":{"command":")" +
            row.json + R"(","sqlite_errcode":1,"sqlite_errmsg":"no such table: t"}}])";
        EXPECT_FALSE(db.Exec(row.statement));
        ExpectErr(db, 404, tries);
        ExpectLines({Warn("Exec", "Reach retry limit [1], failed to exec command [" +
                                      row.statement + "] with err[" + tries + "]")});
    }
}

TEST_F(SqliteDbTest, AStatementEndsAtItsFirstZeroByte)
{
    using namespace std::string_literals;
    ASSERT_TRUE(db.Open());
    EXPECT_TRUE(db.Exec("CREATE TABLE jobs (id)\0BAD"s));
    EXPECT_EQ(Run("SELECT name FROM sqlite_master"), "jobs");

    EXPECT_FALSE(db.Exec("BAD\0x"s));
    const std::string tries =
        R"([{"err_code":404,"err_code_str":"ERR_DATABASE_OPERATION","err_msg":)"
        R"({"command":"BAD\u0000x","sqlite_errcode":1,)"
        R"("sqlite_errmsg":"near \"BAD\": syntax error"}}])";
    ExpectErr(db, 404, tries);
    ExpectLines({Warn(
        "Exec", "Reach retry limit [1], failed to exec command [BAD] with err[" + tries + "]")});
}

TEST_F(SqliteDbTest, EachAttemptRepeatsAllStatementsOfAText)
{
    // The contract: an attempt runs the whole text, and the statements that succeeded stay.
    const Failure half{"INSERT INTO jobs VALUES (1); INSERT INTO nowhere VALUES (1)", SQLITE_ERROR,
                       "no such table: nowhere"};
    Run("CREATE TABLE jobs (id)");
    ASSERT_TRUE(retrying.Open());
    EXPECT_FALSE(retrying.Exec(half.command));
    ExpectLines({ExecGaveUp(half, 4)});
    EXPECT_EQ(Run("SELECT id FROM jobs"), "1;1;1;1");
}

TEST_F(SqliteDbTest, ATransactionInOneTextIsLeftOpenWhenItFails)
{
    // The contract: the transaction of the first attempt is open when the second one begins.
    const std::string text = "BEGIN; INSERT INTO jobs VALUES (1); INSERT INTO nowhere VALUES (1)";
    const std::string again = "cannot start a transaction within a transaction";
    Run("CREATE TABLE jobs (id)");
    ASSERT_TRUE(retrying.Open());
    EXPECT_FALSE(retrying.Exec(text));
    const std::string tries = TriesText({{text, SQLITE_ERROR, "no such table: nowhere"},
                                         {text, SQLITE_ERROR, again},
                                         {text, SQLITE_ERROR, again},
                                         {text, SQLITE_ERROR, again}});
    ExpectErr(retrying, 404, tries);
    ExpectLines({Warn("Exec", "Reach retry limit [4], failed to exec command [" + text +
                                  "] with err[" + tries + "]")});
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "0");
    EXPECT_TRUE(retrying.Exec("COMMIT"));
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "1");
}

// ------------------------------------------------------------------- single attempt, error record

TEST_F(SqliteDbTest, ASingleAttemptLogsNothingAndRecordsOneError)
{
    const Failure bad{"BAD", SQLITE_ERROR, R"(near "BAD": syntax error)"};
    ASSERT_TRUE(retrying.Open());
    EXPECT_FALSE(retrying.DoExecSqliteCommand(bad.command));
    ExpectErr(retrying, 404, ErrorText(bad));
    ExpectPauses(0);
}

TEST_F(SqliteDbTest, ASuccessfulSingleAttemptLeavesTheErrorAsItWas)
{
    ASSERT_TRUE(db.Open());
    db.SetDBErr("earlier", 5, "why");
    EXPECT_TRUE(db.DoExecSqliteCommand("CREATE TABLE jobs (id)"));
    EXPECT_TRUE(db.DoExecSqliteCommand(""));
    ExpectErr(db, 404, ErrorText({"earlier", 5, "why"}));
    EXPECT_EQ(Run("SELECT name FROM sqlite_master"), "jobs");
}

TEST_F(SqliteDbTest, ASingleAttemptOnAClosedObjectFailsInSqlite)
{
    EXPECT_FALSE(db.DoExecSqliteCommand("SELECT 1"));
    ExpectErr(db, 404, ErrorText({"SELECT 1", SQLITE_MISUSE, sqlite3_errmsg(nullptr)}));
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(SqliteDbTest, AnErrorObjectLeavesOutWhatIsUnknown)
{
    struct Row {
        const char* command;
        int code;
        const char* message;
        std::string record;
    };
    const std::vector<Row> rows = {
        {"", 0, "why", R"({"sqlite_errmsg":"why"})"},
        {"", 0, "", R"({"sqlite_errmsg":""})"},
        {"", 0, nullptr, R"({"sqlite_errmsg":"no such table: t"})"},
        {"", 5, "why", R"({"sqlite_errcode":5,"sqlite_errmsg":"why"})"},
        {"", 5, "", R"({"sqlite_errcode":5,"sqlite_errmsg":""})"},
        {"", 5, nullptr, R"({"sqlite_errcode":5,"sqlite_errmsg":"no such table: t"})"},
        {"S", 0, "why", R"({"command":"S","sqlite_errmsg":"why"})"},
        {"S", 0, "", R"({"command":"S","sqlite_errmsg":""})"},
        {"S", 0, nullptr, R"({"command":"S","sqlite_errmsg":"no such table: t"})"},
        {"S", 5, "why", R"({"command":"S","sqlite_errcode":5,"sqlite_errmsg":"why"})"},
        {"S", 5, "", R"({"command":"S","sqlite_errcode":5,"sqlite_errmsg":""})"},
        {"S", 5, nullptr,
         R"({"command":"S","sqlite_errcode":5,"sqlite_errmsg":"no such table: t"})"},
        {"S", -1, "why", R"({"command":"S","sqlite_errcode":-1,"sqlite_errmsg":"why"})"},
    };
    ASSERT_TRUE(db.Open());
    EXPECT_FALSE(db.DoExecSqliteCommand("SELECT 1 FROM t"));  // sets SQLite's last message
    const SqliteDB& constant = db;
    for (const Row& row : rows) {
        constant.SetDBErr(row.command, row.code, row.message);
        ExpectErr(db, 404, row.record);
    }
}

TEST_F(SqliteDbTest, AnErrorObjectMayUseTheMessageOfThePreviousOne)
{
    db.SetDBErr("a statement that is long enough", 5, "a message that is long enough");
    db.SetDBErr("S", 6, db.GetErr()["sqlite_errmsg"].asCString());
    ExpectErr(db, 404, ErrorText({"S", 6, "a message that is long enough"}));
}

TEST_F(SqliteDbTest, AClosedObjectsErrorHasSqlitesMessageForNoConnection)
{
    db.SetDBErr("S", 5, nullptr);
    ExpectErr(db, 404, ErrorText({"S", 5, sqlite3_errmsg(nullptr)}));
}

}  // namespace
