// How a connection waits for a lock that another one holds.
//
// SQLite's own waiting tries again ever more seldom, up to 100 ms apart, while the connection that
// just wrote comes back at once: some processes write all the time and others starve. Here a waiting
// connection tries again after 0.5 to 2.5 ms, at random. Where many wait, their attempts would keep
// the processors busy, so whoever waits for long has longer pauses, up to 15 ms, and shorter ones
// again as its second runs out.
//
// A connection that had to wait may then write for 6 ms, because passing the lock on costs as much as
// a small write. Before it writes again after that, it pauses so that others get the lock.
//
// Who commits to a file with a rollback journal waits for readers while nobody else can get a lock,
// not even other readers. It tries again within 0.1 ms, and then ever more seldom: most readers that
// it meets are waiting writers, which read for a moment at each of their attempts.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_BUSY_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_BUSY_H

#include <sqlite3.h>

#include <chrono>
#include <random>
#include <string>

#include "sqlite/sqlite_watch.h"

namespace OrvaDRCore {

// How long a single try waits for another connection's lock.
inline constexpr int BusyTimeoutMSec = 1000;

// A connection's busy handler. SQLite holds a pointer to it: it must stay where it is until the
// connection is closed.
class BusyWait {
  public:
    BusyWait() = default;
    BusyWait(const BusyWait&) = delete;
    BusyWait& operator=(const BusyWait&) = delete;
    ~BusyWait() = default;

    // Waits in SQLite's place from now on.
    void Install(sqlite3* connection);

    // Forgets the connection, which was closed or waits in another way now.
    void Forget() { handle = nullptr; }

    bool IsInstalled() const { return handle != nullptr; }

    // Between these two SQLite waits by itself, with the time-out above.
    void LeaveToSqlite();
    void TakeBack();

    // To be called before a statement that may begin to write: pauses for 2.5 ms at most when this
    // connection had to wait, has had its turn, and comes back too soon after it.
    void GiveWay();

    // To be called after each statement that leaves no transaction open.
    void NoteRelease();

  private:
    using Clock = std::chrono::steady_clock;
    using Microseconds = std::chrono::microseconds;

    static int OnBusy(void* self, int count);
    bool Pause(bool isFirst);
    Microseconds LongestPauseNow() const;
    Microseconds Spent() const;
    Microseconds Between(Microseconds shortest, Microseconds longest);

    sqlite3* handle = nullptr;
    std::minstd_rand random;

    // Of the statement that waits, or has waited last: all of its pauses, as they were asked for and
    // as they were, and those of them before it began to commit.
    Microseconds asked{};
    Microseconds slept{};
    Microseconds beforeCommit{};

    // Of this connection's turn: it begins when a wait is over and ends with the first statement
    // that ends more than 6 ms after that.
    bool hasTurn = false;
    Clock::time_point turnBegin;
    Microseconds turnsWait{};        // all pauses since the turn before, but those in commits
    Microseconds lastWait{};         // the same for the turn before
    Clock::time_point giveWayUntil;  // the clock's beginning when there is no need to
};

// To be made before a statement runs and to live as long. `PRAGMA busy_timeout` would answer 0 where
// SQLite does not wait by itself, so that it does while a statement runs that names the busy timeout.
// After a statement that has set it SQLite goes on with what was set, until the connection is opened
// anew.
class BusyTimeoutAccess {
  public:
    BusyTimeoutAccess(BusyWait& connectionsWait, const StatementWatch& connectionsWatch,
                      const std::string& statement);
    BusyTimeoutAccess(const BusyTimeoutAccess&) = delete;
    BusyTimeoutAccess& operator=(const BusyTimeoutAccess&) = delete;
    ~BusyTimeoutAccess();

  private:
    BusyWait& wait;
    const StatementWatch& watch;
    bool isLeft;  // to SQLite
};

}  // namespace OrvaDRCore

#endif
