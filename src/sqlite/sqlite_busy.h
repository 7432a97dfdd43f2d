// How a connection waits for a lock that another connection holds.
//
// SQLite's own waiting retries less and less often, up to 100 ms apart, while the connection that
// just wrote comes back at once: some processes write all the time and others starve. Here a
// waiting connection retries after a random 0.5 to 2.5 ms. When many wait, their attempts would
// keep the processors busy, so the pauses grow with the wait, up to 15 ms, and shrink again as its
// second runs out.
//
// A connection that had to wait may then write for 6 ms, because passing the lock on costs as much
// as a small write. Before its next write it pauses, so that others get the lock.
//
// With a rollback journal, a commit that waits for readers keeps everybody else out, even new
// readers. It retries within 0.1 ms, and then less and less often: most of the readers it meets are
// waiting writers, which read for a moment at each of their attempts.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_BUSY_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_BUSY_H

#include <sqlite3.h>

#include <chrono>
#include <random>
#include <string>

#include "sqlite/sqlite_watch.h"

namespace OrvaDRCore {

// How long one attempt waits for another connection's lock.
inline constexpr int BusyTimeoutMSec = 1000;

// A connection's busy handler. SQLite holds a pointer to it, so it must not move while the
// connection is open.
class BusyWait {
  public:
    BusyWait() = default;  // NOLINT(cert-msc32-c,cert-msc51-cpp): Install() seeds the generator
    BusyWait(const BusyWait&) = delete;
    BusyWait& operator=(const BusyWait&) = delete;
    ~BusyWait() = default;

    // Waits instead of SQLite from now on.
    void Install(sqlite3* handle);

    // For a connection that was closed, or that SQLite waits for by itself now.
    void Forget() { handle_ = nullptr; }

    bool IsInstalled() const { return handle_ != nullptr; }

    // Between these two calls SQLite waits by itself, with the time-out above.
    void LeaveToSqlite();
    void TakeBack();

    // To be called before a statement that may write. Pauses for 2.5 ms at most when this
    // connection had to wait, has used up its turn and comes back too soon.
    void Yield();

    // To be called after each statement that leaves no transaction open.
    void NoteUnlocked();

    // From now on a statement that meets a lock before it has changed anything fails at once.
    void RefuseToWait() { refusesToWait_ = true; }

    // Ends that. Returns whether a statement met a lock meanwhile, and did not wait for it.
    bool AcceptToWait();

  private:
    using Clock = std::chrono::steady_clock;
    using Microseconds = std::chrono::microseconds;

    static int OnBusy(void* self, int count);
    bool Pause(bool isFirst);
    Microseconds LongestPauseNow() const;
    Microseconds Spent() const;
    Microseconds Between(Microseconds shortest, Microseconds longest);

    sqlite3* handle_ = nullptr;
    bool refusesToWait_ = false;
    bool hasRefused_ = false;  // since RefuseToWait()
    std::minstd_rand random_;

    // All pauses of the statement that waits or has waited last: as they were asked for, as long as
    // they took, and those before it began to commit.
    Microseconds asked_{};
    Microseconds slept_{};
    Microseconds beforeCommit_{};

    // A turn begins when a wait ends. It ends with the first statement that finishes more than 6 ms
    // later.
    bool hasTurn_ = false;
    Clock::time_point turnBegin_;
    Microseconds turnWait_{};       // all pauses since the previous turn, except those in commits
    Microseconds lastTurnWait_{};   // the same for the previous turn
    Clock::time_point yieldUntil_;  // the clock's epoch when there is no need to yield
};

// Makes `PRAGMA busy_timeout` work as if SQLite waited by itself; it would answer 0 otherwise.
// While this object lives, SQLite does wait by itself if the statement names the busy timeout. If
// the statement has set it, that stays so until the connection is opened again.
class BusyTimeoutAccess {
  public:
    BusyTimeoutAccess(BusyWait& wait, const StatementWatch& watch, const std::string& statement);
    BusyTimeoutAccess(const BusyTimeoutAccess&) = delete;
    BusyTimeoutAccess& operator=(const BusyTimeoutAccess&) = delete;
    ~BusyTimeoutAccess();

    bool IsLeftToSqlite() const { return isLeftToSqlite_; }

  private:
    BusyWait& wait_;
    const StatementWatch& watch_;
    const bool isLeftToSqlite_;
};

}  // namespace OrvaDRCore

#endif
