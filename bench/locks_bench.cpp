// Locks between processes that nobody else holds.
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <optional>

#include <orvadrcore/file_lock.h>

#include "support/bench.h"
#include "support/by_hand.h"

#if BENCH_HAS_BOOST
#include <boost/interprocess/sync/file_lock.hpp>
#endif

namespace Bench {

namespace {

constexpr int Exclusive = LOCK_EX | LOCK_NB;

// A lock name of this process and its file, which exists as long as this object.
struct LockFile {
    LockFile()
    {
        OrvaDRCore::FileLock lock(name);
        Require(lock.openLockedFile(), "cannot make the lock file");
    }
    LockFile(const LockFile&) = delete;
    LockFile& operator=(const LockFile&) = delete;
    ~LockFile() { ::unlink(path.c_str()); }

    std::string name = "orvadr-bench-" + std::to_string(::getpid());
    std::string path = OrvaDRCore::FileLock::getLockFilePath(name);
};

struct OurLock {
    explicit OurLock(const LockFile& file) : lock(file.name) {}
    bool Take() { return lock.lock(Exclusive, 0); }
    void Free() const { lock.unlock(); }

    OrvaDRCore::FileLock lock;
};

struct BareLock {
    explicit BareLock(const LockFile& file) : fd(::open(file.path.c_str(), O_RDONLY)) {}
    BareLock(const BareLock&) = delete;
    BareLock& operator=(const BareLock&) = delete;
    ~BareLock() { ::close(fd); }
    bool Take() const { return ::flock(fd, Exclusive) == 0; }
    void Free() const { ::flock(fd, LOCK_UN); }

    int fd;
};

// Before each lock, checks that the directory exists and that an open file is a regular one.
struct ContractLock {
    explicit ContractLock(const LockFile& file) : path(file.path) {}
    ContractLock(const ContractLock&) = delete;
    ContractLock& operator=(const ContractLock&) = delete;
    ~ContractLock() { ::close(fd); }
    bool Take()
    {
        struct stat status {};
        if (::stat(dir.c_str(), &status) != 0 || !S_ISDIR(status.st_mode)) return false;
        if (fd < 0) {
            fd = ::open(path.c_str(), O_RDONLY | O_CREAT, 0600);
        } else if (::fstat(fd, &status) != 0 || !S_ISREG(status.st_mode)) {
            return false;
        }
        return ::flock(fd, Exclusive) == 0;
    }
    void Free() const { ::flock(fd, LOCK_UN); }

    std::string path;
    std::string dir = path.substr(0, path.rfind('/'));
    int fd = -1;
};

#if BENCH_HAS_BOOST
// Uses fcntl() locks, which do not exclude threads of the same process.
struct BoostLock {
    explicit BoostLock(const LockFile& file) : lock(Writable(file).c_str()) {}
    static const std::string& Writable(const LockFile& file)
    {
        ::chmod(file.path.c_str(), 0600);
        return file.path;
    }
    bool Take() { return lock.try_lock(); }
    void Free() { lock.unlock(); }

    boost::interprocess::file_lock lock;
};
#endif

// Whether another process gets the lock.
template <class Lock>
std::string AskOtherProcess(const LockFile& file)
{
    const pid_t child = ::fork();
    Require(child >= 0, "cannot fork");
    if (child == 0) ::_exit(Lock(file).Take() ? 1 : 0);
    int status = 0;
    ::waitpid(child, &status, 0);
    return WEXITSTATUS(status) == 1 ? "taken " : "refused ";
}

template <class Lock>
struct LockAndUnlock {
    void Run()
    {
        Require(lock.Take(), "the lock is not free");
        lock.Free();
    }
    std::string Result()
    {
        std::string text = AskOtherProcess<Lock>(file);
        lock.Take();
        text += AskOtherProcess<Lock>(file);
        lock.Free();
        return text + AskOtherProcess<Lock>(file);
    }

    LockFile file;
    Lock lock{file};
};

template <class Lock>
struct OpenLockClose {
    void Run()
    {
        Lock lock(file);
        Require(lock.Take(), "the lock is not free");
    }
    std::string Result()
    {
        std::optional<Lock> lock(std::in_place, file);
        lock->Take();
        std::string text = AskOtherProcess<Lock>(file);
        lock.reset();
        return text + AskOtherProcess<Lock>(file);
    }

    LockFile file;
};

template <template <class> class Task>
void AddAll(const std::string& item)
{
    Add<Task<OurLock>>(item, Ours);
    Add<Task<BareLock>>(item, Bare);
    Add<Task<ContractLock>>(item, Contract);
#if BENCH_HAS_BOOST
    Add<Task<BoostLock>>(item, "Boost file_lock");
#endif
}

}  // namespace

void AddLocks()
{
    constexpr double OfSystemCalls = 1.1;
    AddAll<LockAndUnlock>("lock and unlock");
    Aim({Contract}, OfSystemCalls);
    AddAll<OpenLockClose>("open, lock and close");
    Aim({Contract}, OfSystemCalls);
}

}  // namespace Bench
