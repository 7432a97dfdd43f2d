#include "common/deadline.h"

#include <algorithm>

#include <orvadrcore/utils.h>

namespace OrvaDRCore {

using std::chrono::milliseconds;

Deadline::Deadline(milliseconds patience) : end_(Clock::now())
{
    // Compared in milliseconds: as nanoseconds a very large patience would overflow.
    const auto most = std::chrono::duration_cast<milliseconds>(Clock::time_point::max() - end_);
    end_ += std::clamp(patience, milliseconds(0), most);
}

milliseconds Deadline::Left() const
{
    const auto left = std::chrono::duration_cast<milliseconds>(end_ - Clock::now());
    return std::max(left, milliseconds(0));
}

// RandomSleepInMSec() needs two different bounds.
Backoff::Backoff(unsigned int firstMSec, unsigned int longestMSec)
    : next_(std::max(firstMSec, 2U)), longest_(std::max(longestMSec, 2U))
{
}

bool Backoff::Pause(const Deadline& deadline)
{
    if (deadline.IsPassed()) return false;
    // One more than is left, because that is rounded down.
    const milliseconds most = std::min(deadline.Left() + milliseconds(1), milliseconds(next_));
    const auto longest = std::max(static_cast<unsigned int>(most.count()), 2U);
    RandomSleepInMSec(longest / 2, longest);
    next_ = std::min(2 * next_, longest_);
    return !deadline.IsPassed();
}

}  // namespace OrvaDRCore
