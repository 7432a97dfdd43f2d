// Who refreshes a cache: the process named in the pid file. A lock guards that file, for moments; nobody
// holds it during the refresh. docs/cache.md has the protocol.
#ifndef ORVADRCORE_SRC_CACHE_UPDATER_MARK_H
#define ORVADRCORE_SRC_CACHE_UPDATER_MARK_H

#include <sys/types.h>

#include <functional>
#include <string>

#include <orvadrcore/file_lock.h>

namespace OrvaDRCore {

// The mark of the updater, in the pid file beside the cache file.
class UpdaterMark {
  public:
    explicit UpdaterMark(const std::string& cachePath);

    const std::string& GetPidPath() const { return pidPath_; }
    const std::string& GetLockName() const { return lockName_; }

    // Hold a MarkLock around these four.
    pid_t Read() const;  // 0 if nobody is marked
    bool IsOfLivingProcess() const;
    bool Set() const;  // for this process, over whatever is there
    void Remove() const;

    // Whether a process is refreshing; also true if the lock cannot be taken.
    bool IsUpdating() const;

    // Pauses, at least once, until no process is refreshing or `isStale()` is false. Holds no lock
    // during the pauses, so that others can mark themselves.
    void WaitForUpdater(const std::function<bool()>& isStale) const;

  private:
    std::string pidPath_;
    std::string lockName_;
};

// The lock around reading or changing a mark. It is unlocked, not only closed: a program that another
// thread starts meanwhile inherits the descriptor and would hold the lock as long as it runs.
class MarkLock {
  public:
    explicit MarkLock(const UpdaterMark& mark) : lock_(mark.GetLockName()) {}
    MarkLock(const MarkLock&) = delete;
    MarkLock& operator=(const MarkLock&) = delete;
    ~MarkLock();

    // Up to six attempts, a second apart.
    bool LockShared();
    bool LockExclusive();

  private:
    FileLock lock_;
    bool isHeld_ = false;
};

}  // namespace OrvaDRCore

#endif
