// When cached data is fresh: neither too old, nor invalid, nor unwanted.
#ifndef ORVADRCORE_SRC_CACHE_FRESHNESS_H
#define ORVADRCORE_SRC_CACHE_FRESHNESS_H

#include <ctime>

#include <json/value.h>

namespace OrvaDRCore {

class Cache;

// Whether a file of this modification time is older than the time-out, in whole seconds. Without a
// clock every file is.
bool IsTooOld(std::time_t modifyTime, long timeoutSeconds);

// Whether data may be returned without a refresh. Checks age, IsValidData() and IsNeedUpdate() in this
// order, up to the first that refuses.
bool IsFresh(const Cache& cache, const Json::Value& data, std::time_t modifyTime,
             long timeoutSeconds);

}  // namespace OrvaDRCore

#endif
