// Inserting, selecting, changing and deleting rows.
#include <sqlite3.h>

#include <map>

#include "support/bench.h"
#include "support/engines.h"

namespace Bench {

namespace {

constexpr int Rows = 10000;
constexpr benchmark::IterationCount Deletes =
    5000;  // at most the number of rows, so that each deletes one

enum class Mode { Autocommit, Transaction };

// A new database, and an engine that uses it.
template <class Engine>
struct Connection {
    Connection(Place place, int rows, Mode wanted, int tables = 1) : dir(place), mode(wanted)
    {
        if (rows > 0) FillNodes(Path(), rows, tables);
        engine = std::make_unique<Engine>(Path());
        if (mode == Mode::Transaction) engine->Exec("BEGIN");
    }

    std::string Path() const { return dir.File("nodes.db"); }

    std::string Dump()
    {
        if (mode == Mode::Transaction) engine->Exec("COMMIT");
        return DumpNodes(Path());
    }

    TempDir dir;
    Mode mode;
    std::unique_ptr<Engine> engine;
};

template <class Engine>
struct Insert {
    Insert(Place place, Mode mode) : connection(place, 0, mode) {}
    void Run()
    {
        ++node.id;
        connection.engine->Insert(node);
    }
    std::string Result() { return connection.Dump(); }

    Connection<Engine> connection;
    Node node = MakeNode(0);
};

template <class Engine>
struct Select {
    explicit Select(Mode mode, int tables = 1) : connection(Place::Memory, Rows, mode, tables) {}
    void Run()
    {
        id = id % Rows + 1;
        connection.engine->Select(id);
    }
    std::string Result() { return connection.engine->Selected(); }

    Connection<Engine> connection;
    int id = 0;
};

template <class Engine>
struct SelectAll {
    void Run() { connection.engine->SelectAll(); }
    std::string Result() { return connection.engine->Selected(); }

    Connection<Engine> connection{Place::Memory, Rows, Mode::Autocommit};
};

// What a careful programmer writes to get rows by column name, with values of any type. The
// statements are prepared once.
class LoopEngine {
  public:
    explicit LoopEngine(const std::string& path)
        : handle_(OpenDatabase(path)),
          select_(Prepare(handle_.get(), "SELECT * FROM nodes WHERE id=?")),
          selectAll_(Prepare(handle_.get(), "SELECT * FROM nodes"))
    {
    }
    void Exec(const char* statement) { ExecText(handle_.get(), statement); }
    void Select(int id)
    {
        sqlite3_bind_int(select_.get(), 1, id);
        Collect(select_.get());
    }
    void SelectAll() { Collect(selectAll_.get()); }
    std::string Selected() const { return ToText(rows_); }

  private:
    void Collect(sqlite3_stmt* select)
    {
        rows_.clear();
        const int columns = sqlite3_column_count(select);
        std::vector<std::string> fields;
        fields.reserve(static_cast<std::size_t>(columns));
        for (int column = 0; column < columns; ++column) {
            fields.emplace_back(sqlite3_column_name(select, column));
        }
        while (sqlite3_step(select) == SQLITE_ROW) AppendRow(select, fields);
        sqlite3_reset(select);
    }

    void AppendRow(sqlite3_stmt* select, const std::vector<std::string>& fields)
    {
        auto& row = rows_.emplace_back();
        int column = 0;
        for (const std::string& field : fields) {
            if (sqlite3_column_type(select, column) == SQLITE_INTEGER) {
                row.emplace(field, sqlite3_column_int(select, column));
            } else {
                const auto* text =
                    reinterpret_cast<const char*>(sqlite3_column_text(select, column));
                row.emplace(field, Json::Value(text, text + sqlite3_column_bytes(select, column)));
            }
            ++column;
        }
    }

    Database handle_;
    Statement select_;
    Statement selectAll_;
    NamedRows rows_;
};

struct ByName {
    static bool Read(const OrvaDRCore::SqliteRow& row, Node& node)
    {
        return row.GetValue("id", node.id) && row.GetValue("name", node.name) &&
               row.GetValue("address", node.address) && row.GetValue("port", node.port) &&
               row.GetValue("state", node.state);
    }
};

struct ByNumber {
    static bool Read(const OrvaDRCore::SqliteRow& row, Node& node)
    {
        return row.GetValue(0, node.id) && row.GetValue(1, node.name) &&
               row.GetValue(2, node.address) && row.GetValue(3, node.port) &&
               row.GetValue(4, node.state);
    }
};

// Our rows one by one, into structs.
template <class Columns>
class EachEngine {
  public:
    explicit EachEngine(const std::string& path) : db_(path, 0)
    {
        select_.SetTable(OrvaDRCore::SqliteTableHandler("nodes", NodesSchema));
        select_.SelectAll();
    }
    void Exec(const char* statement) { Require(db_.Exec(statement), statement); }
    void SelectAll()
    {
        rows_.clear();
        const auto take = [this](const OrvaDRCore::SqliteRow& row) {
            return Columns::Read(row, rows_.emplace_back());
        };
        Require(db_.SelectEach(select_, take), "a select failed");
    }
    std::string Selected() const { return ToText(rows_); }

