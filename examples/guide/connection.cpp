// A connection that meets a lock, a missing directory and a forked child.
#include <sys/wait.h>
#include <unistd.h>

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
using OrvaDRCore::SqliteValueList;

namespace {

constexpr const char* Database = "connection.db";
const SqliteTableHandler& Nodes()
{
    static const SqliteTableHandler table("nodes", "name TEXT PRIMARY KEY");
    return table;
}

InsertCommand Insert(const std::string& name)
{
    InsertCommand insert;
    insert.SetTable(Nodes());
    insert.AddFieldValue("name", name);
    return insert;
}

// [constraint]
// SQLite's code for a row that the schema refuses: SQLITE_CONSTRAINT in <sqlite3.h>.
constexpr int SqliteConstraint = 19;

// SQLite's code of the last attempt; 0 if SQLite did not fail.
int LastSqliteCode(const SqliteDB& db)
{
    const Json::Value& tries = db.GetErr();
    if (!tries.isArray() || tries.empty()) return 0;
    return tries[tries.size() - 1]["err_msg"]["sqlite_errcode"].asInt();
}
// [/constraint]

bool AddFromChild(const std::string& name)
{
    // [fork]
    const pid_t child = ::fork();
    if (child == 0) {
        bool isAdded = false;
        {
            SqliteDB own(Database, 5);  // never use the parent's object
            isAdded = own.InsertRecord(Insert(name));
        }
        ::_exit(isAdded ? EXIT_SUCCESS : EXIT_FAILURE);  // skips the parent's destructors
    }
    // [/fork]
    int status = -1;
    return child > 0 && ::waitpid(child, &status, 0) == child && status == 0;
}

}  // namespace

int main()
{
    // [open]
    SqliteDB nowhere("no/such/directory/nodes.db", 5);
    if (!nowhere.InsertRecord(Insert("backup-01"))) {  // fails at once: opening is not retried
        std::cout << "code " << nowhere.GetErrCode() << ", tries " << nowhere.GetErr().size()
                  << '\n';
    }
    // [/open]

    // [locked]
    SqliteDB other(Database, 5);
    SqliteDB db(Database, 1);
    if (!db.InsertRecord(Insert("backup-01"))) return EXIT_FAILURE;
    if (!other.Open() || !other.Exec("BEGIN IMMEDIATE")) return EXIT_FAILURE;
    if (!db.InsertRecord(Insert("backup-02"))) {  // two attempts, each waits for a second
        std::cout << "code " << db.GetErrCode() << ", tries " << db.GetErr().size()
                  << ", SQLite's code " << LastSqliteCode(db) << '\n';
    }
    if (!other.Exec("ROLLBACK")) return EXIT_FAILURE;
    // [/locked]

    if (db.InsertRecord(Insert("backup-01"))) return EXIT_FAILURE;
    std::cout << "refused by the schema: " << (LastSqliteCode(db) == SqliteConstraint) << '\n';

    if (!AddFromChild("backup-03")) return EXIT_FAILURE;
    SelectCommand select;
    select.SetTable(Nodes());
    select.SelectAll();
    std::vector<SqliteValueList> rows;
    if (!db.SelectRecords(select, rows)) return EXIT_FAILURE;
    for (const SqliteValueList& row : rows) std::cout << row.ToStr() << '\n';
    return EXIT_SUCCESS;
}
