#include "cache/freshness.h"

#include <orvadrcore/cache.h>

namespace OrvaDRCore {

bool IsTooOld(std::time_t modifyTime, long timeoutSeconds)
{
    const std::time_t now = std::time(nullptr);
    return now == -1 || std::difftime(now, modifyTime) > static_cast<double>(timeoutSeconds);
}

bool IsFresh(const Cache& cache, const Json::Value& data, std::time_t modifyTime,
             long timeoutSeconds)
{
    return !IsTooOld(modifyTime, timeoutSeconds) && cache.IsValidData(data) &&
           !cache.IsNeedUpdate(data);
}

}  // namespace OrvaDRCore
