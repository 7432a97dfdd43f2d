/// \file
/// A JSON value in a file that many processes share and one process at a time refreshes.
/// \code
///     class NodeStatus : public Cache {
///       public:
///         NodeStatus() : Cache("/var/cache/dr", "status", 30, false, 2) {}
///         Json::Value GetInfo() const override { return "node status"; }
///         bool GetUpdatedData(Json::Value& data) const override { return AskAllNodes(data); }
///         bool IsValidData(const Json::Value& data) const override { return data.isObject(); }
///     };
///     Json::Value status;
///     if (NodeStatus().ReadWithin(std::chrono::seconds(5), status) == CacheState::None) ...
/// \endcode
/// An object is for one thread at a time: give each thread its own, for the same file. Nothing throws
/// unless memory runs out or a subclass does. docs/cache.md says what to expect of many callers at
/// once, and has the files and the log lines.
/// \warning Read() may refresh in a forked child: GetUpdatedData(), GetInfo() and IsValidData() must
///          not use the caller's SqliteDB, sockets or locks, nor a mutex of other threads. What they
///          throw there is lost, and no destructor or exit handler runs.
/// \warning Without a lock directory a cache is for root. A lock file that cannot be opened looks to
///          Read() as if another process were refreshing: one that must wait waits for ever.
#ifndef ORVADRCORE_CACHE_H
#define ORVADRCORE_CACHE_H

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>

#include <json/value.h>

#include <orvadrcore/export.h>

namespace OrvaDRCore {

/// What Cache::ReadWithin() returns.
enum class CacheState {
    Fresh,  ///< valid data that is not too old and needs no refresh, or that was just produced
    Stale,  ///< valid data, but nothing fresh in time
    None    ///< no valid data: the default value
};

/// A cache of one value; a subclass says which. The order of the virtual operations is part of the ABI.
class ORVADRCORE_API Cache {
  public:
    /// The file is `dir`/`file`.cached; `dir` must be absolute, and is made if missing. A refresh makes
    /// up to `retries` + 2 attempts to produce data and to write it, or one if `retries` is negative.
    /// \warning If `dir` cannot be made (ERR), or one of the names is empty (WARN), the file is
    ///          /tmp/default_dr_cache, which all such caches share.
    Cache(const std::string& dir, const std::string& file, std::int64_t timeoutSeconds,
          bool updatedRequired, int retries);

    /// For any user who may write to `dir` and `lockDir`, where lock and pid file are (0600). `lockDir` is
    /// an absolute path, made with mode 0700 if missing; empty is as without it. All processes must give
    /// a file the same one, and files of the same name in different `dir` different ones.
    Cache(const std::string& dir, const std::string& file, std::int64_t timeoutSeconds,
          bool updatedRequired, int retries, const std::string& lockDir);

    Cache(const Cache& other);             ///< shares the file, and copies what is in memory
    Cache& operator=(const Cache& other);  ///< likewise
    virtual ~Cache();

    // --------------------------------------------------------------------- what a subclass defines

    /// Names the cache, in its file and in log lines.
    virtual Json::Value GetInfo() const = 0;
    /// What GetCachedData() returns without a file; null by default.
    virtual Json::Value GetDefaultValue() const;
    /// Produces fresh data; `data` is null before.
    virtual bool GetUpdatedData(Json::Value& data) const = 0;
    /// Whether data may be cached, and returned without a refresh. Asked of the default value, too.
    virtual bool IsValidData(const Json::Value& data) const = 0;
    /// Whether valid data that is not too old needs a refresh all the same; false by default.
    virtual bool IsNeedUpdate(const Json::Value& data) const;
    /// Whether Read() refreshes in the caller, or waits for whoever does, instead of using old data: by
    /// default when the constructor was told so or the cached data is not valid. Also called before a
    /// refresh of ReadWithin(), which ignores the result.
    virtual bool IsUpdatedDataRequired() const;

    // ------------------------------------------------------------------------------------- reading

    /// The data, after a refresh if it is too old, invalid or needs one. Old data, or the default value
    /// (null), when the refresh runs in the background or failed, when it could not be stored, and when
    /// another process began it a moment earlier. Takes as long as that process, and seconds more while
    /// others hold the lock.
    Json::Value Read() const;
    /// As Read(), without a copy. The reference, like the one that IsValidData() and IsNeedUpdate()
    /// get meanwhile, is good until the next operation on the object.
    const Json::Value& View() const;
    /// Fresh data at once if there is some. Otherwise refreshes it here, never in a child, or waits for
    /// the thread or process that does, looking every few milliseconds. When `patience` is over: old data
    /// or the default value. A GetUpdatedData() that has begun is not interrupted. With 0 or less it
    /// waits for nobody, but refreshes if nobody else does. Of all that wait one produces; if its attempts
    /// fail, the next. Data that could not be stored or locked is Fresh all the same (WARN).
    CacheState ReadWithin(std::chrono::milliseconds patience, Json::Value& data) const;
    /// The data without a refresh. The file is read only when its modification time has changed.
    Json::Value GetCachedData() const;
    /// Reads the file into memory. On failure, and if the file holds no data, that stays as it was.
    bool Load() const;
    /// Whether the file is older than the time-out, in whole seconds, or missing.
    bool IsTimeout() const;
    /// The cache file.
    const std::string& GetPath() const;
    /// The longest refresh on record, in seconds.
    int GetMaxUpdateTime() const;
    /// Deletes the file; -1 with errno set on failure. What is in memory stays.
    int Remove();

    // ---------------------------------------------------------------------------------- refreshing

    /// Refreshes data of any age: here, in a child, or by waiting for another process that was seen
    /// refreshing. True after starting a child or waiting, whatever the result. False when the refresh
    /// here failed, another process was faster (it is not waited for), or no child could be forked (WARN).
    bool Update() const;
    /// Produces and writes data without a lock or a mark.
    bool DoUpdate() const;
    /// Writes data that was produced from `begin` to `finish`, in seconds since the epoch (0 if not
    /// known). Refuses what IsValidData() refuses and what could not be loaded again: infinities,
    /// more than 999 levels, 2 GiB. On failure file and memory are as they were.
    bool UpdateWithData(const Json::Value& data, std::int64_t begin, std::int64_t finish) const;
    bool UpdateWithData(const Json::Value& data) const;  ///< with times not known

  private:
    bool IsUpdating() const;
    bool SetUpdating() const;
    void UnsetUpdating() const;

    struct ORVADRCORE_LOCAL Impl;
    std::unique_ptr<Impl> impl_;
};

}  // namespace OrvaDRCore

#endif
