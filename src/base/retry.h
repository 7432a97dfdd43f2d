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

// Calls `attempt()` until it returns true or has failed `limit` + 1 times, with `pause()` between
// attempts but not after the last.
template <class Attempt, class Pause>
RetryOutcome Retry(std::uint64_t limit, Attempt attempt, Pause pause)
{
    std::uint64_t failures = 0;
    while (!attempt()) {
        if (++failures > limit) return {false, failures};
        pause();
    }
    return {true, failures};
}

}  // namespace OrvaDRCore

#endif
