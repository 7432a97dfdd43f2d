// A process works on a database, a file, a cache or a lock, and is killed before each of its system
// calls in turn. What it reported as done is done, what it had begun is done completely or not at
// all, and the next process is not held up.
#include <gmock/gmock.h>
#include <sys/file.h>

#include <algorithm>
#include <atomic>
#include <filesystem>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include <orvadrcore/file.h>
#include <orvadrcore/file_lock.h>
#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_db.h>
#include <orvadrcore/sqlite_transaction.h>

#include "base/json_helpers.h"
#include "support/fixtures/process_test.h"
#include "support/processes/kills.h"
#include "support/processes/shared_memory.h"

namespace {

using OrvaDRCore::File;
using OrvaDRCore::FileLock;
using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteTransaction;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;
using ::testing::AnyOf;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::Key;

constexpr int Old = 1;
constexpr int New = 2;
constexpr int Later = 3;

class CrashTest : public ProcessTest {
  protected:
    // What the process has reported as done.
    SharedMemory<std::atomic<int>> done;
};

// ------------------------------------------------------------------------------------ databases

const SqliteTableHandler& Notes()
{
    static const SqliteTableHandler table("notes", "id INTEGER PRIMARY KEY, text TEXT");
    return table;
}

// Long enough for a few records to fill a page of the file.
std::string TextOf(int id)
{
    return std::to_string(id) + std::string(200, static_cast<char>('a' + id % 26));
}

SqliteValueList RecordOf(int id)
{
    SqliteValueList record;
    record.AddValue("id", id);
    record.AddValue("text", TextOf(id));
    return record;
}

bool Insert(SqliteDB& db, int id)
{
    InsertCommand insert;
    insert.SetTable(Notes());
    insert.SetFieldValues(RecordOf(id));
    return db.InsertRecord(insert);
}

bool Update(SqliteDB& db, int id, const std::string& text)
{
    UpdateCommand update;
    update.SetTable(Notes());
    update.AddFieldValue("text", text);
    update.SetCondition(SqliteEqual("id", id));
    return db.UpdateRecord(update);
}

bool Delete(SqliteDB& db, int id)
{
    return db.DeleteRecord(SqliteEqual("id", id).GetCondition(), Notes());
}

void ExpectIntact(SqliteDB& db)
{
    SqliteValueList verdict;
    EXPECT_TRUE(db.SelectByCommand("PRAGMA integrity_check", verdict));
    EXPECT_EQ(verdict.ToStr(), "integrity_check:'ok'");
}

// In both of SQLite's modes: the rollback journal, which is the default, and the write-ahead log,
// to which a file may have been set.
class DbCrashTest : public CrashTest, public ::testing::WithParamInterface<const char*> {
  protected:
    using Contents = std::map<int, std::string>;  // texts by id

    // One attempt waits at most a second. No longer wait may be needed because of a dead process.
    static constexpr unsigned int SingleTry = 0;
    static constexpr int NextId = 1000;

    DbCrashTest()
    {
        SqliteDB db(dir.File("before"), SingleTry);
        SqliteValueList mode;
        const std::string pragma = "PRAGMA journal_mode=" + std::string(GetParam());
        EXPECT_TRUE(db.Open() && db.SelectByCommand(pragma, mode));
        EXPECT_TRUE(Insert(db, 1) && Insert(db, 2) && Insert(db, 3));
    }

    std::string Path() const { return dir.File("notes.db"); }

    void Restore()
    {
        *done = 0;
        std::filesystem::copy_file(dir.File("before"), Path(),
                                   std::filesystem::copy_options::overwrite_existing);
    }

    // The content as a new process finds it. The file must be intact.
    Contents Find() const
    {
        SqliteDB db(Path(), SingleTry);
        EXPECT_TRUE(db.Open());
        ExpectIntact(db);
        SelectCommand select;
        select.SetTable(Notes());
        select.SelectAll();
        std::vector<SqliteValueList> rows;
        EXPECT_TRUE(db.SelectRecords(select, rows));
        Contents contents;
        for (const SqliteValueList& row : rows) {
            int id = 0;
            EXPECT_TRUE(row.GetValue("id", id) && row.GetValue("text", contents[id]));
        }
        EXPECT_EQ(contents.size(), rows.size());
        return contents;
    }

    static Contents Records(int first, int last)
    {
        Contents contents;
        for (int id = first; id <= last; ++id) contents[id] = TextOf(id);
        return contents;
    }

