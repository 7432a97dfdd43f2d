#include "library_locks.h"

#include <signal.h>
#include <sys/time.h>
#include <syslog.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <locale>
#include <new>
#include <utility>

#include "base/errno.h"

namespace {

// A process that waits for a lock uses no processor time. Nor does one that the scheduler does not
// run, but that gets the ticks of all that time as one. So two idle ticks in a row mean a lock.
constexpr long TickUSec = 500;
constexpr int IdleTicksWhenStuck = 2;

// Sanitizers spin while they wait for a lock. There, only the number of ticks shows it.
constexpr int TicksWhenStuck = 400;

// A tick with less processor time than this is idle.
constexpr long IdleNSec = 50'000;

// The state of the signal handler. Only a process with a single thread uses it.
struct Watch {
    void (*whenStuck)();
    std::timespec used;
    int ticks;
    int idleTicks;
};
Watch watch{};

std::timespec UsedProcessorTime()
{
    std::timespec used{};
    ::clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &used);
    return used;
}

std::int64_t NSecBetween(const std::timespec& begin, const std::timespec& end)
{
    constexpr std::int64_t NSecPerSec = 1'000'000'000;
    return (end.tv_sec - begin.tv_sec) * NSecPerSec + end.tv_nsec - begin.tv_nsec;
}

void OnTick(int /*signal*/)
{
    const OrvaDRCore::PreserveErrno preserve;
    const std::timespec used = UsedProcessorTime();
    const bool isIdle = NSecBetween(watch.used, used) < IdleNSec;
    watch.used = used;
    watch.idleTicks = isIdle ? watch.idleTicks + 1 : 0;
    if (watch.idleTicks == IdleTicksWhenStuck || ++watch.ticks == TicksWhenStuck) watch.whenStuck();
}

void SetTicks(long microseconds)
{
    const itimerval timer{{0, microseconds}, {0, microseconds}};
    ::setitimer(ITIMER_REAL, &timer, nullptr);
}

// The address sanitizer's allocator has a lock for each size class, which it takes when a thread's
// cache of that class is empty. Unlike glibc it does not reset them in a child.
void TakeAllocatorLocks()
{
#ifdef ORVADR_SANITIZE
    struct Block {
        Block* next;
    };
    // Classes lie 16 bytes apart at first, and then no closer than an eighth of their size. The last
    // size has no class, and a lock of its own.
    constexpr std::size_t MostCached = 256;  // of one class
    constexpr std::size_t MostBytes = 131'072;
    constexpr std::size_t Step = 16;
    Block* taken = nullptr;
    for (std::size_t size = Step; size <= 2 * MostBytes; size += std::max(Step, size / 8)) {
        for (std::size_t count = 0; count <= std::min(MostCached, MostBytes / size); ++count) {
            void* const memory = std::malloc(size);
            if (memory != nullptr) taken = new (memory) Block{taken};
        }
    }
    while (taken != nullptr) std::free(std::exchange(taken, taken->next));
#endif
}

}  // namespace

void TakeLibraryLocks()
{
    std::array<char, 128> text{};
    [[maybe_unused]] const char* const translated =  // as "%m" does
        ::strerror_r(EDEADLK, text.data(), text.size());
    const std::time_t time = 0;
    std::tm parts{};
    ::localtime_r(&time, &parts);  // as syslog() does for its time stamp
    const std::locale copy;        // as each stream makes one
    // Reads the mask, under the lock of syslog().
    ::setlogmask(0);  // NOLINT(concurrency-mt-unsafe)
}

void TakeLibraryLocksOr(void (*whenStuck)())
{
    watch = {whenStuck, UsedProcessorTime(), 0, 0};
    struct sigaction onTick {};
    onTick.sa_handler = OnTick;
    struct sigaction action {};
    ::sigaction(SIGALRM, &onTick, &action);
    sigset_t alarm;
    ::sigemptyset(&alarm);
    ::sigaddset(&alarm, SIGALRM);
    sigset_t mask;
    ::sigprocmask(SIG_UNBLOCK, &alarm, &mask);  // NOLINT(concurrency-mt-unsafe): a single thread

    SetTicks(TickUSec);
    TakeAllocatorLocks();
    TakeLibraryLocks();
    SetTicks(0);

    ::sigprocmask(SIG_SETMASK, &mask, nullptr);  // NOLINT(concurrency-mt-unsafe): likewise
    ::sigaction(SIGALRM, &action, nullptr);
}
