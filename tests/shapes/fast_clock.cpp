#include "fast_clock.h"

#include <sys/syscall.h>
#include <time.h>
#include <unistd.h>

namespace {

constexpr int NSecPerMSec = 1'000'000;
constexpr int NSecPerSec = 1'000'000'000;
constexpr int MSecPerSec = 1000;

timespec ahead{};

}  // namespace

namespace Shapes {

void AdvanceClock(int milliseconds)
{
    ahead.tv_sec += milliseconds / MSecPerSec;
    ahead.tv_nsec += static_cast<long>(milliseconds % MSecPerSec) * NSecPerMSec;
    ahead.tv_sec += ahead.tv_nsec / NSecPerSec;
    ahead.tv_nsec %= NSecPerSec;
}

}  // namespace Shapes

// Takes the place of the C library's. All other clocks are the real ones.
extern "C" int clock_gettime(clockid_t clock, timespec* time) noexcept
{
    const auto result = static_cast<int>(::syscall(SYS_clock_gettime, clock, time));
    if (result != 0 || clock != CLOCK_MONOTONIC) return result;
    time->tv_sec += ahead.tv_sec;
    time->tv_nsec += ahead.tv_nsec;
    time->tv_sec += time->tv_nsec / NSecPerSec;
    time->tv_nsec %= NSecPerSec;
    return 0;
}
