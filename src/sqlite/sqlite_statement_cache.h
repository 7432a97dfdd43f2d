// The statements that a connection keeps prepared.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_STATEMENT_CACHE_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_STATEMENT_CACHE_H

#include <sqlite3.h>

#include <string>
#include <string_view>
#include <vector>

#include "sqlite/sqlite_statement.h"

namespace OrvaDRCore {

// The statements that were used last: selects by their text, and statements by their shape, which has
// parameters in the place of literals. There are up to 20, which take up to 36 KiB.
//
// A statement that is taken belongs to its user. Others may be taken meanwhile, even for the same
// text, which is then prepared once more.
//
// A cached statement is reset, so it holds no lock, and nothing is bound to it. SQLite prepares it
// again by itself when its tables have changed. SQLite closes no connection that has statements, so
// the cache must be cleared before.
//
// While a database is attached nothing is cached. SQLite looks for a table in one database after
// another, and a statement that found it in a later one would not notice a new table of the same
// name in an earlier one.
class StatementCache {
  public:
    struct Cached {
        Statement statement;
        int bytes = 0;          // of its memory; 0 until it is put back for the first time
        std::string_view text;  // SQLite's copy of it

        bool WasCached() const { return bytes != 0; }
    };

    // Whether statements may be cached now. If not, the cache is empty afterwards.
    bool IsUsable(sqlite3* handle);

    // Takes a statement out of the cache, or prepares it. Returns SQLite's code.
    int Take(sqlite3* handle, const std::string& text, Cached& cached);

    // Resets a statement that was taken for a shape and puts it back. One that may not be cached, or
    // is too large, is left to the caller. Needs no memory.
    void Keep(Cached&& cached);

    // The same for a statement that was taken for a text. Leaves also one that writes or is unusually
    // long.
    void KeepSelect(Cached&& cached);

    void Clear() { cached_.clear(); }

  private:
    // The index of a statement, or the number of all if it is not cached.
    std::size_t Find(std::string_view text) const;

    std::vector<Cached> cached_;  // the one used last comes last
};

}  // namespace OrvaDRCore

#endif
