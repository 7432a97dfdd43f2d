// How a refresh repeats what fails. Nothing here logs.
#ifndef ORVADRCORE_SRC_CACHE_ATTEMPTS_H
#define ORVADRCORE_SRC_CACHE_ATTEMPTS_H

#include <functional>

#include "common/deadline.h"

namespace OrvaDRCore {

// Pauses between two attempts. False when no time is left for another one.
using Pause = std::function<bool()>;

// Those of a refresh that may take as long as it needs.
bool PauseBeforeProducing();
bool PauseBeforeWriting();

// Those of a refresh that has a deadline.
Pause PauseUntil(const Deadline& deadline);

// Makes one attempt more than Retry() would with the cache's limit, and a single one if the limit is
// negative: the contract says so. Also stops when `pause` returns false. Returns whether one succeeded.
bool RetryAttempts(int limit, const std::function<bool()>& attempt, const Pause& pause);

}  // namespace OrvaDRCore

#endif
