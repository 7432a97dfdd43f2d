// The library in one screen: makes a table, inserts two records and prints what is stored.
#include <cstdio>
#include <cstdlib>
#include <iostream>
#include <string>
#include <vector>

#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_db.h>

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;

int main()
{
    static_cast<void>(std::remove("quick_start.db"));  // so that the program may run again
    // [readme]
    SqliteDB db("quick_start.db", 3);
    const SqliteTableHandler nodes("nodes", "name TEXT PRIMARY KEY, port INTEGER");
    for (const std::string name : {"backup-01", "O'Brien's NAS"}) {
        InsertCommand insert;
        insert.SetTable(nodes);
        insert.AddFieldValue("name", SqliteValue::EscapeText(name));
        insert.AddFieldValue("port", 5001);
        if (!db.InsertRecord(insert)) return EXIT_FAILURE;
    }
    SelectCommand select;
    select.SetTable(nodes);
    select.SelectAll();
    std::vector<SqliteValueList> rows;
    if (!db.SelectRecords(select, rows)) return EXIT_FAILURE;
    for (const SqliteValueList& row : rows) std::cout << row.ToStr() << '\n';
    // [/readme]
    return EXIT_SUCCESS;
}
