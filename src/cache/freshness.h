// When cached data is fresh: neither too old, nor invalid, nor unwanted. Nothing here logs, except by
// Cache::Load().
#ifndef ORVADRCORE_SRC_CACHE_FRESHNESS_H
#define ORVADRCORE_SRC_CACHE_FRESHNESS_H

#include <cstdint>
#include <ctime>
#include <optional>

#include <json/value.h>

#include <orvadrcore/cache.h>

#include "cache/cache_file.h"

namespace OrvaDRCore {

// Whether a file of this modification time is older than the time-out, in whole seconds, now or at
// `now`. Without a clock (-1) every file is.
bool IsTooOld(std::time_t modifyTime, std::int64_t timeoutSeconds);
bool IsTooOld(std::time_t modifyTime, std::int64_t timeoutSeconds, std::time_t now);

// Whether data may be returned without a refresh. Checks age, IsValidData() and IsNeedUpdate() in this
// order, up to the first that refuses.
bool IsFresh(const Cache& cache, const Json::Value& data, std::time_t modifyTime,
             std::int64_t timeoutSeconds);

// Looks at a cache's file again and again while fresh data is waited for. What counts is the data's age
// when the object was made. Valid data that a later refresh has brought is fresh in any case: if all
// that wait found it stale, each would refresh in turn.
class FreshnessWatch {
  public:
    // Both must outlive the object.
    FreshnessWatch(const Cache& cache, CacheFile& file, std::int64_t timeoutSeconds);

    // Loads the file if it is another one than at the last look. Data in memory is then the file's,
    // except if the state is None.
    CacheState Look();

  private:
    CacheState Judge(const std::optional<FileVersion>& version) const;

    const Cache& cache_;
    CacheFile& file_;
    const std::int64_t timeoutSeconds_;
    const std::time_t begin_ = std::time(nullptr);
    bool hasLooked_ = false;
    std::optional<FileVersion> seen_;
    CacheState state_ = CacheState::None;
};

}  // namespace OrvaDRCore

#endif
