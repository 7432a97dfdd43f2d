// Processes that are killed before each of their system calls in turn, at work on a database, a
// file, a cache or a lock. What they have answered holds, what they have begun is done whole or not
// at all, and whoever comes next finds nothing in the way.
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
    // What the process has done so far, as it said itself.
    SharedMemory<std::atomic<int>> answered;
};

// ------------------------------------------------------------------------------------ databases

const SqliteTableHandler& Notes()
{
    static const SqliteTableHandler table("notes", "id INTEGER PRIMARY KEY, text TEXT");
    return table;
}

// So long that some records fill a page of the file.
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

// In both of SQLite's ways to keep what is not complete: the rollback journal, which the library
// leaves as it is, and the write-ahead log, which a file may have been set to.
class DbCrashTest : public CrashTest, public ::testing::WithParamInterface<const char*> {
  protected:
    using Contents = std::map<int, std::string>;  // texts by id

    // A single try waits a second at most, and for the dead nobody has to wait longer.
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
        *answered = 0;
        std::filesystem::copy_file(dir.File("before"), Path(),
                                   std::filesystem::copy_options::overwrite_existing);
    }

    // What a new process finds. The file is whole.
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

    // The next writer has its way at once, and no file of SQLite's outlasts it.
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

TEST_P(DbCrashTest, WhatWasInsertedIsThere)
{
    constexpr int Last = 6;
    const auto insertAll = [this] {
        SqliteDB db(Path(), SingleTry);
        for (int id = 4; id <= Last; ++id) {
            if (Insert(db, id)) *answered = id;
        }
    };
    KillEverywhere({[this] { Restore(); }, insertAll,
                    [this] {
                        const int last = std::max<int>(*answered, 3);
                        EXPECT_THAT(Find(), AnyOf(Records(1, last), Records(1, last + 1)));
                        ExpectNextWriter();
                    }});
    EXPECT_EQ(*answered, Last);
}

TEST_P(DbCrashTest, ManyInsertedAtOnceAreAllThereOrNone)
{
    constexpr int Last = 200;
    const Contents all = Records(1, Last);
    const auto insertAll = [this] {
        std::vector<SqliteValueList> records;
        for (int id = 4; id <= Last; ++id) records.push_back(RecordOf(id));
        SqliteDB db(Path(), SingleTry);
        if (db.InsertRecords(Notes(), records)) *answered = Last;
    };
    KillEverywhere({[this] { Restore(); }, insertAll,
                    [&] {
                        const Contents before = *answered == Last ? all : Records(1, 3);
                        EXPECT_THAT(Find(), AnyOf(before, all));
                        ExpectNextWriter();
                    }});
    EXPECT_EQ(*answered, Last);
}

TEST_P(DbCrashTest, ATransactionHappensWholeOrNotAtAll)
{
    Contents after = Records(1, 4);
    after.erase(1);
    after[2] = "other";
    const auto change = [this] {
        SqliteDB db(Path(), SingleTry);
        SqliteTransaction transaction(db);
        const bool done = transaction.Begin() && Delete(db, 1) && Update(db, 2, "other") &&
                          Insert(db, 4) && transaction.Commit();
        if (done) *answered = 1;
    };
    KillEverywhere({[this] { Restore(); }, change,
                    [&] {
                        EXPECT_THAT(Find(), AnyOf(*answered == 1 ? after : Records(1, 3), after));
                        ExpectNextWriter();
                    }});
    EXPECT_EQ(*answered, 1);
}

// Here it is the file itself that is made, and then the table.
TEST_F(CrashTest, ADatabaseThatWasBeingMadeIsMadeByTheNext)
{
    const std::string path = dir.File("new.db");
    const auto insert = [&](int id) {
        SqliteDB db(path, 0);
        return Insert(db, id);
    };
    const auto removeAll = [&] {
        *answered = 0;
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
        EXPECT_THAT(rows, AnyOf(*answered == 1 ? 2 : 1, 2));
        EXPECT_THAT(Files(), ElementsAre("new.db"));
    };
    KillEverywhere({removeAll, [&] { *answered = insert(1) ? 1 : 0; }, inspect});
    EXPECT_EQ(*answered, 1);
}

// ---------------------------------------------------------------------------------------- files

// Somebody replaces an old document by a new one; the next makes it a later one and leaves nothing
// else behind.
class FileCrashTest : public CrashTest {
  protected:
    void KillWriters(const std::function<bool(int)>& write, const std::function<int()>& number)
    {
        const auto prepare = [&] {
            *answered = Old;
            EXPECT_TRUE(write(Old));
        };
        const auto replace = [&] {
            if (write(New)) *answered = New;
        };
        const auto inspect = [&] {
            EXPECT_THAT(number(), AnyOf(answered->load(), New));
            EXPECT_TRUE(write(Later));
            EXPECT_EQ(number(), Later);
            EXPECT_EQ(Files().size(), 1U);
        };
        KillEverywhere({prepare, replace, inspect});
        EXPECT_EQ(*answered, New);
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

// The lock's directory is made by a program, which is killed in its turn.
TEST_F(CrashTest, ALockIsFreeWhereverItsHolderIsKilled)
{
    if (!HasLocks()) return;
    const auto lockTwice = [this] {
        FileLock lock(LockName());
        if (!lock.lock(LOCK_EX, 0)) return;
        ++*answered;
        lock.unlock();
        if (lock.lock(LOCK_SH, 0)) ++*answered;
    };
    KillEverywhere({[this] {
                        *answered = 0;
                        RemoveLocks();
                    },
                    lockTwice,
                    [this] { EXPECT_TRUE(FileLock(LockName()).lock(LOCK_EX | LOCK_NB, 0)); }});
    EXPECT_EQ(*answered, 2);
}

}  // namespace
