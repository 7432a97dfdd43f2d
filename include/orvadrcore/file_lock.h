/// \file
/// Named locks between processes.
///
/// \code
///     FileLock lock("registry");
///     if (!lock.lock(LOCK_EX | LOCK_NB, 5)) return false;   // six tries, a second apart
///     ...                                                    // ours alone
///     lock.unlock();                                         // or let the object go
/// \endcode
///
/// A lock is a `flock` on the file of its name in /tmp/.orvadr_lock. Two objects exclude each
/// other, also within one process, and so does `flock(1)` on the same file; a process that ends,
/// however it ends, leaves none of its locks behind. The file itself stays. Failures are logged at
/// ERR (file `file_lock.cpp`), nothing throws unless memory runs out, and an object is used by one
/// thread at a time.
///
/// \warning Named locks are for processes running as root. The lock directory belongs to whoever
///          made it first. A lock file gets the permission bits 01204 less the umask: an ordinary
///          user cannot open a second time what it has made itself.
/// \warning A child made by fork shares descriptor and lock: `unlock` in the child frees the
///          parent's lock, and the parent's lock ends only when both have closed it.
/// \warning A program started by exec inherits the descriptor, and destroying the object only closes
///          the file. A program that another thread starts meanwhile goes on holding the lock for as
///          long as it runs. Beside threads that start programs, call unlock() before the object
///          goes: it frees the lock whoever has inherited it. Keep descriptors 0, 1 and 2 open, since
///          unlock() passes over 0. Programs that this library starts inherit no lock.
#ifndef ORVADRCORE_FILE_LOCK_H
#define ORVADRCORE_FILE_LOCK_H

#include <sys/file.h>

#include <string>

#include <orvadrcore/export.h>

namespace OrvaDRCore {

/// A lock file, open from the first use until the object goes. The head of file_lock.h tells what
/// holds for processes, threads, forks and rights.
class ORVADRCORE_API FileLock {
  public:
    /// No lock file yet: see setLockFile().
    FileLock() = default;

    /// The lock of that name; nothing is opened yet.
    /// \param name  the name; for an empty one as getLockFilePath()
    explicit FileLock(const std::string& name);

    FileLock(const FileLock&) = delete;
    FileLock& operator=(const FileLock&) = delete;

    /// Closes the file, which frees the lock.
    ~FileLock();

    /// The file of a lock: "/tmp/.orvadr_lock/" and the name as it stands.
    /// \param name  the name; slashes in it make directories, a leading one a double slash
    /// \return the path; empty for an empty name, with ERR `Bad lock file[%s]`
    static std::string getLockFilePath(const std::string& name);

    /// Points the object at another name, as long as its file is not open.
    /// \param name  the name, as in getLockFilePath()
    /// \return false for an empty name, with ERR `Failed to set lock path [%s]`; and for another
    ///         name than that of the open file, with ERR
    ///         `File [%s] has been open, can not set file path to [%s]`. The name stays then
    bool setLockFile(const std::string& name);

    /// Makes the directory of the lock file, with mode 0755, when it is missing.
    /// \return false when the object has no name, without a line; and when the directory cannot be
    ///         made, with ERR `Failed to create lock dir [%s] in local host` behind the lines of
    ///         File::CreateDir()
    bool checkLockDir() const;

    /// Opens the lock file, unless it is open, and makes it when it is missing.
    /// \return false with ERR: `Bad Lock File` (no name),
    ///         `Failed to check lock dir of lock file [%s].` behind the lines of checkLockDir(), or
    ///         `Failed to open lock file[%s], errno=%m`. A named pipe in the file's place is not
    ///         waited for: it cannot be opened, with errno EINVAL
    bool openLockedFile();

    /// Takes the lock, opening the file first. A lock of the other kind that the object holds is
    /// given up for it.
    /// \param operation  `LOCK_SH` or `LOCK_EX`; with `LOCK_NB` it is tried, otherwise waited for
    /// \param retries    how often a try that failed is made again, a second later each time
    /// \return false when the tries are used up, without a line; and when the file cannot be
    ///         opened, with ERR `Bad fd [%d] to lock [%s]` behind the lines of openLockedFile()
    bool lock(int operation, unsigned int retries);

    /// Whether the lock could be taken right now: takes it once and frees it again.
    /// \param operation  as in lock(); without `LOCK_NB` the call waits
    /// \return true when it was taken; false as lock()
    /// \warning The lock is not held afterwards, whatever the answer.
    bool tryLock(int operation);

    /// Frees the lock; the file stays open.
    /// \note Logs ERR `Failed to unlock [%s] with fd [%d], errno=[%m]` when the kernel refuses. An
    ///       object whose file is not open is passed over.
    void unlock() const;

  private:
    int fd_ = -1;
    std::string path_;
};

}  // namespace OrvaDRCore

#endif
