// What a cache has on disk, one JSON document in one file, and in memory.
#ifndef ORVADRCORE_SRC_CACHE_CACHE_FILE_H
#define ORVADRCORE_SRC_CACHE_CACHE_FILE_H

#include <sys/stat.h>

#include <cstddef>
#include <cstdint>
#include <ctime>
#include <optional>
#include <string>

#include <json/value.h>

namespace OrvaDRCore {

// What a refresh stores.
struct CacheEntry {
    std::int64_t timeout;  // seconds
    Json::Value info;
    Json::Value data;
    std::int64_t begin;  // of producing, in seconds since the epoch; below 1 if not known
    std::int64_t finish;
};

// The document to write, as JSON and as text.
struct CacheDocument {
    Json::Value value;
    std::string text;
    int longestRefresh;  // seconds
};

// Tells a file from the one that was there before, even if both were written in the same second.
struct FileVersion {
    FileVersion() = default;
    explicit FileVersion(const struct stat& status)
        : inode(status.st_ino), modified(status.st_mtim), size(status.st_size)
    {
    }

    bool operator==(const FileVersion& other) const
    {
        return inode == other.inode && modified.tv_sec == other.modified.tv_sec &&
               modified.tv_nsec == other.modified.tv_nsec && size == other.size;
    }

    ino_t inode = 0;
    timespec modified{};
    off_t size = 0;
};

// A cache file and the data loaded from it. The modification time tells whether both still agree.
// Nothing here logs; Cache does.
class CacheFile {
  public:
    enum class LoadResult { Loaded, Missing, Unreadable };

    explicit CacheFile(std::string path) : path_(std::move(path)) {}

    const std::string& GetPath() const { return path_; }

    // In whole seconds since the epoch; -1 without a file.
    std::time_t GetModifyTime() const;

    // None without a file.
    std::optional<FileVersion> GetVersion() const;

    const Json::Value& GetData() const { return data_; }
    void SetData(Json::Value data)
    {
        data_ = std::move(data);
        loadedVersion_.reset();
    }

    // Whether the data in memory is that of a file with this modification time.
    bool IsLoaded(std::time_t modifyTime) const;

    // Of the file whose data is in memory; none if the data comes from elsewhere.
    const std::optional<FileVersion>& GetLoadedVersion() const { return loadedVersion_; }

    // When producing that data began, in seconds since the epoch; 0 if not known.
    std::int64_t GetLoadedBegin() const { return loadedBegin_; }

    // Reads the file into memory. On failure memory stays as it was. The contract: a document without
    // "cached_data" counts as loaded and leaves the old data.
    LoadResult Load();

    // The longest refresh so far according to the file, in seconds, or 0.
    int GetLongestRefresh() const;

    // Makes the document for an entry. Reads the longest refresh so far from the file.
    CacheDocument Compose(CacheEntry entry) const;

    // Replaces the file, in one attempt, and takes the data from `document` into memory. On failure
    // nothing changes.
    bool Write(CacheDocument& document);

  private:
    void Remember(const std::string& text, int longestRefresh);

    std::string path_;
    Json::Value data_;
    std::time_t loadedModifyTime_ = -1;
    std::optional<FileVersion> loadedVersion_;
    std::int64_t loadedBegin_ = 0;

    // Size, hash and longest refresh of the text that was loaded or written last.
    std::size_t knownSize_ = 0;
    std::size_t knownHash_ = 0;
    int knownLongestRefresh_ = 0;
};

// Whether a value could be loaded again as data or info of a cache file.
bool IsStorable(const Json::Value& value);

}  // namespace OrvaDRCore

#endif
