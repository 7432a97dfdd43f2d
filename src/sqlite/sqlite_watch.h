// What the library must know about the statements that run on a connection.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_WATCH_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_WATCH_H

#include <sqlite3.h>

#include <cstdint>

namespace OrvaDRCore {

// Sees every statement that a connection prepares: the library's, the caller's, and each of several
// in one text. It takes notes and forbids nothing.
class StatementWatch {
  public:
    StatementWatch() = default;
    StatementWatch(const StatementWatch&) = delete;
    StatementWatch& operator=(const StatementWatch&) = delete;
    ~StatementWatch() = default;

    // Watches a connection that was just opened. SQLite holds a pointer to this object, so it must
    // not move while the connection is open. It can watch one connection after the other.
    void Start(sqlite3* handle);

    // How many outermost transactions were begun, failed attempts included. While the number stays
    // the same and a transaction is open, it is the same transaction.
    std::uint64_t CountTransactions() const { return transactions_; }

    // Whether a statement has set the busy timeout of this connection.
    bool IsBusyTimeoutSet() const { return isBusyTimeoutSet_; }

  private:
    static int Note(void* watch, int action, const char* first, const char* second,
                    const char* database, const char* trigger);

    sqlite3* handle_ = nullptr;
    std::uint64_t transactions_ = 0;
    bool isBusyTimeoutSet_ = false;
};

}  // namespace OrvaDRCore

#endif
