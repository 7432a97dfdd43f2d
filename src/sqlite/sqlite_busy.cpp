#include "sqlite/sqlite_busy.h"

#include <strings.h>
#include <unistd.h>

#include <algorithm>
#include <string_view>
#include <utility>

namespace OrvaDRCore {

namespace {

using std::chrono::microseconds;

constexpr microseconds Patience = std::chrono::milliseconds(BusyTimeoutMSec);

// An attempt costs about 20 us of processor time, a commit to a disk half a millisecond and more.
constexpr microseconds ShortestPause(500);
constexpr microseconds LongestPause(2500);
constexpr microseconds LongestPauseOfMany(15'000);
constexpr microseconds LongestFirstPauseInCommit(50);
constexpr microseconds TurnLength(6000);

// The more connections wait, the longer each waits for its turn. Pauses that grow with the wait
// keep the number of attempts per second the same.
constexpr int PausesPerWait = 32;

// Whether the waiting connection has changes to commit. Before SQLite 3.34 there is no way to ask.
bool HasChanges([[maybe_unused]] sqlite3* handle)
{
#if SQLITE_VERSION_NUMBER >= 3034000
    return sqlite3_txn_state(handle, nullptr) == SQLITE_TXN_WRITE;
#else
    return false;
#endif
}

bool NamesBusyTimeout(std::string_view statement)
{
    constexpr std::string_view Name = "busy_timeout";  // in upper or lower case
    constexpr std::size_t Underscore = Name.find('_');
    std::size_t at = statement.find('_');
    for (; at != std::string_view::npos; at = statement.find('_', at + 1)) {
        if (at < Underscore) continue;
        const std::string_view name = statement.substr(at - Underscore, Name.size());
        if (name.size() == Name.size() && ::strncasecmp(name.data(), Name.data(), Name.size()) == 0)
            return true;
    }
    return false;
}

// Processes that start together must not retry at the same moments. Taken when a connection is
// opened, because its object may have been built before a fork.
std::minstd_rand::result_type Seed()
{
    const auto now = std::chrono::steady_clock::now().time_since_epoch().count();
    return static_cast<std::minstd_rand::result_type>(now ^ ::getpid());
}

void Sleep(microseconds time)
{
    ::usleep(static_cast<useconds_t>(time.count()));
}

}  // namespace

void BusyWait::Install(sqlite3* handle)
{
    handle_ = handle;
    random_.seed(Seed());
    TakeBack();
}

void BusyWait::LeaveToSqlite()
{
    sqlite3_busy_timeout(handle_, BusyTimeoutMSec);
}

void BusyWait::TakeBack()
{
    sqlite3_busy_handler(handle_, OnBusy, this);
}

void BusyWait::Yield()
{
    if (yieldUntil_ == Clock::time_point()) return;
    const auto left = std::chrono::duration_cast<Microseconds>(yieldUntil_ - Clock::now());
    yieldUntil_ = Clock::time_point();
    if (left > Microseconds::zero()) Sleep(left);
}

// The pause is half as long as the turn was: long enough for others to get the lock, and the file
// is idle for a small part of the time only, however long a commit takes.
void BusyWait::NoteUnlocked()
{
    if (!hasTurn_) return;
    const Clock::time_point now = Clock::now();
    const Clock::duration turn = now - turnBegin_;
    if (turn < TurnLength) return;
    hasTurn_ = false;
    lastTurnWait_ = std::exchange(turnWait_, Microseconds::zero());
    yieldUntil_ = now + std::min<Clock::duration>(turn / 2, LongestPause);
}

bool BusyWait::AcceptToWait()
{
    refusesToWait_ = false;
    if (!std::exchange(hasRefused_, false)) return false;
    // After a refusal SQLite would not wait in the next prepare, either.
    if (IsInstalled()) TakeBack();
    return true;
}

// SQLite calls this when it meets a lock, with the number of earlier calls for the same lock, and
// retries unless the result is 0.
int BusyWait::OnBusy(void* self, int count)
{
    auto& wait = *static_cast<BusyWait*>(self);
    if (wait.refusesToWait_ && !HasChanges(wait.handle_)) {
        wait.hasRefused_ = true;
        return 0;
    }
    wait.refusesToWait_ = false;
    return wait.Pause(count == 0) ? 1 : 0;
}

bool BusyWait::Pause(bool isFirst)
{
    if (isFirst) asked_ = slept_ = beforeCommit_ = Microseconds::zero();
    const Microseconds spent = Spent();
    if (spent >= Patience) {
        hasTurn_ = false;  // it never came
        return false;
    }

    Microseconds longest = LongestPauseNow();
    Microseconds shortest = ShortestPause;
    const bool isCommitting = HasChanges(handle_);
    if (isCommitting) {
        longest = std::clamp((spent - beforeCommit_) / 8, LongestFirstPauseInCommit, LongestPause);
        shortest = longest / 5;
    }
    const Microseconds pause = Between(shortest, longest);
    const Clock::time_point begin = Clock::now();
    Sleep(pause);
    const Clock::time_point end = Clock::now();
    asked_ += pause;
    slept_ += std::chrono::duration_cast<Microseconds>(end - begin);
    if (isCommitting) return true;
    beforeCommit_ = Spent();
    turnWait_ += Spent() - spent;
    turnBegin_ = end;
    hasTurn_ = true;
    return true;
}

BusyWait::Microseconds BusyWait::LongestPauseNow() const
{
    const Microseconds usual = std::clamp(std::max(turnWait_, lastTurnWait_) / PausesPerWait,
                                          LongestPause, LongestPauseOfMany);
    return ShortestPause +
           (usual - ShortestPause) * (Patience - Spent()).count() / Patience.count();
}

BusyWait::Microseconds BusyWait::Spent() const
{
    return std::max(asked_, slept_);
}

BusyWait::Microseconds BusyWait::Between(Microseconds shortest, Microseconds longest)
{
    std::uniform_int_distribution<Microseconds::rep> any(shortest.count(), longest.count());
    return Microseconds(any(random_));
}

BusyTimeoutAccess::BusyTimeoutAccess(BusyWait& wait, const StatementWatch& watch,
                                     const std::string& statement)
    : wait_(wait), watch_(watch), isLeftToSqlite_(wait.IsInstalled() && NamesBusyTimeout(statement))
{
    if (isLeftToSqlite_) wait_.LeaveToSqlite();
}

BusyTimeoutAccess::~BusyTimeoutAccess()
{
    if (!isLeftToSqlite_ || !wait_.IsInstalled()) return;  // or the connection was closed
    if (watch_.IsBusyTimeoutSet()) {
        wait_.Forget();
    } else {
        wait_.TakeBack();
    }
}

}  // namespace OrvaDRCore
