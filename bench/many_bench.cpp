// Inserting a thousand rows in one call, and row by row.
#include "support/bench.h"
#include "support/engines.h"

namespace Bench {

namespace {

constexpr int Rows = 1000;

struct Many {
    explicit Many(Place place) : dir(place)
    {
        for (int id = 1; id <= Rows; ++id) nodes.push_back(MakeNode(id));
    }
    std::string Result() const { return DumpNodes(path); }

    TempDir dir;
    std::string path = dir.File("nodes.db");
    std::vector<Node> nodes;
};

// SQLite assigns the ids, so that the same records can be inserted again.
struct OurMany : Many {
    explicit OurMany(Place place) : Many(place)
    {
        for (const Node& node : nodes) {
            OrvaDRCore::SqliteValueList& record = records.emplace_back();
            record.AddValue("name", node.name);
            record.AddValue("address", node.address);
            record.AddValue("port", node.port);
            record.AddValue("state", node.state);
        }
    }
    void Run() { Require(db.InsertRecords(table, records), "cannot insert"); }

    OrvaDRCore::SqliteTableHandler table{"nodes", NodesSchema};
    OrvaDRCore::SqliteDB db{path, 0};
    std::vector<OrvaDRCore::SqliteValueList> records;
};

template <class Engine>
struct RowByRow : Many {
    using Many::Many;
    void Run()
    {
        for (Node& node : nodes) {
            engine.Insert(node);
            node.id += Rows;
        }
    }

    Engine engine{path};
};

template <class Engine>
struct InTransaction : RowByRow<Engine> {
    using RowByRow<Engine>::RowByRow;
    void Run()
    {
        this->engine.Exec("BEGIN IMMEDIATE");
        RowByRow<Engine>::Run();
        this->engine.Exec("COMMIT");
    }
};

void AddPlace(const std::string& item, Place place)
{
    Add<OurMany>(item, Ours, place);
    Add<InTransaction<BareEngine>>(item, Bare, place);
#if BENCH_HAS_SQLITECPP
    Add<InTransaction<Peer<SqliteCpp>>>(item, "SQLiteCpp", place);
#endif
#if BENCH_HAS_SOCI
    Add<InTransaction<Peer<Soci>>>(item, "SOCI", place);
#endif
}

}  // namespace

void AddMany()
{
    constexpr double OfBound = 1.5;
    constexpr double OfSingle = 0.01;
    AddPlace("InsertRecords of 1,000 rows, memory", Place::Memory);
    Aim({Bare}, OfBound);
    AddPlace("InsertRecords of 1,000 rows, disk", Place::Disk);
    Add<RowByRow<OurEngine>>("InsertRecords of 1,000 rows, disk", "InsertRecord", Place::Disk);
    Aim({Bare}, OfBound);
    Aim({"InsertRecord"}, OfSingle);
}

}  // namespace Bench
