#include "sqlite/sqlite_watch.h"

#include <algorithm>
#include <array>

namespace OrvaDRCore {

namespace {

// Before SQLite 3.37 there is only the function that counts in 32 bits.
std::int64_t CountLastRows(sqlite3* handle)
{
#if SQLITE_VERSION_NUMBER >= 3037000
    return sqlite3_changes64(handle);
#else
    return sqlite3_changes(handle);
#endif
}

bool IsSchemaTable(const char* name)
{
    constexpr std::array<const char*, 4> Names = {"sqlite_master", "sqlite_schema",
                                                  "sqlite_temp_master", "sqlite_temp_schema"};
    return std::any_of(Names.begin(), Names.end(),
                       [name](const char* schema) { return sqlite3_stricmp(name, schema) == 0; });
}

// The first lets a program write into the schema tables, and the second sets the number by which
// SQLite notices a changed schema.
bool IsSchemaPragma(const char* name)
{
    return sqlite3_stricmp(name, "writable_schema") == 0 ||
           sqlite3_stricmp(name, "schema_version") == 0;
}

// Those of statements that only read and write rows, and of BEGIN, COMMIT and ROLLBACK.
bool LeavesSchemaAlone(int action)
{
    constexpr std::array<int, 8> Actions = {SQLITE_READ,      SQLITE_SELECT,     SQLITE_FUNCTION,
                                            SQLITE_INSERT,    SQLITE_UPDATE,     SQLITE_DELETE,
                                            SQLITE_RECURSIVE, SQLITE_TRANSACTION};
    return std::find(Actions.begin(), Actions.end(), action) != Actions.end();
}

// SQLite reports "CREATE TABLE temp.t" as it reports other tables.
bool MakesTempTable(int action, const char* database)
{
    const bool makesTable = action == SQLITE_CREATE_TABLE || action == SQLITE_CREATE_TEMP_TABLE ||
                            action == SQLITE_CREATE_VIEW || action == SQLITE_CREATE_TEMP_VIEW ||
                            action == SQLITE_CREATE_VTABLE;
    return makesTable && sqlite3_stricmp(database, "temp") == 0;
}

}  // namespace

void StatementWatch::Start(sqlite3* handle)
{
    handle_ = handle;
    isBusyTimeoutSet_ = false;
    isSchemaUnguarded_ = false;
    hasTempTables_ = false;
    allRows_ = 0;
    sqlite3_set_authorizer(handle_, Note, this);
}

void StatementWatch::Stop()
{
    if (handle_ != nullptr) sqlite3_set_authorizer(handle_, nullptr, nullptr);
    handle_ = nullptr;
}

// SQLite calls this while it prepares a statement, before the statement does anything.
int StatementWatch::Note(void* watch, int action, const char* name, const char* value,
                         const char* database, const char* /*trigger*/)
{
    auto& self = *static_cast<StatementWatch*>(watch);
    if (self.refused_ != nullptr && sqlite3_stmt_busy(self.refused_) == 0) {
        self.wasRefused_ = true;
        return SQLITE_DENY;
    }
    const bool setsPragma = action == SQLITE_PRAGMA && value != nullptr;
    if (setsPragma && sqlite3_stricmp(name, "busy_timeout") == 0) self.isBusyTimeoutSet_ = true;
    if (setsPragma && IsSchemaPragma(name)) self.isSchemaUnguarded_ = true;
    if (!LeavesSchemaAlone(action)) {
        ++self.schemaStatements_;
        // A PRAGMA that sets something may change how statements are prepared. It does so even in an
        // EXPLAIN, which does not make SQLite prepare the others again.
        const bool defines = action != SQLITE_SAVEPOINT && (action != SQLITE_PRAGMA || setsPragma);
        if (defines) ++self.definitions_;
    }
    if (MakesTempTable(action, database)) self.hasTempTables_ = true;
    const bool beginsOrEnds = action == SQLITE_TRANSACTION || action == SQLITE_SAVEPOINT;
    // Outside of a transaction such a statement can only begin one.
    if (beginsOrEnds && sqlite3_get_autocommit(self.handle_) != 0) ++self.transactions_;
    const bool writes =
        action == SQLITE_INSERT || action == SQLITE_UPDATE || action == SQLITE_DELETE;
    if (writes && !IsSchemaTable(name) && !self.IsWriting()) {
        self.CountChanges();  // of the previous statement of the same text
        ++self.changes_.statements;
    }
    return action == SQLITE_TRANSACTION && self.isForbidden_ ? SQLITE_DENY : SQLITE_OK;
}

StatementWatch::Changes StatementWatch::CountChanges()
{
    // SQLite knows the rows of the last statement that changes rows. While the number of all rows
    // stays the same, there was no such statement.
    const std::int64_t allRows = CountAllRows();
    if (handle_ != nullptr && allRows != allRows_) changes_.rows += CountLastRows(handle_);
    allRows_ = allRows;
    return changes_;
}

StatementWatch::Changes StatementWatch::BeginCached()
{
    const Changes before = CountChanges();
    ++changes_.statements;
    return before;
}

std::int64_t StatementWatch::CountAllRows() const
{
    if (handle_ == nullptr) return 0;
#if SQLITE_VERSION_NUMBER >= 3037000
    return sqlite3_total_changes64(handle_);
#else
    return sqlite3_total_changes(handle_);
#endif
}

// Whether a statement runs that may write. SQLite prepares others for its own use meanwhile,
// for example for a VACUUM or for what is inserted into a virtual table.
bool StatementWatch::IsWriting() const
{
    sqlite3_stmt* statement = nullptr;
    while ((statement = sqlite3_next_stmt(handle_, statement)) != nullptr) {
        if (sqlite3_stmt_busy(statement) != 0 && sqlite3_stmt_readonly(statement) == 0) return true;
    }
    return false;
}

}  // namespace OrvaDRCore
