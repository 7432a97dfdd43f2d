#include "sqlite/sqlite_watch.h"

namespace OrvaDRCore {

void StatementWatch::Start(sqlite3* handle)
{
    handle_ = handle;
    isBusyTimeoutSet_ = false;
    sqlite3_set_authorizer(handle_, Note, this);
}

// SQLite calls this while it prepares a statement, before the statement does anything.
int StatementWatch::Note(void* watch, int action, const char* name, const char* value,
                         const char* /*database*/, const char* /*trigger*/)
{
    auto& self = *static_cast<StatementWatch*>(watch);
    const bool setsPragma = action == SQLITE_PRAGMA && value != nullptr;
    if (setsPragma && sqlite3_stricmp(name, "busy_timeout") == 0) self.isBusyTimeoutSet_ = true;
    const bool beginsOrEnds = action == SQLITE_TRANSACTION || action == SQLITE_SAVEPOINT;
    // Outside of a transaction such a statement can only begin one.
    if (beginsOrEnds && sqlite3_get_autocommit(self.handle_) != 0) ++self.transactions_;
    return SQLITE_OK;
}

}  // namespace OrvaDRCore
