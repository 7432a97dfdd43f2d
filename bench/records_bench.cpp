// Rows of a table: inserted, selected, changed and deleted.
#include "support/bench.h"
#include "support/engines.h"

namespace Bench {

namespace {

constexpr int Rows = 10000;
constexpr benchmark::IterationCount Deletes = 5000;  // of the rows, so that each finds one

enum class Mode { Autocommit, Transaction };

// A new database and an engine on it.
template <class Engine>
struct Connection {
    Connection(Place place, int rows, Mode wanted) : dir(place), mode(wanted)
    {
        if (rows > 0) FillNodes(Path(), rows);
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
    void Run()
    {
        id = id % Rows + 1;
        connection.engine->Select(id);
    }
    std::string Result() { return connection.engine->Selected(); }

    Connection<Engine> connection{Place::Memory, Rows, Mode::Autocommit};
    int id = 0;
};

template <class Engine>
struct SelectAll {
    void Run() { connection.engine->SelectAll(); }
    std::string Result() { return connection.engine->Selected(); }

    Connection<Engine> connection{Place::Memory, Rows, Mode::Autocommit};
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
    AddBounded<Task<SqliteCppEngine>>(bounds, item, "SQLiteCpp", arguments...);
#endif
#if BENCH_HAS_SOCI
    AddBounded<Task<SociEngine>>(bounds, item, "SOCI", arguments...);
#endif
}

}  // namespace

void AddRecords()
{
    AddAll<Insert>({}, "insert, autocommit, disk", Place::Disk, Mode::Autocommit);
    AddAll<Insert>({}, "insert, autocommit, memory", Place::Memory, Mode::Autocommit);
    AddAll<Insert>({}, "insert, transaction", Place::Memory, Mode::Transaction);
    AddAll<Select>({}, "select 1 of 10,000 rows");
    AddAll<SelectAll>({}, "select 10,000 rows of 5 columns");
    AddAll<Update>({}, "update, autocommit, memory", Mode::Autocommit);
    AddAll<Update>({}, "update, transaction", Mode::Transaction);
    AddAll<Delete>({Deletes}, "delete, transaction");
}

}  // namespace Bench
