#include "cache/attempts.h"

#include <cstdint>

#include <orvadrcore/utils.h>

#include "base/retry.h"

namespace OrvaDRCore {

namespace {

// With a deadline: the first pause at most, and the longest.
constexpr unsigned int FirstMSec = 20;
constexpr unsigned int LongestMSec = 1000;

}  // namespace

bool PauseBeforeProducing()
{
    RandomSleepInMSec(500, 1000);
    return true;
}

bool PauseBeforeWriting()
{
    RandomSleepInMSec(300, 1000);
    return true;
}

Pause PauseUntil(const Deadline& deadline)
{
    return [deadline, pauses = Backoff(FirstMSec, LongestMSec)]() mutable {
        return pauses.Pause(deadline);
    };
}

bool RetryAttempts(int limit, const std::function<bool()>& attempt, const Pause& pause)
{
    bool isDone = false;
    bool isTimeLeft = true;
    Retry(
        limit < 0 ? 0 : static_cast<std::uint64_t>(limit) + 1,
        [&] { return !isTimeLeft || (isDone = attempt()); }, [&] { isTimeLeft = pause(); });
    return isDone;
}

}  // namespace OrvaDRCore
