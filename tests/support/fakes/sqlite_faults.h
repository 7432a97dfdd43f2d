// Results of SQLite that no real database can provoke. While a SqliteFaults object lives, the
// functions that are set here are called instead of SQLite's. All others are the real ones.
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
    std::function<const unsigned char*(sqlite3_value*)> valueText;

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

// The real functions.
int RealStep(sqlite3_stmt* statement);
int RealPrepare(sqlite3* db, const char* sql, sqlite3_stmt** statement);

#endif
