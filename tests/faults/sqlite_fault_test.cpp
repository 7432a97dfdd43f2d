// Every operation of SqliteDB, with every call failing once: system calls, allocations, and
// SQLite's file accesses in both journal modes.
#include <json/writer.h>  // for the messages of failed checks
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_db.h>
#include <orvadrcore/sqlite_transaction.h>

#include <filesystem>

#include "fault.h"
#include "faulty_vfs.h"
#include "support/fixtures/plain_db.h"
#include "support/fixtures/temp_dir.h"

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteRow;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteTransaction;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;

namespace {

const SqliteTableHandler Nodes("nodes", "id INTEGER PRIMARY KEY, name TEXT");
const SqliteTableHandler Others("others", "id INTEGER");

// Without a schema there is no table lookup, at which SQLite could end a transaction.
const SqliteTableHandler ExistingNodes("nodes", "");

// A text that fills more than a page of the file.
std::string Long(char letter)
{
    return std::string(5000, letter);
}

SqliteValueList Record(int id, char letter)
{
    SqliteValueList record;
    record.AddValue("id", id);
    record.AddValue("name", Long(letter));
    return record;
}

// With ids from `first` on. Not by braces: g++ 11 leaks what they hold if a copy fails.
std::vector<SqliteValueList> Records(int first, const std::string& letters)
{
    std::vector<SqliteValueList> records;
    for (const char letter : letters) records.push_back(Record(first++, letter));
    return records;
}

InsertCommand InsertOf(int id, char letter)
{
    InsertCommand insert;
    insert.SetTable(Nodes);
    insert.SetFieldValues(Record(id, letter));
    return insert;
}

UpdateCommand UpdateOfAll(char letter, const SqliteTableHandler& table)
{
    UpdateCommand update;
    update.SetTable(table);
    update.AddFieldValue("name", Long(letter));
    update.SetCondition("id > 0");
    return update;
}

// What is in the file before each operation: the ids, and the letters of the texts.
const char* const Before = "1a,2b,3c";

struct Operation {
    const char* name;
    std::function<bool(SqliteDB&)> run;
    std::string after;   // what is in the file afterwards
    bool opens = false;  // calls Open(), whose failure leaves the error code unchanged
};

bool CommitWork(SqliteDB& db)
{
    SqliteTransaction transaction(db);
    return transaction.Begin() && db.UpdateRecord(UpdateOfAll('x', ExistingNodes)) &&
           db.InsertRecords(ExistingNodes, Records(4, "xx")) &&
           db.DeleteRecord("id=1", ExistingNodes) && transaction.Commit();
}

// Each statement runs twice: when it was just prepared, and when it was cached.
bool CommitCachedWork(SqliteDB& db)
{
    SqliteTransaction transaction(db);
    if (!transaction.Begin()) return false;
    for (const int id : {4, 5}) {
        InsertCommand insert = InsertOf(id, 'd');
        insert.SetTable(ExistingNodes);
        if (!db.InsertRecord(insert)) return false;
    }
    for (const std::string id : {"2", "3"}) {
        SqliteValueList record;
        if (!db.SelectByCommand("SELECT id FROM nodes WHERE id=" + id, record)) return false;
        EXPECT_EQ(record.ToStr(), "id:" + id);
        if (!db.DeleteRecord("id=" + id, ExistingNodes)) return false;
    }
    return transaction.Commit();
}

bool RollBackWork(SqliteDB& db)
{
    SqliteTransaction transaction(db);
    return transaction.Begin() && db.UpdateRecord(UpdateOfAll('x', ExistingNodes)) &&
           transaction.Rollback();
}

bool AbandonWork(SqliteDB& db)
{
    SqliteTransaction transaction(db);
    return transaction.Begin() && db.UpdateRecord(UpdateOfAll('x', ExistingNodes));
}

bool Select(SqliteDB& db)
{
    SelectCommand select;
    select.SetTable(Nodes);
    select.SelectAll();
    std::vector<SqliteValueList> records;
    if (!db.SelectRecords(select, records)) return false;
    EXPECT_GE(records.size(), 3U);
    SqliteValueList record;
    record.AddValue("old", 1);
    const bool isRead = db.SelectRecord(select, record);
    EXPECT_EQ(record.HasField("old"), !isRead);
    return isRead;
}

bool SelectEach(SqliteDB& db)
{
    SelectCommand select;
    select.SetTable(Nodes);
    select.SelectAll();
    int rows = 0;
    bool isWhole = true;
    const bool isRead = db.SelectEach(select, [&](const SqliteRow& row) {
        std::string name;
        isWhole = row.GetValue("name", name) && isWhole;
        EXPECT_TRUE(name.empty() || name.size() == Long('a').size());
        ++rows;
        return true;
    });
    if (isRead) {
        EXPECT_TRUE(isWhole);
        EXPECT_EQ(rows, 3);
    }
    return isRead;
}

bool InsertWithRow(SqliteDB& db)
{
    SqliteValueList record;
    record.AddValue("old", 1);
    const std::string insert = "INSERT INTO nodes VALUES (4,'" + Long('d') + "') RETURNING id";
    const bool isInserted = db.Open() && db.SelectByCommand(insert, record);
    EXPECT_EQ(record.ToStr(), isInserted ? "id:4" : "old:1");
    return isInserted;
}

const std::vector<Operation>& Operations()
{
    static const std::vector<Operation> operations{
        {"Open", [](SqliteDB& db) { return db.Open(); }, Before, true},
        {"InsertRecord", [](SqliteDB& db) { return db.InsertRecord(InsertOf(4, 'd')); },
         "1a,2b,3c,4d"},
        {"InsertRecords", [](SqliteDB& db) { return db.InsertRecords(Nodes, Records(4, "def")); },
         "1a,2b,3c,4d,5e,6f"},
        {"UpdateRecord", [](SqliteDB& db) { return db.UpdateRecord(UpdateOfAll('x', Nodes)); },
         "1x,2x,3x"},
        {"SelectRecords and SelectRecord", Select, Before},
        {"SelectEach", SelectEach, Before},
        {"DeleteRecord", [](SqliteDB& db) { return db.DeleteRecord("id=2", Nodes); }, "1a,3c"},
        {"DeleteAllRecords", [](SqliteDB& db) { return db.DeleteAllRecords(Nodes); }, ""},
        {"Exec", [](SqliteDB& db) { return db.Open() && db.Exec("DELETE FROM nodes WHERE id=3"); },
         "1a,2b", true},
        {"SelectByCommand of an INSERT with RETURNING", InsertWithRow, "1a,2b,3c,4d", true},
        {"CreateTable", [](SqliteDB& db) { return db.Open() && db.CreateTable(Others); }, Before,
         true},
        {"Upgrade",
         [](SqliteDB& db) {
             return db.Upgrade({"UPDATE nodes SET name='" + Long('x') +
                                "' WHERE id<3; DELETE FROM nodes WHERE id=1"});
         },
         "2x,3c"},
        {"a transaction that is committed", CommitWork, "2x,3x,4x,5x"},
        {"a transaction of cached statements", CommitCachedWork, "1a,4d,5d"},
        {"a transaction that is rolled back", RollBackWork, Before},
        {"a transaction that is abandoned", AbandonWork, Before},
    };
    return operations;
}

// The initial files, one for each journal mode.
class Originals {
  public:
    Originals()
    {
        for (const char* mode : {"delete", "wal"}) {
            PlainDb db(Of(mode));
            db.Run(
                "PRAGMA synchronous = OFF; CREATE TABLE nodes (id INTEGER PRIMARY KEY, name TEXT)");
            db.Run("PRAGMA journal_mode = " + std::string(mode));
            for (const char letter : {'a', 'b', 'c'}) {
                db.Run("INSERT INTO nodes (name) VALUES ('" + Long(letter) + "')");
            }
        }
    }
    std::string Of(const std::string& mode) const { return dir_.File(mode + ".db"); }

