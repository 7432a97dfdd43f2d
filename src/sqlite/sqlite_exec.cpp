// The retries and log lines of statements without rows.
#define DR_LOG_FILE "sqlite_db.cpp"

#include "sqlite/sqlite_exec.h"

#include <orvadrcore/errors.h>

#include "base/log.h"
#include "sqlite/sqlite_connection.h"

namespace OrvaDRCore {

bool ExecWithRetries(SqliteConnection& connection, const std::function<bool()>& attempt,
                     const std::function<std::string()>& text)
{
    constexpr const char* Function = "Exec";
    if (!connection.IsOpen()) {
        connection.Refuse(ERR::ERR_NULL_POINTER);
        DR_LOG_AS(Function, Err, "DB[%s] is not opened", connection.GetPath().c_str());
        return false;
    }
    const Attempts attempts = connection.Retry(attempt);
    if (!attempts.succeeded) {
        DR_LOG_AS(Function, Warn,
                  "Reach retry limit [%u], failed to exec command [%s] with err[%s]",
                  attempts.failures, text().c_str(), attempts.errors.c_str());
    } else if (attempts.failures > 0) {
        DR_LOG_AS(Function, Info,
                  "After retry [%u] times, success to exec command [%s], previous errors[%s]",
                  attempts.failures, text().c_str(), attempts.errors.c_str());
    }
    return attempts.succeeded;
}

}  // namespace OrvaDRCore
