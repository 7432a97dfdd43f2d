#include <orvadrcore/file_lock.h>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <string_view>

#include <orvadrcore/file.h>

#include "base/errno.h"
#include "base/log.h"
#include "common/deadline.h"

namespace OrvaDRCore {

namespace {

constexpr const char* LockDir = "/tmp/.orvadr_lock";
constexpr int LockDirMode = 0755;
constexpr mode_t LockFileMode = 644;  // decimal, so 01204: the contract says so
constexpr unsigned int RetrySeconds = 1;

constexpr mode_t OwnDirMode = 0700;
constexpr mode_t OwnFileMode = 0600;

// Of acquire(): others hold a lock for moments, or for long.
constexpr unsigned int FirstPauseMSec = 2;
constexpr unsigned int LongestPauseMSec = 10;

// Whether a path lies in the directory of all named locks, which has rules of its own.
bool IsShared(std::string_view path)
{
    constexpr std::string_view Dir = LockDir;
    return path.substr(0, Dir.size()) == Dir && path.substr(Dir.size(), 1) == "/";
}

// Opening one would wait for a writer.
bool IsNamedPipe(const std::string& path)
{
    struct stat status {};
    return ::stat(path.c_str(), &status) == 0 && S_ISFIFO(status.st_mode);
}

int OpenShared(const std::string& path)
{
    if (IsNamedPipe(path)) {
        errno = EINVAL;
        return -1;
    }
    // flock() needs no write access.
    return ::open64(path.c_str(), O_RDONLY | O_CREAT, LockFileMode);
}

// Opens a lock file in a user's own directory, for writing because NFS demands that for LOCK_EX.
int OpenOwn(const std::string& path)
{
    constexpr int Flags = O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK;
    const int fd = ::open64(path.c_str(), Flags, OwnFileMode);
    if (fd < 0 || File::IsRegularFile(fd)) return fd;
    ::close(fd);  // a pipe or a device
    errno = EINVAL;
    return -1;
}

// Makes a directory, and the parents that are missing.
bool MakeOwnDir(const std::string& dir)
{
    struct stat status {};
    if (::stat(dir.c_str(), &status) == 0) return S_ISDIR(status.st_mode);
    std::size_t end = 0;
    do {
        end = dir.find('/', end + 1);
        (void)::mkdir(dir.substr(0, end).c_str(), OwnDirMode);
    } while (end != std::string::npos);
    return ::stat(dir.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

// Empty for a name or a directory that is refused.
std::string OwnPath(const std::string& name, const std::string& dir)
{
    std::string path = dir + "/" + name;
    const bool isName = !name.empty() && name != "." && name != ".." &&
                        name.find_first_of(std::string_view("/\0", 2)) == std::string::npos;
    if (isName && !dir.empty() && !IsShared(path)) return path;
    DR_LOG_AS("FileLock", Err, "Bad lock file[%s] in dir[%s]", name.c_str(), dir.c_str());
    return {};
}

}  // namespace

FileLock::FileLock(const std::string& name) : path_(getLockFilePath(name)) {}

FileLock::FileLock(const std::string& name, const std::string& dir) : path_(OwnPath(name, dir)) {}

FileLock::~FileLock()
{
    if (fd_ >= 0) ::close(fd_);
}

std::string FileLock::getLockFilePath(const std::string& name)
{
    if (name.empty()) {
        DR_LOG(Err, "Bad lock file[%s]", name.c_str());
        return {};
    }
    return std::string(LockDir) + "/" + name;
}

bool FileLock::setLockFile(const std::string& name)
{
    if (name.empty()) {
        DR_LOG(Err, "Failed to set lock path [%s]", name.c_str());
        return false;
    }
    const std::string newPath = getLockFilePath(name);
    if (newPath == path_) return true;
    if (fd_ >= 0) {
        DR_LOG(Err, "File [%s] has been open, can not set file path to [%s]", path_.c_str(),
               newPath.c_str());
        return false;
    }
    path_ = newPath;
    return true;
}

bool FileLock::checkLockDir() const
{
    const std::string dir = File::GetParentDir(path_);
    if (dir.empty()) return false;
    const bool isMade = IsShared(path_) ? File::CreateDir(dir, LockDirMode) : MakeOwnDir(dir);
    if (!isMade) {
        DR_LOG(Err, "Failed to create lock dir [%s] in local host", dir.c_str());
        return false;
    }
    return true;
}

bool FileLock::openLockedFile()
{
    if (path_.empty()) {
        DR_LOG(Err, "Bad Lock File");
        return false;
    }
    if (!checkLockDir()) {
        DR_LOG(Err, "Failed to check lock dir of lock file [%s].", path_.c_str());
        return false;
    }
    if (File::IsRegularFile(fd_)) return true;
    if (fd_ >= 0) ::close(fd_);
    fd_ = IsShared(path_) ? OpenShared(path_) : OpenOwn(path_);
    if (fd_ < 0) {
        DR_LOG(Err, "Failed to open lock file[%s], errno=%m", path_.c_str());
        return false;
    }
    return true;
}

// Not Retry(): the pause is a fixed second, and only a failed flock() is repeated.
bool FileLock::lock(int operation, unsigned int retries)
{
    if (!openLockedFile()) {
        DR_LOG(Err, "Bad fd [%d] to lock [%s]", fd_, path_.c_str());
        return false;
    }
    for (unsigned int attempts = 0; ::flock(fd_, operation) != 0; ++attempts) {
        if (attempts == retries) return false;
        ::sleep(RetrySeconds);  // NOLINT(concurrency-mt-unsafe): unsafe beside SIGALRM alone
    }
    return true;
}

FileLockState FileLock::acquire(int operation, std::chrono::milliseconds patience)
{
    const Deadline deadline(patience);
    const int kind = operation & ~LOCK_NB;
    if (kind != LOCK_SH && kind != LOCK_EX) {
        DR_LOG(Err, "Bad operation [%d] to lock [%s]", operation, path_.c_str());
        return FileLockState::Failed;
    }
    if (!openLockedFile()) {
        DR_LOG(Err, "Bad fd [%d] to lock [%s]", fd_, path_.c_str());
        return FileLockState::Failed;
    }
    Backoff pauses(FirstPauseMSec, LongestPauseMSec);
    while (RetryOnEintr([&] { return ::flock(fd_, kind | LOCK_NB); }) != 0) {
        if (errno != EWOULDBLOCK) {
            DR_LOG(Err, "Failed to lock [%s] with fd [%d], errno=[%m]", path_.c_str(), fd_);
            return FileLockState::Failed;
        }
        if (deadline.IsPassed()) return FileLockState::Held;
        pauses.Pause(deadline);
    }
    return FileLockState::Taken;
}

bool FileLock::tryLock(int operation)
{
    if (!lock(operation, 0)) return false;
    unlock();
    return true;
}

void FileLock::unlock() const
{
    if (fd_ <= 0) return;  // ignores 0, though lock() may hold it: the contract says so
    if (::flock(fd_, LOCK_UN) < 0) {
        DR_LOG(Err, "Failed to unlock [%s] with fd [%d], errno=[%m]", path_.c_str(), fd_);
    }
}

}  // namespace OrvaDRCore
