#include "sqlite/sqlite_connection.h"

#include <memory>
#include <utility>

#include <orvadrcore/errors.h>

#include "base/scope_guard.h"
#include "sqlite/sqlite_statement.h"

namespace OrvaDRCore {

namespace {

struct FreeText {
    void operator()(char* text) const { sqlite3_free(text); }
};

// The statements around work that happens completely or not at all.
struct Bracket {
    const char* begin;
    const char* end;
    const char* undo;
};
// IMMEDIATE, so that waiting for another writer comes before the work.
constexpr Bracket Transaction{"BEGIN IMMEDIATE", "COMMIT", "ROLLBACK"};
constexpr Bracket Savepoint{"SAVEPOINT orvadr_insert", "RELEASE orvadr_insert",
                            "ROLLBACK TO orvadr_insert; RELEASE orvadr_insert"};

}  // namespace

SqliteConnection::SqliteConnection(const std::string& path, unsigned int retryLimit)
    : path_(path), retryLimit_(retryLimit)
{
}

SqliteConnection::~SqliteConnection()
{
    Close();
}

void SqliteConnection::SetFailure(const std::string& command, int sqliteCode, const char* message)
{
    error_.SetFailure(command, sqliteCode, message != nullptr ? message : sqlite3_errmsg(handle_));
}

bool SqliteConnection::Open()
{
    if (sqlite3_open(path_.c_str(), &handle_) != SQLITE_OK) {
        Close();  // SQLite may return a handle although it fails
        return false;
    }
    watch_.Start(handle_);
    return true;
}

bool SqliteConnection::InstallBusyWait()
{
    if (sqlite3_busy_timeout(handle_, BusyTimeoutMSec) != SQLITE_OK) return false;
    wait_.Install(handle_);
    return true;
}

void SqliteConnection::Close()
{
    if (handle_ == nullptr) return;
    wait_.Forget();
    cache_.Clear();
    sqlite3_close(handle_);
    handle_ = nullptr;
}

bool SqliteConnection::Execute(const std::string& command)
{
    const BusyTimeoutAccess access(wait_, watch_, command);
    if (!IsInTransaction()) wait_.Yield();
    char* text = nullptr;  // SQLite does not set it when the handle is null
    Statement refused;
    const int code = IsTooLong(command)
                         ? PrepareStatement(handle_, command, refused)
                         : sqlite3_exec(handle_, command.c_str(), nullptr, nullptr, &text);
    const std::unique_ptr<char, FreeText> message(text);
    if (!IsInTransaction()) wait_.NoteUnlocked();
    if (code != SQLITE_OK) SetFailure(command, code, message.get());
    return code == SQLITE_OK;
}

bool SqliteConnection::Select(const std::string& command, const TakeRow& takeRow)
{
    error_.Set(ERR::ERR_DATABASE_OPERATION);
    const BusyTimeoutAccess access(wait_, watch_, command);
    Statement statement;
    int code = cache_.Take(handle_, command, statement);
    if (code == SQLITE_OK) code = sqlite3_step(statement.get());
    const RowReader row(statement.get());
    while (code == SQLITE_ROW && takeRow(row)) code = sqlite3_step(statement.get());
    if (code == SQLITE_ROW) code = EndBeforeLastRow(statement.get());
    if (!IsInTransaction()) wait_.NoteUnlocked();
    if (code != SQLITE_OK && code != SQLITE_DONE) {
        SetFailure(command, code, nullptr);
        return false;
    }
    cache_.Keep(command, std::move(statement));
    error_.Set(0);
    return true;
}

bool SqliteConnection::RunAtomically(bool isNested, const std::function<bool()>& work)
{
    const Bracket& bracket = isNested ? Savepoint : Transaction;
    if (isNested && !IsInTransaction()) {
        // SQLite has rolled back by itself. A savepoint would begin another transaction, which the
        // caller did not ask for.
        SetFailure(bracket.begin, SQLITE_ABORT, "the transaction was rolled back");
        return false;
    }
    if (!Execute(bracket.begin)) return false;
    // The error stays that of the failure. When SQLite cannot roll back, closing does.
    ScopeGuard undo([&] {
        if (IsInTransaction() &&
            sqlite3_exec(handle_, bracket.undo, nullptr, nullptr, nullptr) != SQLITE_OK) {
            Close();
        }
    });
    if (!work() || !Execute(bracket.end)) return false;
    undo.Dismiss();
    return true;
}

Attempts SqliteConnection::Retry(const std::function<bool()>& attempt)
{
    return RunWithRetries(error_, owner_ != nullptr ? 0 : retryLimit_, attempt);
}

bool SqliteConnection::IsInTransaction() const
{
    return handle_ != nullptr && sqlite3_get_autocommit(handle_) == 0;
}

}  // namespace OrvaDRCore
