// The selects that a connection keeps prepared.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_STATEMENT_CACHE_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_STATEMENT_CACHE_H

#include <sqlite3.h>

#include <string>
#include <vector>

#include "sqlite/sqlite_statement.h"

namespace OrvaDRCore {

// The eight selects that were used last. A statement that is taken belongs to its user. Others may be
// taken meanwhile, even for the same text, which is then prepared once more.
//
// A cached statement is reset, so it holds no lock, and SQLite prepares it again by itself when its
// tables have changed. SQLite closes no connection that has statements, so the cache must be cleared
// before.
//
// While a database is attached nothing is cached. SQLite looks for a table in one database after
// another, and a statement that found it in a later one would not notice a new table of the same
// name in an earlier one.
class StatementCache {
  public:
    // Takes a statement out of the cache, or prepares it. Returns SQLite's code.
    int Take(sqlite3* handle, const std::string& command, Statement& statement);

    // Puts back a statement that was taken, unless it writes or is unusually long.
    void Keep(const std::string& command, Statement statement);

    void Clear() { selects_.clear(); }

  private:
    // Moves a select to the end. False when it is not cached.
    bool MakeLast(const std::string& command);

    struct Select {
        std::string command;
        Statement statement;  // null while it is taken, and after it failed
    };
    std::vector<Select> selects_;  // the one used last comes last
};

}  // namespace OrvaDRCore

#endif
