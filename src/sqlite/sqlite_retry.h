// Runs an operation of a connection with its retries.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_RETRY_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_RETRY_H

#include <functional>
#include <string>

#include "sqlite/sqlite_error.h"

namespace OrvaDRCore {

struct Attempts {
    bool succeeded;
    unsigned int failures;
    std::string errors;  // of the failed attempts, as text for the log; empty without a failure
};

inline bool AlwaysRepeat()
{
    return true;
}

// Calls `attempt()` until it succeeds, has failed `limit` + 1 times, or has failed so that
// `mayRepeat()` is false, with a random pause of 500 to 1000 ms in between. Each attempt starts
// without an error and sets its own when it fails. When all have failed, the error becomes the list
// of theirs.
Attempts RunWithRetries(SqliteError& error, unsigned int limit,
                        const std::function<bool()>& attempt,
                        const std::function<bool()>& mayRepeat = AlwaysRepeat);

}  // namespace OrvaDRCore

#endif
