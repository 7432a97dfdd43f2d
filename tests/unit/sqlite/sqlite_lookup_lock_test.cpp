// The shared lock of the table lookup: a select takes it over, and nobody else does.
#include <orvadrcore/sqlite_db.h>

#include <cstdint>
#include <cstring>
#include <numeric>

#include "support/fakes/log_sink.h"
#include "support/fixtures/sqlite_fixture.h"

namespace {

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteRow;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;

constexpr const char* SelectText = "SELECT id FROM jobs";

bool IsFileLocked(const std::string& path)
{
    try {
        PlainDb(path).Run("BEGIN EXCLUSIVE");  // closing rolls it back
        return false;
    } catch (const std::runtime_error&) {
        return true;
    }
}

// A file and an open connection that has found the file's table `jobs`.
class SqliteLookupLockTest : public SqliteFixture {
  protected:
    SqliteLookupLockTest()
    {
        for (const char* statement :
             {"CREATE TABLE jobs (id)", "INSERT INTO jobs VALUES (1), (2)"}) {
            Run(statement);
        }
        for (SqliteDB* one : {&db, &retrying}) {
            EXPECT_TRUE(one->Open());
            EXPECT_TRUE(one->IsTableExisted("jobs"));
        }
        faults.step = [this](sqlite3_stmt* statement) {
            sqlite3* const handle = sqlite3_db_handle(statement);
            if (BeginsWith(statement, watched)) {
                steps.push_back({IsFileLocked(path), IsCheckRunning(handle)});
                if (steps.size() <= failures) return SQLITE_IOERR;
            }
            return RealStep(statement);
        };
    }

    static bool BeginsWith(sqlite3_stmt* statement, const std::string& text)
    {
        const char* const sql = sqlite3_sql(statement);
        return sql != nullptr && std::strncmp(sql, text.c_str(), text.size()) == 0;
    }

    // Whether the statement with which a lookup holds its lock is running.
    static bool IsCheckRunning(sqlite3* handle)
    {
        sqlite3_stmt* statement = nullptr;
        while ((statement = sqlite3_next_stmt(handle, statement)) != nullptr) {
            if (IsStatement(statement, SchemaCheck)) return sqlite3_stmt_busy(statement) != 0;
        }
        return false;
    }

    bool Select(SqliteDB& from)
    {
        SqliteValueList record;
        return from.SelectRecord(command, record);
    }

    // As it is before a step of the watched statement.
    struct Step {
        bool isFileLocked;
        bool isCheckRunning;
        bool operator==(const Step& other) const
        {
            return isFileLocked == other.isFileLocked && isCheckRunning == other.isCheckRunning;
        }
    };
    using Steps = std::vector<Step>;
    static constexpr Step TakenOver{true, true};  // the lock of the lookup
    static constexpr Step OwnLock{true, false};
    static constexpr Step NoLock{false, false};

    template <class Command>
    static Command ForJobs()
    {
        Command command;
        command.SetTable(SqliteTableHandler("jobs", "id"));
        return command;
    }

