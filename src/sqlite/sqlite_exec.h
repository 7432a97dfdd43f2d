// Statements without rows, with their retries and log lines.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_EXEC_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_EXEC_H

#include <functional>
#include <string>

namespace OrvaDRCore {

class SqliteConnection;

// Makes the attempts to run a statement and logs as SqliteDB::Exec() does. `text` returns the
// statement; it is called for messages only.
bool ExecWithRetries(SqliteConnection& connection, const std::function<bool()>& attempt,
                     const std::function<std::string()>& text);

}  // namespace OrvaDRCore

#endif
