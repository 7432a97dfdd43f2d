// What the library must know about the statements that run on a connection.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_WATCH_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_WATCH_H

#include <sqlite3.h>

#include <cstdint>

namespace OrvaDRCore {

// Sees every statement that a connection prepares: the library's, the caller's, and each of several
// in one text. It takes notes and, unless asked to, forbids nothing.
class StatementWatch {
  public:
    StatementWatch() = default;
    StatementWatch(const StatementWatch&) = delete;
    StatementWatch& operator=(const StatementWatch&) = delete;
    ~StatementWatch() = default;

    // Watches a connection that was just opened. SQLite holds a pointer to this object, so it must
    // not move while the connection is open. It can watch one connection after the other.
    void Start(sqlite3* handle);

    // To be called before the connection is closed, which may be delayed by running statements.
    void Stop();

    // How many outermost transactions were begun, failed attempts included. While the number stays
    // the same and a transaction is open, it is the same transaction.
    std::uint64_t CountTransactions() const { return transactions_; }

    // Grows with each statement that may change the schema or undo such a change.
    std::uint64_t CountSchemaStatements() const { return schemaStatements_; }

    // Grows with each statement that creates, alters, drops or analyzes something, also if it fails.
    std::uint64_t CountDefinitions() const { return definitions_; }

    // Whether a statement has set the busy timeout of this connection.
    bool IsBusyTimeoutSet() const { return isBusyTimeoutSet_; }

    // Whether a statement has set a pragma with which the schema can be changed so that SQLite does
    // not notice.
    bool IsSchemaUnguarded() const { return isSchemaUnguarded_; }

    // Whether a statement has made a temporary table or view, which may hide a table of the file.
    bool HasTempTables() const { return hasTempTables_; }

    struct Changes {
        // Statements that insert, update or delete rows. A CREATE TABLE is none.
        std::uint64_t statements;
        // The rows that they have changed, without those that triggers and foreign keys change.
        std::int64_t rows;
    };

    // What has been changed so far, through all connections. No statement may be running that
    // changes rows.
    Changes CountChanges();

    // To be called before a cached statement that changes rows: SQLite does not prepare it, so it is
    // not seen. Returns what has been changed before it.
    Changes BeginCached();

    // The rows that were changed through this connection, by triggers and foreign keys, too.
    std::int64_t CountAllRows() const;

    // From now on statements that begin or end a transaction are refused, or not any more.
    void ForbidTransactions(bool isForbidden) { isForbidden_ = isForbidden; }

    // From now on SQLite may not prepare this statement again, as its first step does when the schema
    // has changed. The step fails before it has done anything. What the running statement prepares
    // for its own use is not refused.
    void RefuseToPrepareAgain(sqlite3_stmt* statement)
    {
        refused_ = statement;
        wasRefused_ = false;
    }

    // Ends that. Returns whether SQLite has tried.
    bool AcceptToPrepareAgain()
    {
        refused_ = nullptr;
        return wasRefused_;
    }

  private:
    static int Note(void* watch, int action, const char* first, const char* second,
                    const char* database, const char* trigger);

    bool IsWriting() const;

    sqlite3* handle_ = nullptr;
    std::uint64_t transactions_ = 0;
    std::uint64_t schemaStatements_ = 0;
    std::uint64_t definitions_ = 0;
    bool isBusyTimeoutSet_ = false;
    bool isSchemaUnguarded_ = false;
    bool hasTempTables_ = false;
    bool isForbidden_ = false;
    sqlite3_stmt* refused_ = nullptr;
    bool wasRefused_ = false;
    Changes changes_{};
    std::int64_t allRows_ = 0;  // CountAllRows() when changes_ was counted
};

}  // namespace OrvaDRCore

#endif
