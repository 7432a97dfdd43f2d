// What the library writes to disk: the bytes of a JSON document, and a database table.
#include <cstdlib>
#include <fstream>
#include <iostream>
#include <string>
#include <vector>

#include <json/value.h>

#include <orvadrcore/file.h>
#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_db.h>

using OrvaDRCore::File;
using OrvaDRCore::InsertCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValueList;

int main()
{
    // [document]
    Json::Value document;
    document["name"] = "Zürich \"2\"\n";
    document["Port"] = 5001;
    document["load"] = 0.1;
    document["share"] = 1.0;
    document["tags"] = Json::Value(Json::arrayValue);
    document["owner"] = Json::Value();
    if (!File::Write("node.json", document)) return EXIT_FAILURE;
    std::cout << std::ifstream("node.json").rdbuf();
    // [/document]

    // [table]
    SqliteDB db("nodes.db", 3);
    InsertCommand insert;
    insert.SetTable(SqliteTableHandler("nodes", "name TEXT PRIMARY KEY, port INTEGER, up INTEGER"));
    insert.AddFieldValue("up", true);
    insert.AddFieldValue("port", 5001);
    insert.AddFieldValue("name", "backup-01");
    std::cout << insert.GetCommand() << '\n';
    if (!db.InsertRecord(insert)) return EXIT_FAILURE;

    std::vector<SqliteValueList> rows;
    if (!db.SelectByCommand("SELECT sql FROM sqlite_master WHERE name='nodes'", rows) ||
        !db.SelectByCommand("SELECT typeof(name) AS name, typeof(port) AS port, "
                            "typeof(up) AS up FROM nodes",
                            rows)) {
        return EXIT_FAILURE;
    }
    for (const SqliteValueList& row : rows) std::cout << row.ToStr() << '\n';
    // [/table]
    return EXIT_SUCCESS;
}
