// What an open connection has beside SQLite's handle.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_STATE_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_STATE_H

#include "sqlite/sqlite_busy.h"
#include "sqlite/sqlite_statement.h"
#include "sqlite/sqlite_watch.h"

namespace OrvaDRCore {

// It stays where it is when the SqliteDB is moved, because SQLite is given pointers to it, and
// serves one connection after the other when the SqliteDB is closed and opened again.
struct ConnectionState {
    StatementWatch watch;
    BusyWait wait;
    StatementCache cache;
};

}  // namespace OrvaDRCore

#endif
