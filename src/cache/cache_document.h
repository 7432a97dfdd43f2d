// The JSON document in a cache file: its keys, and what a reader may take from it.
#ifndef ORVADRCORE_SRC_CACHE_CACHE_DOCUMENT_H
#define ORVADRCORE_SRC_CACHE_CACHE_DOCUMENT_H

#include <cstdint>
#include <optional>

#include <json/value.h>

namespace OrvaDRCore {

namespace CacheKey {

inline constexpr const char* Timeout = "timeout";
inline constexpr const char* Info = "info";
inline constexpr const char* Data = "cached_data";
inline constexpr const char* Begin = "begin_time_to_update";
inline constexpr const char* Finish = "finish_time_to_update";
inline constexpr const char* LastRefresh = "updated_time";
inline constexpr const char* LongestRefresh = "max_updated_time";

}  // namespace CacheKey

// What a document says about its data. What it does not say, or says in another type, is absent.
struct CacheFacts {
    std::optional<std::int64_t> timeout;  // seconds
    Json::Value info;
    std::optional<std::int64_t> begin;  // of producing, in seconds since the epoch
    std::optional<std::int64_t> finish;
    std::optional<double> lastRefresh;  // seconds
    int longestRefresh;                 // seconds; 0 if absent
};

// None if the document is not an object with data.
std::optional<CacheFacts> ReadCacheFacts(const Json::Value& document);

// The longest refresh so far, in seconds; 0 if absent.
int LongestRefreshOf(const Json::Value& document);

}  // namespace OrvaDRCore

#endif
