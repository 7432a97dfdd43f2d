#include "cache/cache_document.h"

#include "base/json_helpers.h"

namespace OrvaDRCore {

namespace {

std::optional<std::int64_t> WholeNumber(const Json::Value& document, const char* key)
{
    const Json::Value* number = FindMember(document, key);
    if (number == nullptr || !number->isInt64()) return std::nullopt;
    return number->asInt64();
}

// A refresh whose times are not known has 0 for both.
std::optional<std::int64_t> Time(const Json::Value& document, const char* key)
{
    const std::optional<std::int64_t> time = WholeNumber(document, key);
    return time.value_or(0) < 1 ? std::nullopt : time;
}

}  // namespace

std::optional<CacheFacts> ReadCacheFacts(const Json::Value& document)
{
    if (FindMember(document, CacheKey::Data) == nullptr) return std::nullopt;
    CacheFacts facts{};
    facts.timeout = WholeNumber(document, CacheKey::Timeout);
    if (const Json::Value* info = FindMember(document, CacheKey::Info)) facts.info = *info;
    facts.begin = Time(document, CacheKey::Begin);
    facts.finish = Time(document, CacheKey::Finish);
    const Json::Value* last = FindMember(document, CacheKey::LastRefresh);
    const bool hasTimes = facts.begin && facts.finish;
    if (hasTimes && last != nullptr && last->isNumeric()) facts.lastRefresh = last->asDouble();
    facts.longestRefresh = LongestRefreshOf(document);
    return facts;
}

// A real number counts as absent, although jsoncpp takes 3.0 for an int: the contract says so.
int LongestRefreshOf(const Json::Value& document)
{
    const Json::Value* longest = FindMember(document, CacheKey::LongestRefresh);
    const bool known = longest != nullptr && longest->isInt() && longest->type() != Json::realValue;
    return known ? longest->asInt() : 0;
}

}  // namespace OrvaDRCore
