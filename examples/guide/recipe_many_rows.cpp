// Inserts many rows at once: all or none.
#include <cstdlib>
#include <iostream>
#include <string>
#include <vector>

#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_db.h>

using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;

namespace {

bool PrintCount(SqliteDB& db)
{
    SqliteValueList row;
    if (!db.SelectByCommand("SELECT count(*) AS nodes, max(port) AS port FROM nodes", row))
        return false;
    std::cout << row.ToStr() << '\n';
    return true;
}

}  // namespace

int main()
{
    // [insert]
    SqliteDB db("recipe_many_rows.db", 0);
    const SqliteTableHandler nodes("nodes", "name TEXT PRIMARY KEY, port INTEGER");
    std::vector<SqliteValueList> records;
    for (int number = 1; number <= 1200; ++number) {
        SqliteValueList record;
        record.AddValue("name", SqliteValue::Text("O'Brien's node " + std::to_string(number)));
        record.AddValue("port", 5000);
        records.push_back(record);
    }
    if (!db.InsertRecords(nodes, records)) return EXIT_FAILURE;
    // [/insert]
    if (!PrintCount(db)) return EXIT_FAILURE;

    // One of these two exists already, so neither is inserted.
    // [refused]
    records.resize(2);
    records.front().AddValue("name", "new");
    for (SqliteValueList& record : records) record.AddValue("port", 5001);
    if (db.InsertRecords(nodes, records)) return EXIT_FAILURE;
    const Json::Value& last = db.GetErr()[0]["err_msg"];
    std::cout << last["command"].asString() << '\n' << last["sqlite_errmsg"].asString() << '\n';
    // [/refused]
    if (!PrintCount(db)) return EXIT_FAILURE;

    // [replace]
    const bool replacable = true;
    if (!db.InsertRecords(nodes, records, replacable)) return EXIT_FAILURE;
    // [/replace]
    return PrintCount(db) ? EXIT_SUCCESS : EXIT_FAILURE;
}
