// Prints what connections, records and other objects take of the heap, one a line: name, bytes, and the
// most that is allowed, or nothing, separated by tabs. scripts/bench --size runs this with
// GLIBC_TUNABLES=glibc.malloc.tcache_count=0, because malloc counts what it keeps for a thread as used.
#include <malloc.h>
#include <orvadrcore/cache.h>
#include <orvadrcore/file_lock.h>
#include <orvadrcore/request.h>
#include <orvadrcore/response.h>
#include <orvadrcore/sqlite_db.h>

#include <algorithm>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <memory>
#include <string>
#include <vector>

#include "support/bench.h"
#include "support/by_hand.h"

namespace {

using Bench::Require;
using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteOrder;
using OrvaDRCore::SqliteRow;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;

constexpr std::size_t BytesPerKiB = 1024;
constexpr const char* MostOfConnection = "65536";
constexpr int ManyTables = 128;  // as many as a connection remembers

std::size_t Heap()
{
    const struct mallinfo2 info = ::mallinfo2();
    return info.uordblks + info.hblkhd;
}

void Print(const char* what, std::size_t bytes, const char* target = "")
{
    std::printf("%s\t%zu\t%s\n", what, bytes, target);
}

// What an object takes, with all that it owns.
template <class Make>
std::size_t SizeOf(const Make& make)
{
    const std::size_t before = Heap();
    const auto object = make();
    return Heap() - before;
}

template <class Type, class... Arguments>
std::size_t SizeOfNew(const Arguments&... arguments)
{
    return SizeOf([&] { return std::make_unique<Type>(arguments...); });
}

SqliteValueList MakeNode(int id)
{
    SqliteValueList node;
    node.AddValue("id", id);
    node.AddValue("name", SqliteValue::Text("node " + std::to_string(id)));
    node.AddValue("address", SqliteValue::Text("192.168.100.100"));
    node.AddValue("size", SqliteValue::Integer(5'000'000'000));
    node.AddValue("load", SqliteValue::Real(0.25));
    return node;
}

// The statements on one table, each of another shape.
struct Statements {
    explicit Statements(int number)
        : table("replication_volumes_" + std::to_string(number),
                "id INTEGER PRIMARY KEY, name TEXT, address TEXT, size INTEGER, load REAL")
    {
        insert.SetTable(table);
        insert.SetFieldValues(MakeNode(1));
        byKey.SetTable(table);
        byKey.SelectAll();
        byKey.SetCondition(condition);
        sorted.SetTable(table);
        for (const char* field : {"id", "name", "size"}) sorted.AddField(field);
        sorted.OrderBy("name", SqliteOrder::Descending);
        sorted.Limit(20);
        update.SetTable(table);
        update.AddFieldValue("name", "renamed");
        update.AddFieldValue("load", SqliteValue::Real(0.5));
        update.SetCondition(condition);
    }

    SqliteTableHandler table;
    InsertCommand insert;
    SelectCommand byKey;
    SelectCommand sorted;
    UpdateCommand update;
    std::string condition = "id>0";
};

void Use(SqliteDB& db, const Statements& use)
{
    std::vector<SqliteValueList> rows;
    const auto take = [](const SqliteRow& /*row*/) { return true; };
    Require(db.InsertRecord(use.insert) && db.SelectRecords(use.byKey, rows) &&
                db.SelectEach(use.sorted, take) && db.UpdateRecord(use.update) &&
                db.InsertRecords(use.table, {MakeNode(2), MakeNode(3)}) &&
                db.DeleteRecord(use.condition, use.table),
            "a statement failed");
}

void Use(const Bench::Database& db, const Statements& use)
{
    const auto insert = [&](int id) {
        InsertCommand command;
        command.SetTable(use.table);
        command.SetFieldValues(MakeNode(id));
        Bench::ExecText(db.get(), command.GetCommand());
    };
    Bench::ExecText(db.get(), "CREATE TABLE IF NOT EXISTS " + use.table.GetName() + " (" +
                                  use.table.GetSchema() + ");");
    insert(1);
    Bench::ExecText(db.get(), use.byKey.GetCommand());
    Bench::ExecText(db.get(), use.sorted.GetCommand());
    Bench::ExecText(db.get(), use.update.GetCommand());
    Bench::ExecText(db.get(), "BEGIN IMMEDIATE");
    insert(2);
    insert(3);
    Bench::ExecText(db.get(), "COMMIT");
    Bench::ExecText(db.get(), "DELETE FROM " + use.table.GetName() + " WHERE " + use.condition);
}

// What a connection takes after its statements on that many tables. They exist before, because a
// connection that creates a table forgets the others.
template <class Open>
std::size_t SizeOfConnection(int tables, const Open& open)
{
    const Bench::TempDir dir(Bench::Place::Memory);
    const auto use = [&] {
        auto db = open(dir.File("nodes.db"));
        for (int table = 0; table < tables; ++table) Use(db, Statements(table));
        return db;
    };
    use();
    return SizeOf(use);
}

std::size_t SizeOfOurs(int tables)
{
    return SizeOfConnection(tables, [](const std::string& path) { return SqliteDB(path, 0); });
}

std::size_t SizeOfBare(int tables)
{
    return SizeOfConnection(tables,
                            [](const std::string& path) { return Bench::OpenDatabase(path); });
}

void PrintConnections()
{
    SizeOfOurs(1);  // SQLite and the C library keep some memory after their first use
    SizeOfBare(1);
    const auto beyond = [](int tables) {
        const std::size_t bare = SizeOfBare(tables);
        return std::max(SizeOfOurs(tables), bare) - bare;
    };
    Print("SqliteDB that is closed", SizeOfNew<SqliteDB>("/var/dr/nodes.db", 0U));
    Print("connection after 1 table, beyond SQLite's own", beyond(1));
    Print("connection after 128 tables, beyond SQLite's own", beyond(ManyTables), MostOfConnection);
    Print("connection after 128 tables, SQLite's own", SizeOfBare(ManyTables));
}

class Status : public OrvaDRCore::Cache {
  public:
    explicit Status(const std::string& dir) : Cache(dir, "status", 30, false, 0) {}
    Json::Value GetInfo() const override { return "status"; }
    bool GetUpdatedData(Json::Value& /*data*/) const override { return false; }
    bool IsValidData(const Json::Value& /*data*/) const override { return true; }
};

void PrintObjects()
{
    const Json::Value document = Bench::MakeDocument(BytesPerKiB);
    const Bench::TempDir dir(Bench::Place::Memory);
    Print("SqliteValue, an integer", SizeOfNew<SqliteValue>(7));
    Print("SqliteValue, a text of 20 bytes", SizeOfNew<SqliteValue>("a text of 20 bytes.."));
    Print("record of 5 fields", SizeOfNew<SqliteValueList>(MakeNode(1)));
    Print("rows of 5 fields in a vector, each",
          SizeOf([] { return std::vector<SqliteValueList>(BytesPerKiB, MakeNode(1)); }) /
              BytesPerKiB);
    Print("JSON document of 1 KB, which the next three hold", SizeOfNew<Json::Value>(document));
    Print("Cache that holds it", SizeOf([&] {
              auto cache = std::make_unique<Status>(dir.Path());
              Require(cache->UpdateWithData(document), "cannot write the cache");
              return cache;
          }));
    Print("Request with it as parameters",
          SizeOfNew<OrvaDRCore::Request>("DR.Node", 1, "get", document));
    Print("Response with it", SizeOfNew<OrvaDRCore::Response>(document));
    Print("FileLock", SizeOfNew<OrvaDRCore::FileLock>("nodes"));
}

}  // namespace

int main()
{
    try {
        const char* tunables = std::getenv("GLIBC_TUNABLES");  // NOLINT(concurrency-mt-unsafe)
        Require(tunables != nullptr, "GLIBC_TUNABLES is not set");
        PrintConnections();
        PrintObjects();
    } catch (const std::exception& failure) {
        (void)std::fprintf(stderr, "orvadr_size: %s\n", failure.what());
        return 1;
    }
}
