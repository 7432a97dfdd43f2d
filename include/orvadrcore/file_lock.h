/// \file
/// Named locks between processes.
/// \code
///     FileLock lock("registry");
///     if (!lock.lock(LOCK_EX | LOCK_NB, 5)) return false;  // six attempts, a second apart
///     ...                                                   // ours alone
///     lock.unlock();                                        // or at the end of the object
/// \endcode
/// A lock is a `flock` on a file in /tmp/.orvadr_lock, which ends at the latest with its process. Two
/// objects exclude each other, even in one process. One thread at a time may use an object. Failures
/// are logged at ERR (docs/locks.md has the lines). Nothing throws unless memory runs out.
/// \warning Named locks are for root: an ordinary user cannot open a lock file a second time. Ordinary
///          users name a directory of their own, too.
/// \warning A child made by fork and a program started by exec inherit the descriptor. The lock then
///          lasts until all have closed it or one calls unlock().
#ifndef ORVADRCORE_FILE_LOCK_H
#define ORVADRCORE_FILE_LOCK_H

#include <sys/file.h>

#include <chrono>
#include <string>

#include <orvadrcore/export.h>

namespace OrvaDRCore {

/// What became of an attempt to take a lock.
enum class FileLockState {
    Taken,
    Held,   ///< by somebody else until the time was up
    Failed  ///< the file cannot be opened or locked, or the operation is none (ERR)
};

/// A lock file, open from the first use until the end of the object.
class ORVADRCORE_API FileLock {
  public:
    FileLock() = default;                        ///< without a name: see setLockFile()
    explicit FileLock(const std::string& name);  ///< opens nothing yet
    /// A lock of the users who may write to `dir`, best an absolute path. The first use makes the file
    /// with mode 0600 less the umask, and missing directories with 0700. It follows no symbolic link
    /// in the place of the file, and programs that are started do not inherit the descriptor.
    /// \warning Without a path, so that nothing can be locked (ERR), if `name` is empty, "." or "..",
    ///          or contains a slash, or if `dir` is empty or in /tmp/.orvadr_lock.
    FileLock(const std::string& name, const std::string& dir);
    FileLock(const FileLock&) = delete;
    FileLock& operator=(const FileLock&) = delete;
    /// Closes the file, which frees the lock unless another process has inherited it.
    ~FileLock();

    /// "/tmp/.orvadr_lock/" and the name, slashes included; empty for an empty name.
    static std::string getLockFilePath(const std::string& name);
    /// Sets the name of a lock in /tmp/.orvadr_lock. Fails if it is empty, or if the file of another
    /// name is open.
    bool setLockFile(const std::string& name);
    /// Makes the directory of the lock file if it is missing, in /tmp/.orvadr_lock by /bin/mkdir.
    bool checkLockDir() const;
    /// Opens the lock file, if it is not open, and makes it if it is missing.
    bool openLockedFile();
    /// Takes the lock (LOCK_SH or LOCK_EX). With LOCK_NB it makes up to `retries` + 1 attempts, a
    /// second apart, otherwise it waits. False without a log line when somebody else holds the lock.
    /// \warning Changing the kind frees the lock first: on failure the object holds none.
    bool lock(int operation, unsigned int retries);
    /// Takes the lock (LOCK_SH or LOCK_EX; LOCK_NB changes nothing). While somebody else holds it,
    /// looks again every few milliseconds for as long as `patience` lasts: once if that is 0 or less.
    /// \warning As with lock(), changing the kind frees the lock first.
    [[nodiscard]] FileLockState acquire(int operation, std::chrono::milliseconds patience);
    /// Whether the lock can be taken. It is free afterwards, even if this object held it before.
    bool tryLock(int operation);
    /// Frees the lock, for all who have inherited it, too. The file stays open.
    /// \warning Ignores descriptor 0: keep 0, 1 and 2 open.
    void unlock() const;

  private:
    int fd_ = -1;
    std::string path_;
};

}  // namespace OrvaDRCore

#endif
