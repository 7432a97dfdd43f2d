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
                  << ", SQLite's code " << db.GetSqliteCode() << '\n';
    }
    if (!other.Exec("ROLLBACK")) return EXIT_FAILURE;
    // [/locked]

    // [constraint]
    constexpr int SqliteConstraint = 19;  // SQLITE_CONSTRAINT in <sqlite3.h>
    if (db.InsertRecord(Insert("backup-01"))) return EXIT_FAILURE;
    const bool isRefused = (db.GetSqliteCode() & 0xff) == SqliteConstraint;
    std::cout << "refused by the schema: " << isRefused << '\n';
    // [/constraint]

    // [changes]
    const SqliteTableHandler jobs("jobs", "id INTEGER PRIMARY KEY, state TEXT");
    InsertCommand insert;
    insert.SetTable(jobs);
    insert.AddFieldValue("state", "new");
    if (!db.InsertRecord(insert) || !db.InsertRecord(insert)) return EXIT_FAILURE;
    std::cout << "id of the last job: " << db.GetLastInsertId() << '\n';
    if (!db.DeleteRecord("state='new'", jobs)) return EXIT_FAILURE;
    std::cout << "deleted: " << db.GetAffectedRows() << '\n';

    SelectCommand selectJob;
    selectJob.SetTable(jobs);
    selectJob.SelectAll();
    SqliteValueList job;
    bool found = false;
    if (!db.SelectRecord(selectJob, job, found)) return EXIT_FAILURE;
    std::cout << (found ? "a job is left" : "no job is left") << '\n';
    // [/changes]

    if (!AddFromChild("backup-03")) return EXIT_FAILURE;
    SelectCommand select;
    select.SetTable(Nodes());
    select.SelectAll();
    std::vector<SqliteValueList> rows;
    if (!db.SelectRecords(select, rows)) return EXIT_FAILURE;
    for (const SqliteValueList& row : rows) std::cout << row.ToStr() << '\n';
    return EXIT_SUCCESS;
}
