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

// An attempt costs some 20 us of processor time, a commit to a disk half a millisecond and more.
constexpr microseconds ShortestPause(500);
constexpr microseconds LongestPause(2500);
constexpr microseconds LongestPauseOfMany(15'000);
constexpr microseconds LongestFirstPauseInCommit(50);
constexpr microseconds TurnLength(6000);

// A wait for the turn grows with the number of those that wait. Pauses that grow with it keep the
// number of attempts in a second the same.
constexpr int PausesInAWait = 32;

// Whether the connection waits with changes of its own. Before SQLite 3.34 there is no way to ask.
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

// Processes that start together must not try at the same moments.
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

void BusyWait::Install(sqlite3* connection)
{
    handle = connection;
    random.seed(Seed());
    TakeBack();
}

void BusyWait::LeaveToSqlite()
{
    sqlite3_busy_timeout(handle, BusyTimeoutMSec);
}

void BusyWait::TakeBack()
{
    sqlite3_busy_handler(handle, OnBusy, this);
}

void BusyWait::GiveWay()
{
    if (giveWayUntil == Clock::time_point()) return;
    const auto left = std::chrono::duration_cast<Microseconds>(giveWayUntil - Clock::now());
    giveWayUntil = Clock::time_point();
    if (left > Microseconds::zero()) Sleep(left);
}

// For half as long as the turn was: then others get the lock, and the file is idle for a small part
// of the time only, however long a commit takes.
void BusyWait::NoteRelease()
{
    if (!hasTurn) return;
    const Clock::time_point now = Clock::now();
    const Clock::duration turn = now - turnBegin;
    if (turn < TurnLength) return;
    hasTurn = false;
    lastWait = std::exchange(turnsWait, Microseconds::zero());
    giveWayUntil = now + std::min<Clock::duration>(turn / 2, LongestPause);
}

// SQLite calls this when it has met a lock, with the number of calls before, and tries again if the
// answer is not 0.
int BusyWait::OnBusy(void* self, int count)
{
    return static_cast<BusyWait*>(self)->Pause(count == 0) ? 1 : 0;
}

bool BusyWait::Pause(bool isFirst)
{
    if (isFirst) asked = slept = beforeCommit = Microseconds::zero();
    const Microseconds spent = Spent();
    if (spent >= Patience) {
        hasTurn = false;  // which never came
        return false;
    }

    Microseconds longest = LongestPauseNow();
    Microseconds shortest = ShortestPause;
    const bool isCommitting = HasChanges(handle);
    if (isCommitting) {
        longest = std::clamp((spent - beforeCommit) / 8, LongestFirstPauseInCommit, LongestPause);
        shortest = longest / 5;
    }
    const Microseconds pause = Between(shortest, longest);
    const Clock::time_point begin = Clock::now();
    Sleep(pause);
    const Clock::time_point end = Clock::now();
    asked += pause;
    slept += std::chrono::duration_cast<Microseconds>(end - begin);
    if (isCommitting) return true;
    beforeCommit = Spent();
    turnsWait += Spent() - spent;
    turnBegin = end;
    hasTurn = true;
    return true;
}

// Of a connection that waits for its turn.
BusyWait::Microseconds BusyWait::LongestPauseNow() const
{
    const Microseconds usual =
        std::clamp(std::max(turnsWait, lastWait) / PausesInAWait, LongestPause, LongestPauseOfMany);
    return ShortestPause +
           (usual - ShortestPause) * (Patience - Spent()).count() / Patience.count();
}

BusyWait::Microseconds BusyWait::Spent() const
{
    return std::max(asked, slept);
}

BusyWait::Microseconds BusyWait::Between(Microseconds shortest, Microseconds longest)
{
    std::uniform_int_distribution<Microseconds::rep> any(shortest.count(), longest.count());
    return Microseconds(any(random));
}

BusyTimeoutAccess::BusyTimeoutAccess(BusyWait& connectionsWait,
                                     const StatementWatch& connectionsWatch,
                                     const std::string& statement)
    : wait(connectionsWait),
      watch(connectionsWatch),
      isLeft(wait.IsInstalled() && NamesBusyTimeout(statement))
{
    if (isLeft) wait.LeaveToSqlite();
}

BusyTimeoutAccess::~BusyTimeoutAccess()
{
    if (!isLeft) return;
    if (watch.IsBusyTimeoutSet()) {
        wait.Forget();
    } else {
        wait.TakeBack();
    }
}

}  // namespace OrvaDRCore
