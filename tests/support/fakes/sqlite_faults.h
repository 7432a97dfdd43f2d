// Answers of SQLite that cannot be had from a real database. While a SqliteFaults object lives, the
// functions that are set here answer in SQLite's place; all others, and all of them afterwards, are
// the real ones.
#ifndef ORVADRCORE_TESTS_SQLITE_FAULTS_H
#define ORVADRCORE_TESTS_SQLITE_FAULTS_H

#include <sqlite3.h>

#include <functional>

struct SqliteFaults {
    std::function<int(sqlite3*, int)> busyTimeout;
    std::function<int(sqlite3*, const char*, sqlite3_stmt**)> prepare;
    std::function<int(sqlite3_stmt*)> step;
    std::function<const unsigned char*(sqlite3_stmt*, int)> columnText;
    std::function<const char*(sqlite3_stmt*, int)> columnName;

    SqliteFaults();
    SqliteFaults(const SqliteFaults&) = delete;
    SqliteFaults& operator=(const SqliteFaults&) = delete;
    ~SqliteFaults();
};

// How many connections SQLite has opened and closed in this process.
struct SqliteConnections {
    int opened;
    int closed;
};
SqliteConnections CountConnections();

// The real functions, for answers that begin with SQLite's own.
int RealStep(sqlite3_stmt* statement);
int RealPrepare(sqlite3* db, const char* sql, sqlite3_stmt** statement);

#endif
