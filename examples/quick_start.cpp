// The library on one screen: creates a table, inserts two records and prints what is stored.
// [readme]
#include <cstdlib>
#include <iostream>
#include <string>
#include <vector>

#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_db.h>

int main()
{
    OrvaDRCore::SqliteDB db("quick_start.db", 3);
    const OrvaDRCore::SqliteTableHandler nodes("nodes", "name TEXT PRIMARY KEY, port INTEGER");
    for (const std::string name : {"backup-01", "O'Brien's NAS"}) {
        OrvaDRCore::InsertCommand insert;
        insert.SetTable(nodes);
        insert.SetReplacable(true);
        insert.AddFieldValue("name", OrvaDRCore::SqliteValue::Text(name));
        insert.AddFieldValue("port", 5001);
        if (!db.InsertRecord(insert)) return EXIT_FAILURE;
    }
    OrvaDRCore::SelectCommand select;
    select.SetTable(nodes);
    select.SelectAll();
    std::vector<OrvaDRCore::SqliteValueList> rows;
    if (!db.SelectRecords(select, rows)) return EXIT_FAILURE;
    for (const auto& row : rows) std::cout << row.ToStr() << '\n';
    return EXIT_SUCCESS;
}
// [/readme]
