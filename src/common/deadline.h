// Waiting for a limited time, with short pauses.
#ifndef ORVADRCORE_SRC_COMMON_DEADLINE_H
#define ORVADRCORE_SRC_COMMON_DEADLINE_H

#include <chrono>

namespace OrvaDRCore {

// The moment at which a caller's patience ends. Changes of the system's time do not move it.
class Deadline {
  public:
    using Clock = std::chrono::steady_clock;

    // A negative time counts as none, and one that the clock cannot hold as the longest it can.
    explicit Deadline(std::chrono::milliseconds patience);

    bool IsPassed() const { return Clock::now() >= end_; }
    std::chrono::milliseconds Left() const;  // rounded down; 0 after the end

  private:
    Clock::time_point end_;
};

// Random pauses that grow, so that processes that began to wait together spread out.
class Backoff {
  public:
    Backoff(unsigned int firstMSec, unsigned int longestMSec);

    // Pauses until the deadline at most, and not at all after it. Returns whether time is left.
    bool Pause(const Deadline& deadline);

  private:
    unsigned int next_;  // the most that the next pause may take
    unsigned int longest_;
};

}  // namespace OrvaDRCore

#endif
