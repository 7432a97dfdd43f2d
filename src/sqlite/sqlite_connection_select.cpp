// Selects of a connection, and its lookup of tables.
#include <utility>

#include <orvadrcore/errors.h>

#include "base/scope_guard.h"
#include "sqlite/sqlite_connection.h"
#include "sqlite/sqlite_shortcuts.h"
#include "sqlite/sqlite_statement.h"

namespace OrvaDRCore {

bool SqliteConnection::Select(const std::string& command, const TakeRow& takeRow)
{
    error_.Set(ERR::ERR_DATABASE_OPERATION);
    sqlite3* const handle = handle_;
    const BusyTimeoutAccess access(wait_, watch_, command);
    StatementCache::Cached cached;
    const ScopeGuard end([&] {
        cached.statement.reset();
        lookup_.GiveBack();
        EndSelect(handle);
    });
    const StatementWatch::Changes before = watch_.CountChanges();
    const std::uint64_t definitions = watch_.CountDefinitions();
    const char* message = nullptr;
    const bool mayRunCached = !access.IsLeftToSqlite() && MayRunCached(true);
    const bool isShape =
        mayRunCached && ShortcutsInUse().shapes && ReadShape(command, shape_) && shape_.isSelect;
    std::optional<int> begun;
    if (mayRunCached) begun = isShape ? BeginSelectShape(cached) : BeginText(command, cached);
    int code = begun ? *begun : BeginNew(command, cached);
    // After a failure it is given back later, because that changes SQLite's message.
    if (code == SQLITE_ROW || code == SQLITE_DONE) lookup_.GiveBack();
    if (code == SQLITE_ROW) code = TakeRows(cached.statement.get(), takeRow, message);
    if (code != SQLITE_OK && code != SQLITE_DONE) {
        SetFailure(command, code, message != nullptr ? message : sqlite3_errmsg(handle));
        return false;
    }
    if (sqlite3_stmt_readonly(cached.statement.get()) == 0) NoteChangesSince(before);
    const bool isUpToDate = handle_ == handle && watch_.CountDefinitions() == definitions;
    if (begun && isUpToDate) {
        isShape ? cache_.Keep(std::move(cached)) : cache_.KeepSelect(std::move(cached));
    }
    error_.Set(0);
    return true;
}

// Begins to run the select of the shape. The literals are copied, because the caller may change the
// text while rows are given to it.
std::optional<int> SqliteConnection::BeginSelectShape(StatementCache::Cached& cached)
{
    return BeginShape(
        [this](sqlite3_stmt* made) { return BindLiterals(made, shape_, SQLITE_TRANSIENT); },
        cached);
}

std::optional<int> SqliteConnection::BeginText(const std::string& command,
                                               StatementCache::Cached& cached)
{
    const int code = cache_.Take(handle_, command, cached);
    return code == SQLITE_OK ? StepFirst(cached) : code;
}

int SqliteConnection::BeginNew(const std::string& command, StatementCache::Cached& cached)
{
    const int code = PrepareStatement(handle_, command, cached.statement);
    return code == SQLITE_OK ? sqlite3_step(cached.statement.get()) : code;
}

// Returns SQLite's code, and a message for a failure that is not SQLite's.
int SqliteConnection::TakeRows(sqlite3_stmt* statement, const TakeRow& takeRow,
                               const char*& message)
{
    const sqlite3* const handle = handle_;
    int code = SQLITE_ROW;
    RowReader row(statement);
    ++selects_;
    const ScopeGuard ended([this] { --selects_; });
    while (code == SQLITE_ROW) {
        const bool isMoreWanted = takeRow(row);
        if (row.IsOutOfMemory()) {
            message = sqlite3_errstr(SQLITE_NOMEM);
            return SQLITE_NOMEM;
        }
        if (!isMoreWanted) return EndBeforeLastRow(statement);
        if (handle_ != handle) {
            message = "the connection was closed";
            return SQLITE_ABORT;
        }
        code = sqlite3_step(statement);
    }
    return code;
}

// After the statement of a select has ended. SQLite does not close a connection while a statement
// runs, so one that was closed meanwhile is closed here, by the last select on it.
void SqliteConnection::EndSelect(sqlite3* handle)
{
    if (handle_ != handle) {
        sqlite3_close(handle);
    } else if (!IsInTransaction()) {
        wait_.NoteUnlocked();
    }
}

bool SqliteConnection::LookUp(const std::string& table, bool& isFound)
{
    const auto takeRow = [&isFound](const RowReader&) { return isFound = true; };
    const bool isInTransaction = IsInTransaction();
    const bool canCheck = lookup_.CanCheck(handle_, watch_, table);
    const bool reads = canCheck && !isInTransaction && IsReading();
    if (!canCheck || (reads && !HoldsLock())) {  // see MayRunCached()
        return Select(TableLookup::Query(table), takeRow);
    }
    const TableLookup::Moment now{watch_.CountTransactions(), watch_.CountSchemaStatements()};
    if (isInTransaction && lookup_.WasCheckedAt(now) && lookup_.IsKnown(table)) {
        error_.Set(0);
        isFound = true;
        return true;
    }
    error_.Set(ERR::ERR_DATABASE_OPERATION);
    ScopeGuard giveBack([&] {
        lookup_.GiveBack();
        if (!IsInTransaction()) wait_.NoteUnlocked();
    });
    // If the connection reads already, the lock may end with the query, as a full-text table's does.
    // A select from a temporary table would keep the lock to its end, but needs none. After a failed
    // attempt a log line follows.
    const bool mayKeepLock = std::exchange(isLookupLockKept_, false) && !isInTransaction &&
                             !reads && !watch_.HasTempTables();
    const int code = CheckSchema(table);
    if (code == SQLITE_LOCKED) {  // see StepFirst()
        lookup_.GiveBack();
        return Select(TableLookup::Query(table), takeRow);
    }
    if (code != SQLITE_ROW) {
        SetFailure(TableLookup::Query(table), code, nullptr);
        return false;
    }
    if (isInTransaction) lookup_.NoteCheckAt(now);
    if (!lookup_.IsKnown(table)) {
        if (!Select(TableLookup::Query(table), takeRow)) return false;
        if (isFound) lookup_.Remember(table);
        return true;
    }
    error_.Set(0);
    if (mayKeepLock) giveBack.Dismiss();
    isFound = true;
    return true;
}

// Waits as the query would: a name with "busy_timeout" in it leaves the waiting to SQLite.
int SqliteConnection::CheckSchema(const std::string& table)
{
    const BusyTimeoutAccess access(wait_, watch_, table);
    return lookup_.Check(handle_);
}

}  // namespace OrvaDRCore
