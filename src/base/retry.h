// How the library retries. The callers log.
#ifndef ORVADRCORE_SRC_BASE_RETRY_H
#define ORVADRCORE_SRC_BASE_RETRY_H

#include <cstdint>

namespace OrvaDRCore {

struct RetryOutcome {
    bool succeeded;
    // Attempts that failed. 64 bits, because it may be one more than the largest limit.
    std::uint64_t failures;
};

// Calls `attempt()` until it returns true, has failed `limit` + 1 times, or has failed so that
// `mayRepeat()` is false; with `pause()` between attempts but not after the last.
template <class Attempt, class Pause, class MayRepeat>
RetryOutcome Retry(std::uint64_t limit, Attempt attempt, Pause pause, MayRepeat mayRepeat)
{
    std::uint64_t failures = 0;
    while (!attempt()) {
        if (++failures > limit || !mayRepeat()) return {false, failures};
        pause();
    }
    return {true, failures};
}

template <class Attempt, class Pause>
RetryOutcome Retry(std::uint64_t limit, Attempt attempt, Pause pause)
{
    return Retry(limit, attempt, pause, [] { return true; });
}

}  // namespace OrvaDRCore

#endif
