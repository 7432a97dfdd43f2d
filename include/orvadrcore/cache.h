/// \file
/// A JSON document on disk that many processes share and exactly one at a time refreshes.
///
/// The smallest cache says three things:
/// \code
///     class NodeStatus : public Cache {
///       public:
///         NodeStatus() : Cache("/var/cache/dr", "status", 30, false, 2) {}
///         Json::Value GetInfo() const override { return "node status"; }
///         bool GetUpdatedData(Json::Value& data) const override { return AskAllNodes(data); }
///         bool IsValidData(const Json::Value& data) const override { return data.isObject(); }
///     };
///
///     const Json::Value status = NodeStatus().Read();
/// \endcode
///
/// **Fresh or stale.** Data is fresh when the file is not older than the time-out, IsValidData()
/// accepts it and IsNeedUpdate() does not object. Its age is that of the file, in whole seconds;
/// times written inside do not count.
///
/// **Who waits.** Read() gives fresh data at once. Of stale data it makes one process the updater,
/// marked by a pid file. When IsUpdatedDataRequired() says so, the refresh runs in the calling
/// process, and a process that meets another updater waits for it. By default that is so when the
/// constructor was told, and whenever what is cached is not valid, as before the first refresh.
/// Otherwise Read() starts a child that refreshes in the background, or finds one at work, and
/// gives the old data at once.
///
/// **What runs in the child.** A background refresh forks. GetUpdatedData(), GetInfo(), IsValidData()
/// and what they call then run in the child, which ends without exit handlers or destructors. What
/// they compute reaches others through the cache file alone. An exception out of them ends the
/// child; in a caller that waits, it goes on to the caller after the pid file has been removed.
/// - Of the caller's threads only one exists in the child. A lock that another thread held at the
///   fork stays locked there for ever. The library sees to it that memory, streams, locales, times,
///   error texts and syslog() can be used. Not so a mutex of your own, a library with locks of its
///   own, a lookup of host names, and SQLite, where another thread uses it at the same time.
/// - Do not use what the caller has open: not its SqliteDB (SQLite connections do not survive a
///   fork), not its sockets, not its locks. Open your own. A database in which the caller is inside
///   a transaction cannot be used in the child at all. What you need from a database that other
///   threads use, fetch before the fork: IsUpdatedDataRequired() is called in the caller, before
///   each refresh.
/// - The child inherits the caller's descriptors, and with them its locks. A FileLock that the
///   caller holds and then destroys stays held until the child has ended, too; FileLock::unlock()
///   frees it for both.
/// - Flush your streams before Read(), or do not write to them in the child: what was not flushed is
///   there twice, and may be written twice.
///
/// An object is used by one thread at a time and holds no file and no lock between calls. Nothing
/// throws by itself unless memory runs out. Log lines are at DEBUG unless said otherwise and name
/// the file `cache.cpp`.
///
/// \warning The lock of a cache is a FileLock. Where it cannot be opened at all (no rights, no
///          descriptors left, a name too long) every process seems to find another one updating: a
///          caller that has to wait then waits without end. With the modes of lock files this means
///          that caches are for processes running as root.
/// \warning Whether data is stale is not asked again once a process has become the updater: a late
///          caller may refresh once more what has just been refreshed. What holds is that no two
///          refresh at the same time.
#ifndef ORVADRCORE_CACHE_H
#define ORVADRCORE_CACHE_H

#include <cstddef>
#include <ctime>
#include <string>

#include <json/value.h>

#include <orvadrcore/export.h>

