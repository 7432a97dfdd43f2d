// What a SqliteDB holds: the connection to its file, and the error of the last operation.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_CONNECTION_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_CONNECTION_H

#include <sqlite3.h>

#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "sqlite/sqlite_busy.h"
#include "sqlite/sqlite_error.h"
#include "sqlite/sqlite_retry.h"
#include "sqlite/sqlite_row_reader.h"
#include "sqlite/sqlite_shape.h"
#include "sqlite/sqlite_statement_cache.h"
#include "sqlite/sqlite_table_lookup.h"
#include "sqlite/sqlite_watch.h"

namespace OrvaDRCore {

class InsertCommand;
class SqliteTransaction;

// Runs statements and logs nothing: SqliteDB and SqliteTransaction do that. It stays where it is
// when its SqliteDB is moved, because SQLite holds pointers to its members.
class SqliteConnection {
  public:
    SqliteConnection(const std::string& path, unsigned int retryLimit);
    SqliteConnection(const SqliteConnection&) = delete;
    SqliteConnection& operator=(const SqliteConnection&) = delete;
    ~SqliteConnection();

    const std::string& GetPath() const { return path_; }
    unsigned int GetRetryLimit() const { return retryLimit_; }
    sqlite3* GetHandle() const { return handle_; }

    SqliteError& Error() { return error_; }

    // Sets the error to a failure of SQLite. Without a message it is SQLite's last one.
    void SetFailure(const std::string& command, int sqliteCode, const char* message);

    // Sets the error of an operation that fails without SQLite.
    void Refuse(int code);

    // The rows that the last operation with rows to change has changed; 0 after a failure.
    std::int64_t GetAffectedRows() const { return affectedRows_; }
    void SetAffectedRows(std::int64_t rows) { affectedRows_ = rows; }

    // How many rows were changed since the connection was opened, by triggers, too.
    std::int64_t CountAllRows() const { return watch_.CountAllRows(); }

    // 0 when the connection is closed or has inserted nothing.
    std::int64_t GetLastInsertId() const;

    // The two steps of opening a connection that is closed. When the second fails, the connection
    // is open and waits for no lock. Neither changes the error, except SQLite's code when the first
    // fails.
    bool Open();
    bool InstallBusyWait();

    bool IsOpen() const { return handle_ != nullptr; }
    void Close();

    // One attempt to run the statements of a text. Success leaves the error as it was.
    bool Execute(const std::string& command);

    // The same for a text that may not begin or end a transaction.
    bool ExecuteInTransaction(const std::string& command);

    // One attempt to run an INSERT, whose values are bound if possible. For an InsertCommand itself,
    // not for a derived class.
    bool Insert(const InsertCommand& command);

    // One attempt to run a statement that has rows. Each row is given to `takeRow`, which returns
    // whether it wants another. It may use this connection, close it, and throw.
    using TakeRow = std::function<bool(RowReader&)>;
    bool Select(const std::string& command, const TakeRow& takeRow);

    // One attempt to find out whether a table exists.
    bool LookUp(const std::string& table, bool& isFound);

    // While kept, a lookup that finds its table outside of a transaction leaves its shared lock to
    // the first attempt of the next select, which gives it back after its first step. Nothing of the
    // caller's code, no log line and no pause may come in between. False gives it back.
    void KeepLookupLock(bool isKept)
    {
        isLookupLockKept_ = isKept;
        if (!isKept) lookup_.GiveBack();
    }

    // One attempt to do work in a transaction of its own or, nested, in a savepoint of the open
    // transaction. When the work or the commit fails, all of it is rolled back.
    bool RunAtomically(bool isNested, const std::function<bool()>& work);

    // While a transaction has an owner, nothing is retried: SQLite may have rolled it back by
    // itself, and a second attempt would run outside of it.
    Attempts Retry(const std::function<bool()>& attempt,
                   const std::function<bool()>& mayRepeat = AlwaysRepeat);

    bool IsInTransaction() const;

    // How many transactions were begun: while a transaction is open, its number.
    std::uint64_t CountTransactions() const { return watch_.CountTransactions(); }

    // The SqliteTransaction that began the last transaction and has not been told that it is over.
    const SqliteTransaction* GetOwner() const { return owner_; }
    void SetOwner(const SqliteTransaction* owner) { owner_ = owner; }

  private:
    using Bind = std::function<int(sqlite3_stmt*)>;

    int CheckSchema(const std::string& table);
    bool MayRunCached(bool isSelect);
    std::optional<int> StepFirst(StatementCache::Cached& cached);
    std::optional<int> BeginShape(const Bind& bind, StatementCache::Cached& cached);
    std::optional<int> BeginSelectShape(StatementCache::Cached& cached);
    std::optional<int> BeginText(const std::string& command, StatementCache::Cached& cached);
    int BeginNew(const std::string& command, StatementCache::Cached& cached);
    std::optional<int> ExecuteShape(const Bind& bind, StatementCache::Cached& cached);
    bool ExecuteText(const std::string& command);
    int TakeRows(sqlite3_stmt* statement, const TakeRow& takeRow, const char*& message);
    void EndSelect(sqlite3* handle);
    void NoteChangesSince(const StatementWatch::Changes& before);
    void NoteExtendedCode();

    // Whether a connection outside of a transaction has a lock, and whether by itself: a select of it
    // runs, or its lookup. Otherwise a virtual table has kept the lock.
    bool IsReading() const;
    bool HoldsLock() const { return selects_ > 0 || lookup_.IsChecking(); }

    const std::string path_;
    const unsigned int retryLimit_;
    SqliteError error_;
    std::int64_t affectedRows_ = 0;
    sqlite3* handle_ = nullptr;
    StatementWatch watch_;
    BusyWait wait_;
    StatementCache cache_;
    std::uint64_t definitions_ = 0;  // when the cache was used last
    TableLookup lookup_;
    bool isLookupLockKept_ = false;
    Shape shape_;               // of the statement that is about to run; kept for its memory
    unsigned int selects_ = 0;  // that give their rows to callers
    const SqliteTransaction* owner_ = nullptr;
};

}  // namespace OrvaDRCore

#endif
