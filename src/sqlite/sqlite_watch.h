// What the statements of a connection do, as far as the library has to know it.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_WATCH_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_WATCH_H

#include <sqlite3.h>

#include <cstdint>

namespace OrvaDRCore {

// Sees every statement that a connection prepares: those of the library, those that a caller gives
// it as text, and each of several in one text. It only takes notes and allows everything.
class StatementWatch {
  public:
    StatementWatch() = default;
    StatementWatch(const StatementWatch&) = delete;
    StatementWatch& operator=(const StatementWatch&) = delete;
    ~StatementWatch() = default;

    // Watches a connection that was just opened. The object must stay where it is until the
    // connection is closed; it can watch one connection after the other.
    void Start(sqlite3* connection);

    // How many transactions were begun outside of any other, those that failed to begin included.
    // While the number stays the same and a transaction is open, it is the same transaction.
    std::uint64_t CountTransactions() const { return transactions; }

    // Whether a statement has set the busy timeout of this connection.
    bool IsBusyTimeoutSet() const { return isBusyTimeoutSet; }

  private:
    static int Note(void* watch, int action, const char* first, const char* second,
                    const char* database, const char* trigger);

    sqlite3* handle = nullptr;
    std::uint64_t transactions = 0;
    bool isBusyTimeoutSet = false;
};

}  // namespace OrvaDRCore

#endif
