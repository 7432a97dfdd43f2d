// How the cost grows with the number of rows, columns, tables in the file, and values in a list.
#include <sqlite3.h>

#include <numeric>

#include <orvadrcore/sqlite_condition.h>

#include "support/bench.h"
#include "support/engines.h"

namespace Bench {

namespace {

std::string ToText(int number)
{
    return std::to_string(number);
}

template <class Engine>
struct SelectRows {
    explicit SelectRows(int rows)
    {
        FillNodes(path, rows);
        engine = std::make_unique<Engine>(path);
    }
    void Run() { engine->SelectAll(); }
    std::string Result() { return engine->Selected(); }

    TempDir dir{Place::Memory};
    std::string path = dir.File("nodes.db");
    std::unique_ptr<Engine> engine;
};

// Inserts, in one transaction, into a file with that many tables.
template <class Engine>
struct InsertBesideTables {
    explicit InsertBesideTables(int tables)
    {
        FillNodes(path, 0, tables);
        engine = std::make_unique<Engine>(path);
        engine->Exec("BEGIN");
    }
    void Run()
    {
        ++node.id;
        engine->Insert(node);
    }
    std::string Result()
    {
        engine->Exec("COMMIT");
        return DumpNodes(path);
    }

    TempDir dir{Place::Memory};
    std::string path = dir.File("nodes.db");
    std::unique_ptr<Engine> engine;
    Node node = MakeNode(0);
};

// A hundred rows with that many numeric columns.
struct Wide {
    static constexpr int Rows = 100;

    explicit Wide(int count) : columns(count)
    {
        std::string schema;
        std::string values;
        for (int column = 0; column < columns; ++column) {
            if (column > 0) {
                schema += ',';
                values += ',';
            }
            schema += "c" + ToText(column) + " INTEGER";
            values += ToText(column);
        }
        const Database db = OpenDatabase(path);
        ExecText(db.get(), "CREATE TABLE wide (" + schema + ")");
        for (int row = 0; row < Rows; ++row) {
            ExecText(db.get(), "INSERT INTO wide VALUES (" + values + ")");
        }
    }

    TempDir dir{Place::Memory};
    std::string path = dir.File("wide.db");
    int columns;
};

struct OurWide : Wide {
    explicit OurWide(int count) : Wide(count) { Require(db.Open(), "cannot open"); }
    void Run()
    {
        rows.clear();
        Require(db.SelectByCommand("SELECT * FROM wide", rows), "cannot select");
    }
    std::string Result() const
    {
        long sum = 0;
        for (const auto& row : rows) {
            for (int column = 0; column < columns; ++column) {
                int number = 0;
                Require(row.GetValue("c" + ToText(column), number), "no column");
                sum += number;
            }
        }
        return std::to_string(sum) + " in " + std::to_string(rows.size());
    }

    OrvaDRCore::SqliteDB db{path, 0};
    std::vector<OrvaDRCore::SqliteValueList> rows;
};

struct BareWide : Wide {
    explicit BareWide(int count) : Wide(count), db(OpenDatabase(path))
    {
        select = Prepare(db.get(), "SELECT * FROM wide");
    }
    void Run()
    {
        rows.clear();
        while (sqlite3_step(select.get()) == SQLITE_ROW) {
            std::vector<int>& row = rows.emplace_back(static_cast<std::size_t>(columns));
            for (int column = 0; column < columns; ++column) {
                row[static_cast<std::size_t>(column)] = sqlite3_column_int(select.get(), column);
            }
        }
        sqlite3_reset(select.get());
    }
    std::string Result() const
    {
        long sum = 0;
        for (const auto& row : rows) sum = std::accumulate(row.begin(), row.end(), sum);
        return std::to_string(sum) + " in " + std::to_string(rows.size());
    }

    Database db;
    Statement select;
    std::vector<std::vector<int>> rows;
};

// Selects by a list of numbers from a table of 1,000 rows.
struct InList {
    explicit InList(int count) : ids(static_cast<std::size_t>(count))
    {
        std::iota(ids.begin(), ids.end(), 1);
        FillNodes(path, 1000);
    }

    TempDir dir{Place::Memory};
    std::string path = dir.File("nodes.db");
    std::vector<int> ids;
};

struct OurInList : InList {
    explicit OurInList(int count) : InList(count)
    {
        command.SetTable({"nodes", NodesSchema});
        command.AddField("id");
    }
    void Run()
    {
        const std::vector<OrvaDRCore::SqliteValue> values(ids.begin(), ids.end());
        command.SetCondition(OrvaDRCore::SqliteIn("id", values));
        rows.clear();
        Require(db.SelectRecords(command, rows), "cannot select");
    }
    std::string Result() const { return std::to_string(rows.size()); }

    OrvaDRCore::SelectCommand command;
    OrvaDRCore::SqliteDB db{path, 0};
    std::vector<OrvaDRCore::SqliteValueList> rows;
};

struct BareInList : InList {
    explicit BareInList(int count) : InList(count), db(OpenDatabase(path)) {}
    void Run()
    {
        std::string text = "SELECT id FROM nodes WHERE id IN (";
        for (const int id : ids) {
            AppendLiteral(text, id);
            text += ',';
        }
        text.back() = ')';
        const Statement select = Prepare(db.get(), text);
        rows.clear();
        while (sqlite3_step(select.get()) == SQLITE_ROW) {
            rows.push_back(sqlite3_column_int(select.get(), 0));
        }
    }
    std::string Result() const { return std::to_string(rows.size()); }

    Database db;
    std::vector<int> rows;
};

template <template <class> class Task>
void AddEngines(const std::string& item, int number, benchmark::IterationCount iterations = 0)
{
    AddBounded<Task<OurEngine>>({iterations}, item, Ours, number);
    AddBounded<Task<BareEngine>>({iterations}, item, Bare, number);
    AddBounded<Task<ContractEngine>>({iterations}, item, Contract, number);
}

}  // namespace

void AddCurves()
{
    constexpr double OfBoundInsert = 2.8;
    for (const int rows : {1000, 10'000, 100'000, 1'000'000}) {
        AddEngines<SelectRows>("select all of " + ToText(rows) + " rows", rows,
                               rows == 1'000'000 ? 1 : 0);
    }
    for (const int columns : {1, 5, 20, 200}) {
        const std::string item = "select 100 rows of " + ToText(columns) + " columns";
        Add<OurWide>(item, Ours, columns);
        Add<BareWide>(item, Bare, columns);
    }
    for (const int tables : {1, 10, 100, 1000}) {
        AddEngines<InsertBesideTables>("insert beside " + ToText(tables) + " tables", tables);
        Aim({Bare}, OfBoundInsert);
    }
    for (const int values : {1, 100, 10'000, 100'000}) {
        const std::string item = "select by an IN list of " + ToText(values);
        Add<OurInList>(item, Ours, values);
        Add<BareInList>(item, Bare, values);
    }
}

}  // namespace Bench
