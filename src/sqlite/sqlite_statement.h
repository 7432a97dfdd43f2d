// A prepared statement and its owner, and what to ask SQLite about both.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_STATEMENT_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_STATEMENT_H

#include <sqlite3.h>

#include <memory>
#include <string>

namespace OrvaDRCore {

struct FinalizeStatement {
    void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};
using Statement = std::unique_ptr<sqlite3_stmt, FinalizeStatement>;

// Whether a statement is too long to be given to SQLite at all.
bool IsTooLong(const std::string& command);

// Returns SQLite's code, SQLITE_TOOBIG for a statement that is too long. `statement` is null after
// a failure, and for a text that holds no statement.
int PrepareStatement(sqlite3* handle, const std::string& command, Statement& statement);

// Ends a statement before its last row. A statement that writes commits only now, which may fail.
// Returns SQLite's code.
int EndBeforeLastRow(sqlite3_stmt* statement);

// Whether the connection has main and temp alone. False before SQLite 3.39, where there is no way to
// ask.
bool HasNothingAttached(sqlite3* handle);

}  // namespace OrvaDRCore

#endif