  private:
    OrvaDRCore::SelectCommand select_;
    OrvaDRCore::SqliteDB db_;
    std::vector<Node> rows_;
};

template <class Engine>
struct Update {
    explicit Update(Mode mode) : connection(Place::Memory, Rows, mode) {}
    void Run()
    {
        id = id % Rows + 1;
        connection.engine->Update(id, ++state);
    }
    std::string Result() { return connection.Dump(); }

    Connection<Engine> connection;
    int id = 0;
    int state = 10;
};

template <class Engine>
struct Delete {
    void Run() { connection.engine->Delete(++id); }
    std::string Result() { return connection.Dump(); }

    Connection<Engine> connection{Place::Memory, Rows, Mode::Transaction};
    int id = 0;
};

template <template <class> class Task, class... Arguments>
void AddAll(const Bounds& bounds, const std::string& item, Arguments... arguments)
{
    AddBounded<Task<OurEngine>>(bounds, item, Ours, arguments...);
    AddBounded<Task<BareEngine>>(bounds, item, Bare, arguments...);
    AddBounded<Task<ContractEngine>>(bounds, item, Contract, arguments...);
#if BENCH_HAS_SQLITECPP
    AddBounded<Task<Peer<SqliteCpp>>>(bounds, item, "SQLiteCpp", arguments...);
#endif
#if BENCH_HAS_SOCI
    AddBounded<Task<Peer<Soci>>>(bounds, item, "SOCI", arguments...);
#endif
}

// A select in a file with many tables, compared with the same in a file with one.
void AddBesideTables()
{
    constexpr int Tables = 1000;
    constexpr double OfOneTable = 1.3;
    constexpr const char* OneTable = "beside one";
    const std::string item = "select beside 1,000 tables";
    AddAll<Select>({}, item, Mode::Autocommit, Tables);
    Add<Select<OurEngine>>(item, OneTable, Mode::Autocommit);
    Aim({OneTable}, OfOneTable);
}

}  // namespace

void AddRecords()
{
    constexpr double OfAutocommit = 1.05;
    constexpr double OfBoundInsert = 2.8;
    constexpr double OfBoundChange = 2.2;
    constexpr double OfBoundSelect = 1.15;
    constexpr double OfBoundSelectInTransaction = 1.6;
    constexpr double OfLoop = 0.55;
    constexpr double OfStructs = 1.1;
    AddAll<Insert>({}, "insert, autocommit, disk", Place::Disk, Mode::Autocommit);
    Aim({Bare}, OfAutocommit);
    AddAll<Insert>({}, "insert, autocommit, memory", Place::Memory, Mode::Autocommit);
    AddAll<Insert>({}, "insert, transaction", Place::Memory, Mode::Transaction);
    Aim({Bare}, OfBoundInsert);
    AddAll<Select>({}, "select 1 of 10,000 rows", Mode::Autocommit);
    Add<Select<LoopEngine>>("select 1 of 10,000 rows", "C loop", Mode::Autocommit);
    Aim({"C loop"}, OfBoundSelect);
    AddAll<Select>({}, "select 1 of 10,000 rows, transaction", Mode::Transaction);
    Add<Select<LoopEngine>>("select 1 of 10,000 rows, transaction", "C loop", Mode::Transaction);
    Aim({"C loop"}, OfBoundSelectInTransaction);
    AddBesideTables();
    AddAll<SelectAll>({}, "select 10,000 rows of 5 columns");
    Add<SelectAll<LoopEngine>>("select 10,000 rows of 5 columns", "C loop");
#if BENCH_HAS_SQLITECPP
    Add<SelectAll<Peer<SqliteCppByName>>>("select 10,000 rows of 5 columns", "SQLiteCpp by name");
#endif
#if BENCH_HAS_SOCI
    Add<SelectAll<Peer<SociByName>>>("select 10,000 rows of 5 columns", "SOCI by name");
#endif
    Aim({"C loop"}, OfLoop);
    Aim({"SQLiteCpp by name", "SOCI by name"}, 1);
    Add<SelectAll<EachEngine<ByNumber>>>("select 10,000 rows into structs", Ours);
    Add<SelectAll<EachEngine<ByName>>>("select 10,000 rows into structs", "by name");
    Add<SelectAll<BareEngine>>("select 10,000 rows into structs", Bare);
#if BENCH_HAS_SQLITECPP
    Add<SelectAll<Peer<SqliteCpp>>>("select 10,000 rows into structs", "SQLiteCpp");
#endif
#if BENCH_HAS_SOCI
    Add<SelectAll<Peer<Soci>>>("select 10,000 rows into structs", "SOCI");
#endif
    Aim({Bare}, OfStructs);
    AddAll<Update>({}, "update, autocommit, memory", Mode::Autocommit);
    AddAll<Update>({}, "update, transaction", Mode::Transaction);
    Aim({Bare}, OfBoundChange);
    AddAll<Delete>({Deletes}, "delete, transaction");
    Aim({Bare}, OfBoundChange);
}

}  // namespace Bench
