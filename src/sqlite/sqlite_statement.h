// Prepared statements: their owner, what they are filled with, and the few that a connection caches.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_STATEMENT_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_STATEMENT_H

#include <sqlite3.h>

#include <map>
#include <memory>
#include <string>
#include <vector>

#include <orvadrcore/sqlite_value.h>

namespace OrvaDRCore {

struct FinalizeStatement {
    void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};
using Statement = std::unique_ptr<sqlite3_stmt, FinalizeStatement>;

// Whether a statement is as long as SQLite must not be given it.
bool IsTooLong(const std::string& command);

// Fills `statement`, with null for a text that holds no statement. Answers SQLite's code, which is
// SQLITE_TOOBIG for a statement that is too long.
int PrepareStatement(sqlite3* handle, const std::string& command, Statement& statement);

// The INSERT of records with these fields, with placeholders for the values.
std::string InsertStatement(const std::string& table, const SqliteValueList& record,
                            bool replacable);

// Inserts a record by its statement, and stores what its literals would. Answers SQLite's code,
// SQLITE_OK when the row is there.
int InsertRow(sqlite3_stmt* statement, const SqliteValueList& record);

// Ends a statement whose last row was not reached. One that writes commits only now, which may fail.
// Answers SQLite's code.
int EndBeforeLastRow(sqlite3_stmt* statement);

// The last few selects of a connection, prepared. A cached statement is reset, so it holds no lock,
// and SQLite prepares it again by itself when its tables have changed. The cache must be cleared
// before the connection is closed.
//
// While a database is attached nothing is cached: SQLite looks for a table in one database after
// another, and a statement that found it in a later one would not notice when the same name appears
// in an earlier one.
class StatementCache {
  public:
    // Fills `statement` with the cached one, whose place stays empty until Keep(), or prepares it.
    // Answers SQLite's code.
    int Take(sqlite3* handle, const std::string& command, Statement& statement);

    // Puts back the statement that was taken last, unless it writes or is unusually long.
    void Keep(const std::string& command, Statement statement);

    void Clear() { selects.clear(); }

  private:
    struct Select {
        std::string command;
        Statement statement;
    };
    std::vector<Select> selects;  // the one used last comes last
};

}  // namespace OrvaDRCore

#endif