  private:
    TempDir dir_;
};

std::string Content(const std::string& path)
{
    PlainDb db(path);
    EXPECT_EQ(db.Run("PRAGMA integrity_check"), "ok");
    const std::string rows = db.Run(
        "SELECT group_concat(id || substr(name,1,1)) FROM (SELECT * FROM nodes ORDER BY id)"
        " WHERE length(name) = 5000");
    return rows == "NULL" ? "" : rows;
}

// Afterwards the file holds the old content or the whole change. After a success it holds the
// change.
void TryOnce(const Operation& operation, const std::string& original, unsigned int retries)
{
    const TempDir dir;
    const std::string path = dir.File("test.db");
    std::filesystem::copy_file(original, path);
    SqliteDB db(path, retries);
    const Outcome outcome = WithFault([&] { return operation.run(db); });
    outcome.ExpectLogged();
    EXPECT_TRUE(outcome.succeeded || outcome.threw || db.GetErrCode() != 0 || operation.opens);

    const std::string content = Content(path);
    EXPECT_TRUE(content == Before || content == operation.after) << content;
    if (outcome.succeeded) {
        EXPECT_EQ(content, operation.after);
    }

    // A file that SQLite could not open for writing stays open for reading only.
    if (IsFailing(Call::Open)) db.Close();
    if (content == Before) {
        EXPECT_TRUE(operation.run(db)) << db.GetErr()[0U]["err_msg"]["sqlite_errmsg"];
        EXPECT_EQ(Content(path), operation.after);
    }
    EXPECT_TRUE(db.Open() && db.Exec("DELETE FROM nodes")) << "the connection is unusable";
    EXPECT_EQ(Content(path), "");
}

}  // namespace

// One test for each operation, so that they can run in parallel.
class DatabaseFaults : public ::testing::TestWithParam<std::size_t> {
  protected:
    const Operation& operation = Operations()[GetParam()];
    const Originals originals;
};

TEST_P(DatabaseFaults, SystemCallsAndAllocations)
{
    EveryCallFails(std::string("SqliteDB: ") + operation.name,
                   [&] { TryOnce(operation, originals.Of("delete"), 0); });
}

TEST_P(DatabaseFaults, FileAccesses)
{
    const FaultyVfs vfs;
    for (const char* mode : {"delete", "wal"}) {
        for (const unsigned int retries : {0U, 2U}) {
            const std::string words = std::string(", journal ") + mode + ", retries ";
            EveryDatabaseCallFails(operation.name + words + std::to_string(retries),
                                   [&] { TryOnce(operation, originals.Of(mode), retries); });
        }
    }
}

INSTANTIATE_TEST_SUITE_P(Operations, DatabaseFaults,
                         ::testing::Range(std::size_t{0}, Operations().size()));