    SelectCommand command = [] {
        auto made = ForJobs<SelectCommand>();
        made.AddField("id");
        return made;
    }();
    std::string watched = SelectText;  // how the statement begins
    Steps steps;
    std::size_t failures = 0;  // of the first steps
    SqliteFaults faults;
};

TEST_F(SqliteLookupLockTest, ASelectTakesTheLockOver)
{
    EXPECT_TRUE(Select(db));
    EXPECT_EQ(steps, Steps{TakenOver});
    EXPECT_FALSE(IsFileLocked(path));

    steps.clear();
    std::vector<SqliteValueList> records;
    EXPECT_TRUE(db.SelectRecords(command, records));
    EXPECT_EQ(steps, (Steps{TakenOver, OwnLock, OwnLock}));
    EXPECT_FALSE(IsFileLocked(path));

    steps.clear();
    EXPECT_TRUE(db.SelectEach(command, [](const SqliteRow&) { return true; }));
    EXPECT_EQ(steps, (Steps{TakenOver, OwnLock, OwnLock}));
    EXPECT_FALSE(IsFileLocked(path));
}

TEST_F(SqliteLookupLockTest, WithoutARowNoLockIsLeft)
{
    Run("DELETE FROM jobs");
    EXPECT_TRUE(Select(db));
    EXPECT_EQ(steps, Steps{TakenOver});
    EXPECT_FALSE(IsFileLocked(path));
}

TEST_F(SqliteLookupLockTest, AWriteGetsNoLockFromTheLookup)
{
    auto insert = ForJobs<InsertCommand>();
    insert.AddFieldValue("id", 3);
    auto update = ForJobs<UpdateCommand>();
    update.AddFieldValue("id", 4);
    update.SetCondition("id=3");
    const std::vector<std::pair<std::string, std::function<bool()>>> writes = {
        {"INSERT INTO jobs", [&] { return db.InsertRecord(insert); }},
        {"UPDATE jobs", [&] { return db.UpdateRecord(update); }},
        {"DELETE FROM jobs", [&] { return db.DeleteRecord("id=4", insert.GetTable()); }},
    };
    for (const auto& [text, write] : writes) {
        SCOPED_TRACE(text);
        steps.clear();
        watched = text;
        EXPECT_TRUE(write());
        EXPECT_EQ(steps, Steps{NoLock});
        EXPECT_EQ(db.GetAffectedRows(), 1);
    }
}

TEST_F(SqliteLookupLockTest, TheLookupAloneKeepsNoLock)
{
    EXPECT_TRUE(db.IsTableExisted("jobs"));
    EXPECT_FALSE(IsFileLocked(path));
    EXPECT_TRUE(db.CreateTable(command.GetTable()));
    EXPECT_FALSE(IsFileLocked(path));
    SqliteValueList record;
    EXPECT_TRUE(db.SelectByCommand(SelectText, record));
    EXPECT_EQ(steps, Steps{NoLock});
}

TEST_F(SqliteLookupLockTest, ATableThatWasNotKnownOrIsCreatedHandsNoLockOver)
{
    Run("CREATE TABLE others (id)");
    EXPECT_TRUE(Select(db));
    EXPECT_EQ(steps, Steps{NoLock});
    Run("DROP TABLE jobs");
    steps.clear();
    EXPECT_TRUE(Select(db));
    EXPECT_EQ(steps, Steps{NoLock});
    EXPECT_FALSE(IsFileLocked(path));
}

TEST_F(SqliteLookupLockTest, InATransactionTheLookupEndsFirst)
{
    ASSERT_TRUE(db.Exec("BEGIN"));
    EXPECT_TRUE(Select(db));
    EXPECT_EQ(steps, Steps{OwnLock});  // the transaction's
    ASSERT_TRUE(db.Exec("COMMIT"));
    EXPECT_FALSE(IsFileLocked(path));
}

// Its callback could not write to the file with another connection.
TEST_F(SqliteLookupLockTest, ASelectFromATemporaryTableGetsNoLock)
{
    ASSERT_TRUE(db.Exec("CREATE TEMP TABLE jobs (id); INSERT INTO jobs VALUES (7)"));
    int rows = 0;
    ASSERT_TRUE(db.SelectEach(command, [&](const SqliteRow&) {
        EXPECT_FALSE(IsFileLocked(path));
        return ++rows > 0;
    }));
    EXPECT_EQ(rows, 1);
}

TEST_F(SqliteLookupLockTest, OnlyTheFirstAttemptGetsTheLock)
{
    failures = 2;
    pauses.OnPause([this](std::size_t) { EXPECT_FALSE(IsFileLocked(path)); });
    EXPECT_TRUE(Select(retrying));
    EXPECT_EQ(steps, (Steps{TakenOver, NoLock, NoLock}));
    ExpectPauses(2);
    EXPECT_EQ(TakeLines().size(), 1U);
}

// Whether the file was locked when each line was logged.
const std::string* fileOfLines = nullptr;
std::vector<bool>* lockedAtLines = nullptr;

void NoteLock(int priority, const char* format, std::va_list arguments)
{
    lockedAtLines->push_back(IsFileLocked(*fileOfLines));
    DropLine(priority, format, arguments);
}

TEST_F(SqliteLookupLockTest, TheLockIsGivenBackBeforeAnythingIsLogged)
{
    std::vector<bool> locked;
    fileOfLines = &path;
    lockedAtLines = &locked;
    SendLogTo(NoteLock);

    command.SetCondition("size=1");  // there is no such column
    EXPECT_FALSE(Select(db));
    EXPECT_EQ(db.GetErr()[0]["err_msg"]["sqlite_errmsg"].asString(), "no such column: size");
    std::vector<SqliteValueList> records;
    EXPECT_FALSE(db.SelectRecords(command, records));
    EXPECT_FALSE(db.SelectEach(command, [](const SqliteRow&) { return true; }));
    EXPECT_FALSE(db.SelectEach(command, nullptr));
    EXPECT_EQ(db.GetErrCode(), 401);
    command.SetCondition("id=1");
    failures = 1;
    EXPECT_FALSE(Select(db));
    EXPECT_EQ(steps, Steps{TakenOver});
    EXPECT_EQ(locked, std::vector<bool>(10, false));  // two lines for each
}

// A command whose text is made by the caller's code.
class Derived : public SelectCommand {
  public:
    explicit Derived(const std::string& path) : path_(path) {}