    // The next writer succeeds at once and leaves none of SQLite's extra files behind.
    void ExpectNextWriter()
    {
        {
            SqliteDB db(Path(), SingleTry);
            EXPECT_TRUE(Insert(db, NextId));
        }
        EXPECT_THAT(Find(), Contains(Key(NextId)));
        EXPECT_THAT(Files(), ElementsAre("before", "notes.db"));
    }
};

INSTANTIATE_TEST_SUITE_P(Journals, DbCrashTest, ::testing::Values("DELETE", "WAL"),
                         [](const auto& parameter) { return std::string(parameter.param); });

TEST_P(DbCrashTest, InsertedRecordsAreThere)
{
    constexpr int Last = 6;
    const auto insertAll = [this] {
        SqliteDB db(Path(), SingleTry);
        for (int id = 4; id <= Last; ++id) {
            if (Insert(db, id)) *done = id;
        }
    };
    KillEverywhere({[this] { Restore(); }, insertAll,
                    [this] {
                        const int last = std::max<int>(*done, 3);
                        EXPECT_THAT(Find(), AnyOf(Records(1, last), Records(1, last + 1)));
                        ExpectNextWriter();
                    }});
    EXPECT_EQ(*done, Last);
}

TEST_P(DbCrashTest, InsertRecordsInsertsAllOrNone)
{
    constexpr int Last = 200;
    const Contents all = Records(1, Last);
    const auto insertAll = [this] {
        std::vector<SqliteValueList> records;
        for (int id = 4; id <= Last; ++id) records.push_back(RecordOf(id));
        SqliteDB db(Path(), SingleTry);
        if (db.InsertRecords(Notes(), records)) *done = Last;
    };
    KillEverywhere({[this] { Restore(); }, insertAll,
                    [&] {
                        const Contents before = *done == Last ? all : Records(1, 3);
                        EXPECT_THAT(Find(), AnyOf(before, all));
                        ExpectNextWriter();
                    }});
    EXPECT_EQ(*done, Last);
}

TEST_P(DbCrashTest, ATransactionIsDoneCompletelyOrNotAtAll)
{
    Contents after = Records(1, 4);
    after.erase(1);
    after[2] = "other";
    const auto change = [this] {
        SqliteDB db(Path(), SingleTry);
        SqliteTransaction transaction(db);
        const bool succeeded = transaction.Begin() && Delete(db, 1) && Update(db, 2, "other") &&
                               Insert(db, 4) && transaction.Commit();
        if (succeeded) *done = 1;
    };
    KillEverywhere({[this] { Restore(); }, change,
                    [&] {
                        EXPECT_THAT(Find(), AnyOf(*done == 1 ? after : Records(1, 3), after));
                        ExpectNextWriter();
                    }});
    EXPECT_EQ(*done, 1);
}

// The killed process creates the file, then the table.
TEST_F(CrashTest, TheNextProcessFinishesTheCreationOfADatabase)
{
    const std::string path = dir.File("new.db");
    const auto insert = [&](int id) {
        SqliteDB db(path, 0);
        return Insert(db, id);
    };
    const auto removeAll = [&] {
        *done = 0;
        for (const std::string& name : Files()) std::filesystem::remove(dir.File(name));
    };
    const auto inspect = [&] {
        EXPECT_TRUE(insert(2));
        SqliteDB db(path, 0);
        EXPECT_TRUE(db.Open());
        ExpectIntact(db);
        SqliteValueList row;
        EXPECT_TRUE(db.SelectByCommand("SELECT count(*) AS rows FROM notes", row));
        int rows = 0;
        EXPECT_TRUE(row.GetValue("rows", rows));
        EXPECT_THAT(rows, AnyOf(*done == 1 ? 2 : 1, 2));
        EXPECT_THAT(Files(), ElementsAre("new.db"));
    };
    KillEverywhere({removeAll, [&] { *done = insert(1) ? 1 : 0; }, inspect});
    EXPECT_EQ(*done, 1);
}

// ---------------------------------------------------------------------------------------- files

// The killed process replaces an old document with a new one. The next process replaces it with a
// later one and leaves no other file behind.
class FileCrashTest : public CrashTest {
  protected:
    void KillWriters(const std::function<bool(int)>& write, const std::function<int()>& number)
    {
        const auto prepare = [&] {
            *done = Old;
            EXPECT_TRUE(write(Old));
        };
        const auto replace = [&] {
            if (write(New)) *done = New;
        };
        const auto inspect = [&] {
            EXPECT_THAT(number(), AnyOf(done->load(), New));
            EXPECT_TRUE(write(Later));
            EXPECT_EQ(number(), Later);
            EXPECT_EQ(Files().size(), 1U);
        };
        KillEverywhere({prepare, replace, inspect});
        EXPECT_EQ(*done, New);
    }
};

TEST_F(FileCrashTest, AReplacedFileIsTheOldOrTheNewOne)
{
    const std::string path = dir.File("document");
    KillWriters([&](int number) { return OrvaDRCore::toFile(DocumentOf(number), path); },
                [&] {
                    Json::Value document;
                    return File::Read(path, document) ? NumberOf(document) : NoDocument;
                });
}

TEST_F(FileCrashTest, ACacheHoldsTheOldDocumentOrTheNewOne)
{
    KillWriters(
        [this](int number) {
            return MakeCache(Mode::Background, nullptr).UpdateWithData(DocumentOf(number));
        },
        [this] { return NumberInFile(); });
}

// ---------------------------------------------------------------------------------------- locks

// A program creates the lock directory. It is killed, too.
TEST_F(CrashTest, ALockIsFreeWhereverItsHolderWasKilled)
{
    if (!HasLocks()) return;
    const auto lockTwice = [this] {
        FileLock lock(LockName());
        if (!lock.lock(LOCK_EX, 0)) return;
        ++*done;
        lock.unlock();
        if (lock.lock(LOCK_SH, 0)) ++*done;
    };
    KillEverywhere({[this] {
                        *done = 0;
                        RemoveLocks();
                    },
                    lockTwice,
                    [this] { EXPECT_TRUE(FileLock(LockName()).lock(LOCK_EX | LOCK_NB, 0)); }});
    EXPECT_EQ(*done, 2);
}

}  // namespace
