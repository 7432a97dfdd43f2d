#include "sqlite/sqlite_connection.h"

#include <memory>
#include <utility>

#include <orvadrcore/errors.h>

#include "base/scope_guard.h"
#include "sqlite/sqlite_insert.h"
#include "sqlite/sqlite_shortcuts.h"
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

// Whether a transaction has the lock that a statement of this kind needs. Otherwise the statement would
// take it, and leave it there after a failure.
bool HasLock([[maybe_unused]] sqlite3* handle, [[maybe_unused]] bool isSelect)
{
#if SQLITE_VERSION_NUMBER >= 3034000
    return sqlite3_txn_state(handle, "main") >= (isSelect ? SQLITE_TXN_READ : SQLITE_TXN_WRITE);
#else
    return false;
#endif
}

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
    affectedRows_ = 0;
    error_.SetFailure(command, sqliteCode, message != nullptr ? message : sqlite3_errmsg(handle_));
    NoteExtendedCode();
}

// SQLite's extended code says more, if it is that of the same failure.
void SqliteConnection::NoteExtendedCode()
{
    constexpr int PrimaryBits = 0xff;
    const int extended = sqlite3_extended_errcode(handle_);
    if ((extended & PrimaryBits) == error_.GetSqliteCode()) error_.SetSqliteCode(extended);
}

void SqliteConnection::Refuse(int code)
{
    lookup_.GiveBack();  // a log line follows
    affectedRows_ = 0;
    error_.Set(code);
}

std::int64_t SqliteConnection::GetLastInsertId() const
{
    return handle_ != nullptr ? sqlite3_last_insert_rowid(handle_) : 0;
}

