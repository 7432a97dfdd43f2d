// Columns that records cannot hold (64-bit, real, blob, NULL), written as values and read row by row.
#include <cstdint>
#include <cstdlib>
#include <iostream>
#include <string>

#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_db.h>
#include <orvadrcore/sqlite_row.h>

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteGreaterEqual;
using OrvaDRCore::SqliteOrder;
using OrvaDRCore::SqliteRow;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;

namespace {

// [row]
bool Print(const SqliteRow& row)
{
    std::string path;
    std::int64_t bytes = 0;
    double load = 0;
    std::string key;
    std::string note = "no note";
    const bool isReadable = row.GetValue("path", path) && row.GetValue("bytes", bytes) &&
                            row.GetValue("load", load) && row.GetValue("key", key);
    if (!isReadable) return true;  // left out, with a log line; false would end the select
    if (!row.IsNull("note")) row.GetValue("note", note);
    std::cout << path << ' ' << bytes << ' ' << load << ' ' << key.size() << ' ' << note << '\n';
    return true;  // the next row, please
}
// [/row]

}  // namespace

int main()
{
    // [write]
    SqliteDB db("recipe_columns.db", 3);
    const SqliteTableHandler volumes(
        "volumes", "path TEXT PRIMARY KEY, bytes INTEGER, load REAL, key BLOB, note TEXT");
    SqliteValueList volume;
    volume.AddValue("path", SqliteValue::Text("/volume1"));
    volume.AddValue("bytes", SqliteValue::Integer(5'000'000'000));
    volume.AddValue("load", SqliteValue::Real(0.25));
    volume.AddValue("key", SqliteValue::Blob(std::string("\0\xff'", 3)));
    volume.AddValue("note", SqliteValue::Null());
    InsertCommand insert;
    insert.SetTable(volumes);
    insert.SetFieldValues(volume);
    if (!db.InsertRecord(insert)) return EXIT_FAILURE;
    // [/write]
    volume.AddValue("path", SqliteValue::Text("/volume2"));
    volume.AddValue("bytes", SqliteValue::Integer(900));
    volume.AddValue("note", SqliteValue::Text("it's small"));
    insert.SetFieldValues(volume);
    if (!db.InsertRecord(insert)) return EXIT_FAILURE;

    // [read]
    SelectCommand select;
    select.SetTable(volumes);
    select.SelectAll();
    select.SetCondition(SqliteGreaterEqual("bytes", SqliteValue::Integer(900)));
    select.OrderBy("bytes", SqliteOrder::Descending);
    if (!db.SelectEach(select, Print)) return EXIT_FAILURE;
    // [/read]

    SqliteValueList damaged;
    if (!db.SelectRecord(select, damaged)) return EXIT_FAILURE;
    std::cout << damaged.ToStr() << '\n';
    return EXIT_SUCCESS;
}
