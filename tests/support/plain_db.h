// A way into a database file that shares no code with the library.
#ifndef ORVADRCORE_TESTS_PLAIN_DB_H
#define ORVADRCORE_TESTS_PLAIN_DB_H

#include <sqlite3.h>

#include <stdexcept>
#include <string>

// A connection through SQLite's own interface. It never waits for a lock, throws when something
// fails, and is not among those that CountConnections counts.
class PlainDb {
  public:
    explicit PlainDb(const std::string& path)
    {
        const int flags = SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE;
        if (sqlite3_open_v2(path.c_str(), &handle, flags, nullptr) != SQLITE_OK) Fail(path);
    }
    PlainDb(const PlainDb&) = delete;
    PlainDb& operator=(const PlainDb&) = delete;
    ~PlainDb() { sqlite3_close_v2(handle); }

    // Runs statements and gives their rows: "1,a;2,NULL".
    std::string Run(const std::string& sql)
    {
        std::string rows;
        if (sqlite3_exec(handle, sql.c_str(), AddRow, &rows, nullptr) != SQLITE_OK) Fail(sql);
        return rows;
    }

  private:
    static int AddRow(void* rows, int columns, char** values, char** /*names*/)
    {
        std::string row;
        for (int column = 0; column < columns; ++column) {
            if (column > 0) row += ",";
            row += values[column] != nullptr ? values[column] : "NULL";
        }
        std::string& all = *static_cast<std::string*>(rows);
        if (!all.empty()) all += ";";
        all += row;
        return 0;
    }

    [[noreturn]] void Fail(const std::string& what)
    {
        const std::string message = what + ": " + sqlite3_errmsg(handle);
        sqlite3_close_v2(handle);
        handle = nullptr;
        throw std::runtime_error(message);
    }

    sqlite3* handle = nullptr;
};

#endif