    std::string GetCommand() const override
    {
        EXPECT_FALSE(IsFileLocked(path_));
        return "INSERT INTO jobs VALUES (3) RETURNING id";
    }

  private:
    const std::string path_;
};

TEST_F(SqliteLookupLockTest, ADerivedCommandGetsNoLock)
{
    Derived insert(path);
    insert.SetTable(command.GetTable());
    insert.AddField("id");
    watched = insert.GetCommand();
    SqliteValueList record;
    EXPECT_TRUE(db.SelectRecord(insert, record));
    EXPECT_EQ(record.ToStr(), "id:3");
    EXPECT_EQ(steps, Steps{NoLock});
    EXPECT_EQ(Run("SELECT count(*) FROM jobs"), "3");
}

TEST_F(SqliteLookupLockTest, TheCallbackMayDoAllThatItCouldDo)
{
    int rows = 0;
    EXPECT_TRUE(db.SelectEach(command, [&](const SqliteRow&) {
        EXPECT_TRUE(Select(db));
        EXPECT_TRUE(db.IsTableExisted("jobs"));
        return ++rows < 2;
    }));
    EXPECT_EQ(rows, 2);
    EXPECT_FALSE(IsFileLocked(path));
    const auto fail = [](const SqliteRow&) -> bool { throw std::runtime_error("enough"); };
    EXPECT_THROW((void)db.SelectEach(command, fail), std::runtime_error);
    EXPECT_FALSE(IsFileLocked(path));
    EXPECT_TRUE(db.SelectEach(command, [&](const SqliteRow&) {
        db.Close();
        return false;
    }));
    EXPECT_FALSE(IsFileLocked(path));
}

TEST_F(SqliteLookupLockTest, AnotherProcessCanWriteBetweenTwoSelects)
{
    for (int id = 3; id < 6; ++id) {
        EXPECT_TRUE(Select(db));
        ChildProcess other([&](ChildProcess::Link&) {
            PlainDb(path).Run("INSERT INTO jobs VALUES (" + std::to_string(id) + ")");
        });
        EXPECT_EQ(other.Join(), 0);
    }
    std::vector<SqliteValueList> records;
    EXPECT_TRUE(db.SelectRecords(command, records));
    EXPECT_EQ(records.size(), 5U);
}

TEST_F(SqliteLookupLockTest, ALookupWaitsOnceForALockAndNamesItsQuery)
{
    const LockHolder holder(path);
    pauses.OnWait([](std::size_t) {});
    EXPECT_FALSE(db.IsTableExisted("jobs"));
    const std::int64_t waited =
        std::accumulate(pauses.Waits().begin(), pauses.Waits().end(), std::int64_t{0});
    EXPECT_GE(waited, 1'000'000);
    EXPECT_LE(waited, 1'100'000);
    const Failure busy{LookFor("jobs"), SQLITE_BUSY, Locked};
    ExpectErr(db, 404, TriesText(busy));
    EXPECT_EQ(db.GetSqliteCode(), SQLITE_BUSY);
    EXPECT_EQ(db.GetAffectedRows(), 0);
    ExpectLines({ManyRowsGaveUp(busy)});
}

TEST_F(SqliteLookupLockTest, ALookupIsRepeatedWhileTheFileIsLocked)
{
    LockHolder holder(path);
    pauses.OnPause([&](std::size_t number) {
        if (number == 2) holder.Release();
    });
    EXPECT_TRUE(Select(retrying));
    const Failure busy{LookFor("jobs"), SQLITE_BUSY, Locked};
    ExpectErr(retrying, 0);
    ExpectLines({Info("SelectByCommand",
                      "After retry [2] times, success to select command, previous errs [" +
                          TriesText(busy, 2) + "]")});
    ExpectPauses(2);
    EXPECT_EQ(steps, Steps{NoLock});  // that of the lookup would have been held while it logged
}

}  // namespace
