// A schema that changed between releases: each old file is upgraded once.
#include <cstdlib>
#include <iostream>
#include <string>
#include <vector>

#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_db.h>

using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValueList;

namespace {

// [steps]
// From one version of the schema to the next. Never change a step that was released; add a new one.
const std::vector<std::string>& Steps()
{
    static const std::vector<std::string> steps = {
        "CREATE TABLE IF NOT EXISTS nodes (name TEXT PRIMARY KEY, port INTEGER)",  // version 1
        "ALTER TABLE nodes ADD COLUMN enabled INTEGER NOT NULL DEFAULT 1;"         // version 2
        "ALTER TABLE nodes ADD COLUMN note TEXT",
    };
    return steps;
}
// [/steps]

bool Print(SqliteDB& db)
{
    SelectCommand select;
    select.SetTable(SqliteTableHandler("nodes", ""));
    select.SelectAll();
    std::vector<SqliteValueList> rows;
    SqliteValueList version;
    if (!db.SelectRecords(select, rows) || !db.SelectByCommand("PRAGMA user_version", version)) {
        return false;
    }
    std::cout << version.ToStr() << '\n';
    for (const SqliteValueList& row : rows) std::cout << row.ToStr() << '\n';
    return true;
}

}  // namespace

int main()
{
    // A file as the first release left it, when there were no versions.
    SqliteDB old("recipe_upgrade.db", 3);
    if (!old.Open() || !old.Exec("CREATE TABLE nodes (name TEXT PRIMARY KEY, port INTEGER)") ||
        !old.Exec("INSERT INTO nodes VALUES ('backup-01', 5001)")) {
        return EXIT_FAILURE;
    }
    old.Close();

    // [upgrade]
    SqliteDB db("recipe_upgrade.db", 3);
    if (!db.Upgrade(Steps())) return EXIT_FAILURE;  // before anything else uses the file
    // [/upgrade]
    if (!db.Exec("UPDATE nodes SET note='first'") || !Print(db)) return EXIT_FAILURE;

    SqliteDB fresh("recipe_upgrade_fresh.db", 3);
    return fresh.Upgrade(Steps()) && Print(fresh) ? EXIT_SUCCESS : EXIT_FAILURE;
}
