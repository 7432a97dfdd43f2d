// Columns that records cannot hold (64-bit, real, blob, NULL), written and read as text.
#include <cstdint>
#include <cstdlib>
#include <iostream>
#include <string>

#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_db.h>

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValueList;

int main()
{
    // [write]
    SqliteDB db("recipe_columns.db", 3);
    const SqliteTableHandler volumes(
        "volumes", "path TEXT PRIMARY KEY, bytes INTEGER, load REAL, key BLOB, note TEXT");
    const std::int64_t bytes = 5'000'000'000;
    InsertCommand insert;
    insert.SetTable(volumes);
    insert.AddFieldValue("path", "/volume1");
    insert.AddFieldValue("bytes", std::to_string(bytes));  // INTEGER and REAL columns turn
    insert.AddFieldValue("load", "0.25");                  // such texts into numbers
    if (!db.InsertRecord(insert)) return EXIT_FAILURE;     // key and note stay NULL
    if (!db.Exec("UPDATE volumes SET key=x'00ff27' WHERE path='/volume1'")) return EXIT_FAILURE;
    // [/write]

    SelectCommand everything;
    everything.SetTable(volumes);
    everything.SelectAll();
    SqliteValueList damaged;
    if (!db.SelectRecord(everything, damaged)) return EXIT_FAILURE;
    std::cout << damaged.ToStr() << '\n';

    // [read]
    SelectCommand select;
    select.SetTable(volumes);
    select.AddField("CAST(bytes AS TEXT) AS bytes");
    select.AddField("printf('%!.17g',load) AS load");
    select.AddField("hex(key) AS key");
    select.AddField("ifnull(note,'') AS note");
    select.AddField("note IS NULL AS has_no_note");
    select.SetCondition(SqliteEqual("bytes", std::to_string(bytes)));
    SqliteValueList row;
    if (!db.SelectRecord(select, row)) return EXIT_FAILURE;
    std::cout << row.ToStr() << '\n';
    std::string text;
    if (!row.GetValue("bytes", text)) return EXIT_FAILURE;
    const std::int64_t read = std::strtoll(text.c_str(), nullptr, 10);
    // [/read]
    return read == bytes ? EXIT_SUCCESS : EXIT_FAILURE;
}