namespace OrvaDRCore {

/// A cache of one JSON value; subclasses say what it holds. The head of cache.h tells when data is
/// fresh, who waits, what may run in a child and what holds for threads. The order of the virtual
/// operations is part of the binary interface.
class ORVADRCORE_API Cache {
  public:
    /// Names the cache; nothing is read yet. The cache file is `dir` + "/" + `file` + ".cached";
    /// beside it lies, while a refresh runs, the same with ".pid".
    /// \param dir              its directory, made with mode 0755 when missing
    /// \param file             its name, without ".cached"
    /// \param timeoutSeconds   data whose file is older is stale, counted in whole seconds; with a
    ///                         negative time-out every file is
    /// \param updatedRequired  callers always need fresh data: refresh in the caller, and wait
    /// \param retries          how often producing and writing are tried again: this many times
    ///                         plus one; not at all when negative
    /// \note Logs WARN `Invalid dir[%s] and file[%s] to cache` when one of them is empty and ERR
    ///       `Failed to create [%s]`, behind the lines of File::CreateDir(), when the directory
    ///       cannot be made (function `GetCachedPath`). The cache file is then
    ///       /tmp/default_dr_cache, which all such caches share.
    Cache(const std::string& dir, const std::string& file, long timeoutSeconds,
          bool updatedRequired, int retries);

    virtual ~Cache();

    // -------------------------------------------------------------- what a subclass has to say

    /// A value that names this cache and its parameters: stored in the file, printed in log lines.
    /// \return any value
    virtual Json::Value GetInfo() const = 0;

    /// What GetCachedData() gives when nothing can be loaded.
    /// \return the value; null by default
    virtual Json::Value GetDefaultValue() const;

    /// Produces fresh data; may run in a forked child.
    /// \param[out] data  the data; null before the call
    /// \return false when there is none
    virtual bool GetUpdatedData(Json::Value& data) const = 0;

    /// Whether data may be cached, and given out without a refresh.
    /// \param data  what was produced or loaded, or the default value
    /// \return true when it may
    virtual bool IsValidData(const Json::Value& data) const = 0;

    /// Whether data that is neither old nor invalid is to be refreshed all the same, for instance
    /// because it says that it is incomplete.
    /// \param data  valid data
    /// \return true for a refresh; false by default
    virtual bool IsNeedUpdate(const Json::Value& data) const;

    /// Whether callers have to wait for fresh data.
    /// \return by default true when the constructor was told so, and otherwise when the cached data
    ///         is not valid
    virtual bool IsUpdatedDataRequired() const;

    // ------------------------------------------------------------------------------------- reading

    /// The data, refreshed when it is stale: see the head of cache.h.
    /// \return fresh data; old data while another process refreshes, or when the refresh failed,
    ///         with DEBUG `Failed to update cache [%s], use old cache data.`; the default value
    ///         when there is none
    /// \note Where callers wait, there is no limit to it: the wait ends when the file is fresh or
    ///       no updater lives any more.
    Json::Value Read() const;

    /// As Read(), without a copy: for large data that is looked at often.
    /// \return the data in memory; a reference that is good until the next operation on the object,
    ///         whichever it is, and not longer than the object. Where Read() gives old data because
    ///         the refresh failed, this is what is in memory by then, which may be newer
    /// \note Logs as Read(), under its own name.
    /// \warning IsValidData() and IsNeedUpdate() get this very data. One that calls an operation of
    ///          its object, such as GetCachedData(), may lose what it was given.
    const Json::Value& View() const;

    /// The data as it is, from memory while the file's modification time is that of the last load
    /// or write, otherwise from the file.
    /// \return the data; the default value when the file cannot be loaded, with DEBUG
    ///         `Failed to load cache [%s], use default cache data` behind the line of Load()
    Json::Value GetCachedData() const;

    /// Reads the file into memory. A document without "cached_data" counts as loaded and leaves the
    /// data in memory as it was.
    /// \return false with DEBUG `no data is cached in [%s]` (no file) or
    ///         `Failed to read data from cache [%s]` (no JSON document, one that cannot be read to
    ///         its end, or no regular file: a pipe is not waited for); the data in memory is as it
    ///         was then
    bool Load() const;

    /// Whether the file is older than the time-out. A missing file counts as one from before 1970.
    /// \return true when it is older, or when the time cannot be told
    bool IsTimeout() const;

    /// The longest refresh so far, as the file says.
    /// \return seconds; 0 when the file does not say, or not as an integer
    int GetMaxUpdateTime() const;

    /// Deletes the cache file. Data in memory and the pid file stay.
    /// \return 0, or -1 with errno set, also when there is no file
    int Remove();

    // ---------------------------------------------------------------------------------- refreshing

