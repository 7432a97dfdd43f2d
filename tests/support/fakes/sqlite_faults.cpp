#include "support/fakes/sqlite_faults.h"

#include <cstdlib>
#include <cstring>

#include "support/fakes/real_function.h"

namespace {

SqliteFaults* current = nullptr;
SqliteConnections connections{};

}  // namespace

SqliteFaults::SqliteFaults()
{
    if (current != nullptr) std::abort();
    current = this;
}

SqliteFaults::~SqliteFaults()
{
    current = nullptr;
}

SqliteConnections CountConnections()
{
    return connections;
}

int RealStep(sqlite3_stmt* statement)
{
    return RealFunction<decltype(sqlite3_step)>("sqlite3_step")(statement);
}

int RealPrepare(sqlite3* db, const char* sql, sqlite3_stmt** statement)
{
    return RealFunction<decltype(sqlite3_prepare_v2)>("sqlite3_prepare_v2")(db, sql, -1, statement,
                                                                            nullptr);
}

extern "C" int sqlite3_open(const char* filename, sqlite3** db)
{
    const int code = RealFunction<decltype(sqlite3_open)>("sqlite3_open")(filename, db);
    if (*db != nullptr) ++connections.opened;
    return code;
}

extern "C" int sqlite3_close(sqlite3* db)
{
    const int code = RealFunction<decltype(sqlite3_close)>("sqlite3_close")(db);
    if (db != nullptr && code == SQLITE_OK)
        ++connections.closed;  // fails while statements are open
    return code;
}

extern "C" int sqlite3_busy_timeout(sqlite3* db, int milliseconds)
{
    if (current != nullptr && current->busyTimeout) return current->busyTimeout(db, milliseconds);
    return RealFunction<decltype(sqlite3_busy_timeout)>("sqlite3_busy_timeout")(db, milliseconds);
}

extern "C" int sqlite3_prepare_v2(sqlite3* db, const char* sql, int length,
                                  sqlite3_stmt** statement, const char** tail)
{
    if (current != nullptr && current->prepare) {
        if (tail != nullptr) *tail = sql + std::strlen(sql);  // sqlite3_exec asks for it
        return current->prepare(db, sql, statement);
    }
    return RealFunction<decltype(sqlite3_prepare_v2)>("sqlite3_prepare_v2")(db, sql, length,
                                                                            statement, tail);
}

extern "C" int sqlite3_step(sqlite3_stmt* statement)
{
    if (current != nullptr && current->step) return current->step(statement);
    return RealStep(statement);
}

extern "C" const unsigned char* sqlite3_column_text(sqlite3_stmt* statement, int column)
{
    if (current != nullptr && current->columnText) return current->columnText(statement, column);
    return RealFunction<decltype(sqlite3_column_text)>("sqlite3_column_text")(statement, column);
}

extern "C" const char* sqlite3_column_name(sqlite3_stmt* statement, int column)
{
    if (current != nullptr && current->columnName) return current->columnName(statement, column);
    return RealFunction<decltype(sqlite3_column_name)>("sqlite3_column_name")(statement, column);
}

extern "C" const unsigned char* sqlite3_value_text(sqlite3_value* value)
{
    if (current != nullptr && current->valueText) return current->valueText(value);
    return RealFunction<decltype(sqlite3_value_text)>("sqlite3_value_text")(value);
}
