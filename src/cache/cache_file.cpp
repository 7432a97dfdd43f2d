#include "cache/cache_file.h"

#include <sys/stat.h>

#include <algorithm>
#include <functional>
#include <limits>
#include <optional>
#include <utility>

#include "base/file_io.h"
#include "base/json_helpers.h"
#include "base/replace_file.h"
#include "cache/cache_document.h"

namespace OrvaDRCore {

namespace {

std::size_t HashOf(const std::string& text)
{
    return std::hash<std::string>()(text);
}

std::int64_t BeginOf(const Json::Value& document)
{
    const Json::Value* begin = FindMember(document, CacheKey::Begin);
    return begin != nullptr && begin->isInt64() ? begin->asInt64() : 0;
}

int ToWholeSeconds(double seconds)
{
    constexpr double Largest = std::numeric_limits<int>::max();
    return static_cast<int>(std::clamp(seconds, -Largest, Largest));
}

}  // namespace

std::time_t CacheFile::GetModifyTime() const
{
    struct stat status {};
    return ::stat(path_.c_str(), &status) == 0 ? status.st_mtime : -1;
}

std::optional<FileVersion> CacheFile::GetVersion() const
{
    struct stat status {};
    if (::stat(path_.c_str(), &status) != 0) return std::nullopt;
    return FileVersion(status);
}

bool CacheFile::IsLoaded(std::time_t modifyTime) const
{
    return modifyTime != -1 && modifyTime == loadedModifyTime_;
}

CacheFile::LoadResult CacheFile::Load()
{
    // The time is taken before reading, so that the next lookup notices a write in between.
    struct stat status {};
    if (::stat(path_.c_str(), &status) != 0) return LoadResult::Missing;
    std::string text;
    Json::Value document;
    if (!ReadRegularFile(path_, text) || !fromString(document, text)) return LoadResult::Unreadable;

    Remember(text, LongestRefreshOf(document));
    if (FindMember(document, CacheKey::Data) != nullptr) data_.swap(document[CacheKey::Data]);
    loadedModifyTime_ = status.st_mtime;
    loadedVersion_ = FileVersion(status);
    loadedBegin_ = BeginOf(document);
    return LoadResult::Loaded;
}

int CacheFile::GetLongestRefresh() const
{
    std::string text;
    if (!ReadRegularFile(path_, text)) return 0;
    // A text that this object has loaded or written is not parsed again. Modification times cannot
    // tell, because two changes within one step of the clock have the same.
    if (text.size() == knownSize_ && HashOf(text) == knownHash_) return knownLongestRefresh_;
    Json::Value document;
    return fromString(document, text) ? LongestRefreshOf(document) : 0;
}

CacheDocument CacheFile::Compose(CacheEntry entry) const
{
    if (entry.begin < 1 || entry.finish < 1) entry.begin = entry.finish = 0;
    const double took = std::difftime(entry.finish, entry.begin);
    const int longest = std::max(GetLongestRefresh(), ToWholeSeconds(took));

    Json::Value document(Json::objectValue);
    document[CacheKey::Timeout] = Json::Int64{entry.timeout};
    document[CacheKey::Info].swap(entry.info);
    document[CacheKey::Data].swap(entry.data);
    document[CacheKey::Begin] = Json::Int64{entry.begin};
    document[CacheKey::Finish] = Json::Int64{entry.finish};
    document[CacheKey::LastRefresh] = took;
    document[CacheKey::LongestRefresh] = longest;
    std::string text = toString(document);
    return {std::move(document), std::move(text), longest};
}

bool CacheFile::Write(CacheDocument& document)
{
    struct stat written {};
    if (!ReplaceFile(path_, document.text, std::nullopt, &written)) return false;
    data_.swap(document.value[CacheKey::Data]);
    loadedModifyTime_ = written.st_mtime;
    loadedVersion_ = FileVersion(written);
    loadedBegin_ = BeginOf(document.value);
    Remember(document.text, document.longestRefresh);
    return true;
}

void CacheFile::Remember(const std::string& text, int longestRefresh)
{
    knownSize_ = text.size();
    knownHash_ = HashOf(text);
    knownLongestRefresh_ = longestRefresh;
}

bool IsStorable(const Json::Value& value)
{
    return IsReadable(value, 1);  // below the document
}

}  // namespace OrvaDRCore
