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

// [upgrade]
constexpr int SchemaVersion = 2;
constexpr const char* Schema =
    "name TEXT PRIMARY KEY, port INTEGER, enabled INTEGER NOT NULL DEFAULT 1, note TEXT";

// From one version to the next. Never change a step that was released; add a new one.
const std::vector<std::string>& Steps()
{
    static const std::vector<std::string> steps = {
        "ALTER TABLE nodes ADD COLUMN enabled INTEGER NOT NULL DEFAULT 1",  // 0 -> 1
        "ALTER TABLE nodes ADD COLUMN note TEXT",                           // 1 -> 2
    };
    return steps;
}

bool ReadNumber(SqliteDB& db, const std::string& select, int& ret_number)
{
    SqliteValueList row;
    return db.DoSelectSqliteRecord(select, row) && row.GetValue("number", ret_number);
}

// Uses operations without retries, because it runs inside the transaction.
bool UpgradeAlone(SqliteDB& db)
{
    int version = 0;
    int tables = 0;
    if (!ReadNumber(db, "SELECT user_version AS number FROM pragma_user_version", version) ||
        !ReadNumber(db, "SELECT count(*) AS number FROM sqlite_master WHERE name='nodes'",
                    tables)) {
        return false;
    }
    if (version == SchemaVersion) return true;
    if (version > SchemaVersion) return false;  // created by a newer program: leave it alone
    if (tables == 0) {
        const std::string create = std::string("CREATE TABLE nodes (") + Schema + ")";
        if (!db.DoExecSqliteCommand(create)) return false;
    } else {
        for (int step = version; step < SchemaVersion; ++step) {
            if (!db.DoExecSqliteCommand(Steps().at(static_cast<std::size_t>(step)))) return false;
        }
    }
    return db.DoExecSqliteCommand("PRAGMA user_version=" + std::to_string(SchemaVersion));
}

// Call this once, before anything else uses the file.
bool Upgrade(SqliteDB& db)
{
    if (!db.Open() || !db.Exec("BEGIN IMMEDIATE")) return false;
    if (UpgradeAlone(db) && db.Exec("COMMIT")) return true;
    if (!db.DoExecSqliteCommand("ROLLBACK")) db.Close();
    return false;
}
// [/upgrade]

bool Print(SqliteDB& db)
{
    SelectCommand select;
    select.SetTable(SqliteTableHandler("nodes", Schema));
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

    SqliteDB db("recipe_upgrade.db", 3);
    for (int start = 1; start <= 2; ++start) {  // the second start finds nothing to do
        if (!Upgrade(db)) return EXIT_FAILURE;
    }
    if (!db.Exec("UPDATE nodes SET note='first'") || !Print(db)) return EXIT_FAILURE;

    SqliteDB fresh("recipe_upgrade_fresh.db", 3);
    return Upgrade(fresh) && Print(fresh) ? EXIT_SUCCESS : EXIT_FAILURE;
}
