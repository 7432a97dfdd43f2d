// Inserting a thousand rows with columns of every kind: text, 64-bit integer, real, blob and NULL.
#include <sqlite3.h>

#include "support/bench.h"
#include "support/by_hand.h"
#include "support/volumes.h"

#include <orvadrcore/sqlite_db.h>

namespace Bench {

namespace {

constexpr int Rows = 1000;

using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;

Volume MakeVolume(int number)
{
    Volume volume;
    volume.name = "/volume" + std::to_string(number);
    volume.bytes = std::int64_t{5'000'000'000} * number;
    volume.load = 0.1 * number;
    volume.key.assign(32, static_cast<char>(number % 256));
    if (number % 2 == 0) volume.note = "it's number " + std::to_string(number);
    return volume;
}

struct Volumes {
    explicit Volumes(Place place) : dir(place)
    {
        for (int number = 1; number <= Rows; ++number) volumes.push_back(MakeVolume(number));
    }

    std::string Result() const
    {
        const Database handle = OpenDatabase(path);
        const Statement all = Prepare(handle.get(),
                                      "SELECT quote(name)||quote(bytes)||quote(load)||quote(key)||"
                                      "quote(note) FROM volumes ORDER BY id");
        std::string text;
        while (sqlite3_step(all.get()) == SQLITE_ROW) text += ColumnText(all.get(), 0) + '\n';
        return text;
    }

    TempDir dir;
    std::string path = dir.File("volumes.db");
    std::vector<Volume> volumes;
};

struct OurVolumes : Volumes {
    explicit OurVolumes(Place place) : Volumes(place)
    {
        for (const Volume& volume : volumes) {
            SqliteValueList& record = records.emplace_back();
            record.AddValue("name", SqliteValue::Text(volume.name));
            record.AddValue("bytes", SqliteValue::Integer(volume.bytes));
            record.AddValue("load", SqliteValue::Real(volume.load));
            record.AddValue("key", SqliteValue::Blob(volume.key));
            record.AddValue("note",
                            volume.note ? SqliteValue::Text(*volume.note) : SqliteValue::Null());
        }
    }
    void Run() { Require(db.InsertRecords(table, records), "cannot insert"); }

    OrvaDRCore::SqliteTableHandler table{VolumesTable, VolumesSchema};
    OrvaDRCore::SqliteDB db{path, 0};
    std::vector<SqliteValueList> records;
};

struct BareVolumes : Volumes {
    explicit BareVolumes(Place place) : Volumes(place), handle(OpenDatabase(path))
    {
        ExecText(handle.get(),
                 std::string("CREATE TABLE ") + VolumesTable + " (" + VolumesSchema + ")");
        insert = Prepare(handle.get(), InsertVolume);
    }

    void Run()
    {
        ExecText(handle.get(), "BEGIN IMMEDIATE");
        for (const Volume& volume : volumes) {
            BindText(1, volume.name);
            sqlite3_bind_int64(insert.get(), 2, volume.bytes);
            sqlite3_bind_double(insert.get(), 3, volume.load);
            sqlite3_bind_blob(insert.get(), 4, volume.key.data(),
                              static_cast<int>(volume.key.size()), SQLITE_STATIC);
            if (volume.note) {
                BindText(5, *volume.note);
            } else {
                sqlite3_bind_null(insert.get(), 5);
            }
            Require(sqlite3_step(insert.get()) == SQLITE_DONE, "an insert failed");
            sqlite3_reset(insert.get());
        }
        ExecText(handle.get(), "COMMIT");
    }

    void BindText(int column, const std::string& text) const
    {
        sqlite3_bind_text(insert.get(), column, text.data(), static_cast<int>(text.size()),
                          SQLITE_STATIC);
    }

    Database handle;
    Statement insert;
};

// A library whose writer `Make` returns.
template <std::unique_ptr<VolumeWriter> (*Make)(const std::string&)>
struct PeerVolumes : Volumes {
    using Volumes::Volumes;
    void Run() { writer->Insert(volumes); }

    std::unique_ptr<VolumeWriter> writer = Make(path);
};

void AddPlace(const std::string& item, Place place)
{
    constexpr double OfBound = 1.2;
    Add<OurVolumes>(item, Ours, place);
    Add<BareVolumes>(item, Bare, place);
#if BENCH_HAS_SQLITECPP
    Add<PeerVolumes<MakeSqliteCppWriter>>(item, "SQLiteCpp", place);
#endif
#if BENCH_HAS_SOCI
    Add<PeerVolumes<MakeSociWriter>>(item, "SOCI", place);
#endif
    Aim({Bare}, OfBound);
}

}  // namespace

void AddVolumes()
{
    AddPlace("InsertRecords of 1,000 mixed rows, memory", Place::Memory);
    AddPlace("InsertRecords of 1,000 mixed rows, disk", Place::Disk);
}

}  // namespace Bench
