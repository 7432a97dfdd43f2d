// Who refreshes a cache: the process named in the pid file. A lock guards that file, for moments; nobody
// holds it during the refresh. docs/cache.md has the protocol.
#ifndef ORVADRCORE_SRC_CACHE_UPDATER_MARK_H
#define ORVADRCORE_SRC_CACHE_UPDATER_MARK_H

#include <sys/types.h>

#include <chrono>
#include <functional>
#include <string>

#include <orvadrcore/file_lock.h>

#include "common/deadline.h"

namespace OrvaDRCore {

// The mark of the updater, in the pid file beside the cache file.
class UpdaterMark {
  public:
    // The pid file lies in `lockDir`, and the lock is one of that directory. If it is empty, the pid file
    // lies beside the cache file, and the lock is a named one.
    explicit UpdaterMark(const std::string& cachePath, const std::string& lockDir = "");

    const std::string& GetPidPath() const { return pidPath_; }
    const std::string& GetLockName() const { return lockName_; }
    std::string GetLockPath() const;
    FileLock MakeLock() const;

    // Hold a MarkLock around these four.
    pid_t Read() const;  // 0 if nobody is marked
    bool IsOfLivingProcess() const;
    bool Set() const;  // for this process, over whatever is there
    void Remove() const;

    // Whether this process is to refresh.
    enum class Claim {
        Marked,     // yes, and nobody else is
        Unmarked,   // yes, and others may: the lock or the pid file cannot be used
        NotNeeded,  // no: there is fresh data
        Busy,       // no: another process was refreshing, or held the lock, until the time was up
    };

    // Marks this process. Looks for fresh data and other updaters every few milliseconds until the
    // deadline, and once in any case. Asks `isFresh` a last time under the lock.
    Claim ClaimWithin(const Deadline& deadline, const std::function<bool()>& isFresh) const;

    // Ends Claim::Marked. Removes the mark, if need be without the lock: nobody replaces the mark of a
    // living process, and if it stayed, all others would wait for this one.
    void EndClaim() const noexcept;

    // Whether a process is refreshing; also true if the lock cannot be taken.
    bool IsUpdating() const;

    // Pauses, at least once, until no process is refreshing or `isStale()` is false. Holds no lock
    // during the pauses, so that others can mark themselves.
    void WaitForUpdater(const std::function<bool()>& isStale) const;

  private:
    Claim TryClaim(const std::function<bool()>& isFresh) const;

    std::string pidPath_;
    std::string lockName_;
    std::string lockDir_;  // empty for a named lock
};

// The lock around reading or changing a mark. It is unlocked, not only closed: a program that another
// thread starts meanwhile inherits the descriptor and would hold the lock as long as it runs.
class MarkLock {
  public:
    explicit MarkLock(const UpdaterMark& mark) : lock_(mark.MakeLock()) {}
    MarkLock(const MarkLock&) = delete;
    MarkLock& operator=(const MarkLock&) = delete;
    ~MarkLock();

    // Up to six attempts, a second apart.
    bool LockShared();
    bool LockExclusive();

    // For as long as `patience` lasts, looking again every few milliseconds.
    FileLockState Acquire(int operation, std::chrono::milliseconds patience);

  private:
    FileLock lock_;
    bool isHeld_ = false;
};

}  // namespace OrvaDRCore

#endif
