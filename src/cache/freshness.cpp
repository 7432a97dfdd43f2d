#include "cache/freshness.h"

#include <algorithm>

namespace OrvaDRCore {

bool IsTooOld(std::time_t modifyTime, std::int64_t timeoutSeconds)
{
    return IsTooOld(modifyTime, timeoutSeconds, std::time(nullptr));
}

bool IsTooOld(std::time_t modifyTime, std::int64_t timeoutSeconds, std::time_t now)
{
    return now == -1 || std::difftime(now, modifyTime) > static_cast<double>(timeoutSeconds);
}

bool IsFresh(const Cache& cache, const Json::Value& data, std::time_t modifyTime,
             std::int64_t timeoutSeconds)
{
    return !IsTooOld(modifyTime, timeoutSeconds) && cache.IsValidData(data) &&
           !cache.IsNeedUpdate(data);
}

FreshnessWatch::FreshnessWatch(const Cache& cache, CacheFile& file, std::int64_t timeoutSeconds)
    : cache_(cache), file_(file), timeoutSeconds_(timeoutSeconds)
{
}

CacheState FreshnessWatch::Look()
{
    const std::optional<FileVersion> version = file_.GetVersion();
    const bool isInMemory = version == file_.GetLoadedVersion() || state_ == CacheState::None;
    if (hasLooked_ && version == seen_ && isInMemory) return state_;
    state_ = Judge(version);
    seen_ = version;
    hasLooked_ = true;
    return state_;
}

CacheState FreshnessWatch::Judge(const std::optional<FileVersion>& version) const
{
    const bool isLoaded = version && version == file_.GetLoadedVersion();
    if (!isLoaded && !cache_.Load()) return CacheState::None;
    const std::time_t modifyTime = file_.GetLoadedVersion()->modified.tv_sec;
    // The earlier time, because the clock may have been set back.
    const std::time_t now = std::min(begin_, std::time(nullptr));
    const Json::Value& data = file_.GetData();
    if (!cache_.IsValidData(data)) return CacheState::None;
    if (hasLooked_ && file_.GetLoadedBegin() >= begin_) return CacheState::Fresh;
    return IsTooOld(modifyTime, timeoutSeconds_, now) || cache_.IsNeedUpdate(data)
               ? CacheState::Stale
               : CacheState::Fresh;
}

}  // namespace OrvaDRCore