    /// Gets the data refreshed, whether it is stale or not: here, in a child, or by waiting for
    /// another process, as IsUpdatedDataRequired() says.
    /// \return true after a refresh here, when a child was started, when another process is at
    ///         work, and after waiting for one, whatever came of it. False when the refresh here
    ///         failed, or when another process was faster to begin one; and with WARN
    ///         `Failed to fork(). errno=[%d/%m]` when no child could be made. EDEADLK there means that
    ///         other threads held a lock of the C library at each of 500 forks, or at each of 50 and
    ///         for five seconds
    /// \note A caller that waits looks again after pauses of 300 to 1000 milliseconds. It logs, at
    ///       DEBUG, `start to block wait cache [%s] ` before and
    ///       `finish to block wait cache [%s] ` after, both with a blank at the end.
    /// \note A refresh logs, at DEBUG, `---> Start to update cache [%s]` once it is marked in the
    ///       pid file, or why it was not (function `SetUpdating`): `Failed to lock [%s]` (not to be
    ///       had within six tries, a second apart), `there is other process to update cache [%s]`
    ///       or `Failed to set cache [%s] updating` (the pid file could not be written). At its end
    ///       it logs, at DEBUG, `<--- Finish to update cache [%s]`, or
    ///       `Failed to unset updating cache [%s] since different pid[%d]` when the pid file is by
    ///       then that of another living process (function `UnsetUpdating`). In between come the
    ///       lines of DoUpdate(); those of the lock are at ERR, see FileLock::lock().
    bool Update() const;

    /// Produces data, with retries after pauses of 500 to 1000 milliseconds, and writes it. Takes
    /// no lock and marks nothing.
    /// \return false with DEBUG
    ///         `Failed to get updated cache [%s] and reach the retry limit[%d]`, or as
    ///         UpdateWithData()
    bool DoUpdate() const;

    /// Writes data, with retries after pauses of 300 to 1000 milliseconds; the file is replaced
    /// whole. Takes no lock and marks nothing. What could not be loaded again is not written: data,
    /// or a GetInfo(), that holds an infinity or nests more than 999 levels deep, and a document of
    /// 2 GiB or more.
    /// \param data    the data; not a number is written as null
    /// \param begin   when producing began, in seconds since the epoch; below 1 if not known
    /// \param finish  when it ended, likewise; when one is not known, both are stored as 0
    /// \return false with DEBUG `[%s] is not valid to update for cache [%s]` (IsValidData() refuses
    ///         the data, or it could not be loaded again; a text of more than 5000 levels is given
    ///         as `(nested too deep)`) or
    ///         `Failed to write cache to file [%s] and reach retry limit[%d]` (also, without a try,
    ///         for a document of 2 GiB or more); file and data in memory are as they were
    bool UpdateWithData(const Json::Value& data, long begin, long finish) const;

    /// As above, times not known.
    /// \param data  the data
    /// \return as above
    bool UpdateWithData(const Json::Value& data) const;

  private:
    ORVADRCORE_LOCAL std::string PidPath() const;
    ORVADRCORE_LOCAL std::string LockName() const;
    ORVADRCORE_LOCAL const Json::Value& LoadedData(std::time_t& modifyTime) const;
    ORVADRCORE_LOCAL bool GivesWay(const char* function, const Json::Value& data,
                                   std::time_t modifyTime) const;
    ORVADRCORE_LOCAL bool IsTooOld(std::time_t modifyTime) const;
    bool IsUpdating() const;
    bool SetUpdating() const;
    void UnsetUpdating() const;
    ORVADRCORE_LOCAL void WaitForUpdater() const;
    ORVADRCORE_LOCAL bool Refresh() const;
    [[noreturn]] ORVADRCORE_LOCAL void RefreshInChild() const;

    std::string cachedPath;
    long timeout;
    bool updatedDataRequired;
    int retryLimit;
    mutable Json::Value cachedData;
    mutable std::time_t loadedModifyTime = -1;

    // The text that was loaded or written last, and the longest refresh that it speaks of.
    struct KnownText {
        std::size_t size = 0;
        std::size_t hash = 0;
        int longestRefresh = 0;
    };
    mutable KnownText knownText;
};

}  // namespace OrvaDRCore

#endif
