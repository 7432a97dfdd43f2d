// Rows that are read one by one, without records.
#include <cstdint>
#include <cstdlib>
#include <iostream>
#include <string>
#include <vector>

#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_db.h>

using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteRow;
using OrvaDRCore::SqliteTableHandler;

namespace {

// [each]
struct Volume {
    std::string name;
    std::int64_t bytes = 0;
    double ratio = 0;
    std::string note;  // empty when it is NULL
};

bool ReadVolume(const SqliteRow& row, Volume& ret_volume)
{
    if (!row.IsNull("note") && !row.GetValue("note", ret_volume.note)) return false;
    return row.GetValue("name", ret_volume.name) && row.GetValue("bytes", ret_volume.bytes) &&
           row.GetValue("ratio", ret_volume.ratio);
}

bool ReadVolumes(SqliteDB& db, std::vector<Volume>& ret_volumes)
{
    SelectCommand select;
    select.SetTable(SqliteTableHandler("volumes", ""));
    select.SelectAll();
    bool isReadable = true;
    const auto take = [&](const SqliteRow& row) {
        isReadable = ReadVolume(row, ret_volumes.emplace_back());
        return isReadable;  // go on to the next row
    };
    return db.SelectEach(select, take) && isReadable;
}
// [/each]

}  // namespace

int main()
{
    SqliteDB db("rows.db", 3);
    if (!db.Open() ||
        !db.Exec("CREATE TABLE volumes (name TEXT, bytes INTEGER, ratio REAL, note TEXT)") ||
        !db.Exec("INSERT INTO volumes VALUES ('mail', 5000000000, 0.25, NULL),"
                 "('O''Brien', 900, 1, 'in repair')")) {
        return EXIT_FAILURE;
    }
    std::vector<Volume> volumes;
    if (!ReadVolumes(db, volumes)) return EXIT_FAILURE;
    for (const Volume& volume : volumes) {
        std::cout << volume.name << ": " << volume.bytes << " bytes, ratio " << volume.ratio << ", "
                  << (volume.note.empty() ? "no note" : volume.note) << '\n';
    }

    // [statement]
    std::int64_t sum = 0;
    const auto take = [&sum](const SqliteRow& row) { return row.GetValue(0, sum); };
    if (!db.SelectEachByCommand("SELECT sum(bytes) FROM volumes", take)) return EXIT_FAILURE;
    std::cout << sum << " bytes in all\n";
    // [/statement]
    return EXIT_SUCCESS;
}