bool SqliteConnection::Open()
{
    if (sqlite3_open(path_.c_str(), &handle_) != SQLITE_OK) {
        affectedRows_ = 0;
        error_.SetSqliteCode(sqlite3_extended_errcode(handle_));
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
    watch_.Stop();
    cache_.Clear();
    lookup_.Clear();
    // A statement that still runs may commit at its end. It must not call the handler, which has
    // forgotten the connection.
    sqlite3_busy_handler(handle_, nullptr, nullptr);
    sqlite3_close(handle_);  // fails inside of a select, which closes it at its end
    handle_ = nullptr;
}

bool SqliteConnection::Execute(const std::string& command)
{
    if (!ShortcutsInUse().shapes || !ReadShape(command, shape_) || shape_.isSelect) {
        return ExecuteText(command);
    }
    StatementCache::Cached cached;
    const std::optional<int> code = ExecuteShape(
        [this](sqlite3_stmt* made) { return BindLiterals(made, shape_, SQLITE_STATIC); }, cached);
    if (!code) return ExecuteText(command);
    if (*code != SQLITE_DONE) SetFailure(command, *code, nullptr);
    return *code == SQLITE_DONE;
}

bool SqliteConnection::Insert(const InsertCommand& command)
{
    if (!WriteInsertShape(command, shape_.text)) return ExecuteText(command.GetCommand());
    StatementCache::Cached cached;
    const std::optional<int> code =
        ExecuteShape([&](sqlite3_stmt* made) { return BindInsert(made, command); }, cached);
    if (!code) return ExecuteText(command.GetCommand());
    if (*code != SQLITE_DONE) SetFailure(command.GetCommand(), *code, nullptr);
    return *code == SQLITE_DONE;
}

// Whether a cached statement may run now. Clears the cache if it may not be used any more.
//
// A cached statement may have become wrong. It notices that only when it has its lock, while a new one
// fails before it takes any. So a cached one must not wait for a lock, for which our own busy handler is
// needed, nor take one that would stay after its failure. Nor may it end one that a virtual table has
// kept, as it does when SQLite prepares it again.
bool SqliteConnection::MayRunCached(bool isSelect)
{
    // After a failed definition SQLite may keep a schema that only new statements see.
    const std::uint64_t before = std::exchange(definitions_, watch_.CountDefinitions());
    if (before != definitions_) cache_.Clear();
    if (!wait_.IsInstalled() || !cache_.IsUsable(handle_)) return false;
    if (IsInTransaction()) return HasLock(handle_, isSelect);
    return !IsReading() || (isSelect && HoldsLock());
}

// Steps a statement once, without waiting for a lock if it was cached. Returns SQLite's code, or none
// if a lock was met. Then the statement has done nothing, and must be prepared anew.
std::optional<int> SqliteConnection::StepFirst(StatementCache::Cached& cached)
{
    if (!cached.WasCached()) return sqlite3_step(cached.statement.get());
    wait_.RefuseToWait();
    const int code = sqlite3_step(cached.statement.get());
    const bool metLock = wait_.AcceptToWait();
    // Connections that share a cache meet locks without waiting. Their texts meet other ones.
    const bool isLocked = metLock || code == SQLITE_LOCKED;
    if (!isLocked || code == SQLITE_ROW || code == SQLITE_DONE) return code;
    // Unless it was only the lock, SQLite has prepared it again in vain, without a look at the changed
    // schema.
    StatementCache::Cached ended = std::exchange(cached, {});
    if (code == SQLITE_BUSY) cache_.Keep(std::move(ended));
    return {};
}

// Begins to run the statement of the shape. Returns SQLite's code, or none if the text must be run
// instead: because of a lock or a changed schema, or because SQLite's message might show parameters.
std::optional<int> SqliteConnection::BeginShape(const Bind& bind, StatementCache::Cached& cached)
{
    const int taken = cache_.Take(handle_, shape_.text, cached);
    if (taken == SQLITE_ERROR) return {};
    if (taken != SQLITE_OK) return taken;
    if (bind(cached.statement.get()) != SQLITE_OK) return {};
    // SQLite prepares a statement again if its plan depends on the values, and if another connection has
    // changed the schema. Then it compares the values with partial indexes more loosely than literals,
    // 5 is 5.0 there, and the order of rows would be another.
    watch_.RefuseToPrepareAgain(cached.statement.get());
    const std::optional<int> code = StepFirst(cached);
    if (!watch_.AcceptToPrepareAgain()) return code;
    cached = {};
    return {};
}

// Runs the statement of the shape, which writes. The result is that of BeginShape(). SQLite's message
// of a failure is there as long as the statement.
std::optional<int> SqliteConnection::ExecuteShape(const Bind& bind, StatementCache::Cached& cached)
{
    if (!MayRunCached(false)) return {};
    if (!IsInTransaction()) wait_.Yield();
    const StatementWatch::Changes before = watch_.BeginCached();
    std::optional<int> code = BeginShape(bind, cached);
    while (code == SQLITE_ROW) code = sqlite3_step(cached.statement.get());  // PRAGMA count_changes
    if (code != SQLITE_DONE) sqlite3_reset(cached.statement.get());          // gives its locks back
    if (!IsInTransaction()) wait_.NoteUnlocked();
    if (code == SQLITE_DONE) {
        NoteChangesSince(before);
        cache_.Keep(std::move(cached));
    }
    return code;
}

bool SqliteConnection::ExecuteText(const std::string& command)
{
    const BusyTimeoutAccess access(wait_, watch_, command);
    const StatementWatch::Changes before = watch_.CountChanges();
    if (!IsInTransaction()) wait_.Yield();
    char* text = nullptr;  // SQLite does not set it when the handle is null
    Statement refused;
    const int code = IsTooLong(command)
                         ? PrepareStatement(handle_, command, refused)
                         : sqlite3_exec(handle_, command.c_str(), nullptr, nullptr, &text);
    const std::unique_ptr<char, FreeText> message(text);
    if (!IsInTransaction()) wait_.NoteUnlocked();
    if (code != SQLITE_OK) {
        SetFailure(command, code, message.get());
        return false;
    }
    NoteChangesSince(before);
    return true;
}

bool SqliteConnection::ExecuteInTransaction(const std::string& command)
{
    watch_.ForbidTransactions(true);
    const ScopeGuard allow([&] { watch_.ForbidTransactions(false); });
    return Execute(command);
}

// After statements that have succeeded. Those that change no rows leave the number as it was.
void SqliteConnection::NoteChangesSince(const StatementWatch::Changes& before)
{
    const StatementWatch::Changes now = watch_.CountChanges();
    if (now.statements != before.statements) affectedRows_ = now.rows - before.rows;
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
    if (!work()) {
        NoteExtendedCode();
        return false;
    }
    if (!Execute(bracket.end)) return false;
    undo.Dismiss();
    return true;
}

Attempts SqliteConnection::Retry(const std::function<bool()>& attempt,
                                 const std::function<bool()>& mayRepeat)
{
    Attempts attempts =
        RunWithRetries(error_, owner_ != nullptr ? 0 : retryLimit_, attempt, mayRepeat);
    if (!attempts.succeeded) affectedRows_ = 0;
    return attempts;
}

bool SqliteConnection::IsReading() const
{
#if SQLITE_VERSION_NUMBER >= 3034000
    return sqlite3_txn_state(handle_, "main") != SQLITE_TXN_NONE;
#else
    return false;
#endif
}

bool SqliteConnection::IsInTransaction() const
{
    return handle_ != nullptr && sqlite3_get_autocommit(handle_) == 0;
}

}  // namespace OrvaDRCore
