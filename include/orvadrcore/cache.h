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
///     const Json::Value status = NodeStatus().Read();
/// \endcode
/// An object is for one thread at a time. Nothing throws unless memory runs out or a subclass does.
/// docs/cache.md has the protocol between the processes, the files and the log lines.
/// \warning A refresh may run in a forked child: GetUpdatedData(), GetInfo() and IsValidData() must
///          not use the caller's SqliteDB, sockets or locks, nor a mutex of other threads. What they
///          throw there is lost, and no destructor or exit handler runs.
/// \warning Run caches as root. If the lock file cannot be opened, it looks as if another process were
///          refreshing: a caller that must wait then waits for ever.
#ifndef ORVADRCORE_CACHE_H
#define ORVADRCORE_CACHE_H

#include <memory>
#include <string>

#include <json/value.h>

#include <orvadrcore/export.h>

namespace OrvaDRCore {

/// A cache of one value; a subclass says which. The order of the virtual operations is part of the ABI.
class ORVADRCORE_API Cache {
  public:
    /// The file is `dir`/`file`.cached. A refresh makes up to `retries` + 2 attempts to produce data
    /// and to write it, or one if `retries` is negative.
    /// \warning If `dir` cannot be made (ERR), or one of the names is empty (WARN), the file is
    ///          /tmp/default_dr_cache, which all such caches share.
    Cache(const std::string& dir, const std::string& file, long timeoutSeconds,
          bool updatedRequired, int retries);

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
    /// Whether the caller refreshes by itself, or waits for whoever does, instead of using old data.
    /// By default when the constructor was told so or the cached data is not valid.
    virtual bool IsUpdatedDataRequired() const;

    // ------------------------------------------------------------------------------------- reading

    /// The data, after a refresh if it is too old, invalid or needs one. Old data, or the default
    /// value, when the refresh failed or runs in the background.
    Json::Value Read() const;
    /// As Read(), without a copy. The reference, like the one that IsValidData() and IsNeedUpdate()
    /// get meanwhile, is good until the next operation on the object.
    const Json::Value& View() const;
    /// The data without a refresh. The file is read only when its modification time has changed.
    Json::Value GetCachedData() const;
    /// Reads the file into memory. On failure, and if the file holds no data, that stays as it was.
    bool Load() const;
    /// Whether the file is older than the time-out, in whole seconds, or missing.
    bool IsTimeout() const;
    /// The longest refresh on record, in seconds.
    int GetMaxUpdateTime() const;
    /// Deletes the file; -1 with errno set on failure. What is in memory stays.
    int Remove();

    // ---------------------------------------------------------------------------------- refreshing

    /// Refreshes data of any age: here, in a child, or by waiting for another process. True after
    /// starting a child or waiting, whatever comes of it. False when the refresh here failed, another
    /// process was faster, or no child could be forked (WARN).
    bool Update() const;
    /// Produces and writes data without a lock or a mark.
    bool DoUpdate() const;
    /// Writes data that was produced from `begin` to `finish`, in seconds since the epoch (0 if not
    /// known). Refuses what IsValidData() refuses and what could not be loaded again: infinities,
    /// more than 999 levels, 2 GiB. On failure file and memory are as they were.
    bool UpdateWithData(const Json::Value& data, long begin, long finish) const;
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
