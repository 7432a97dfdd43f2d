// Results of system calls that a test cannot provoke. While a SyscallFaults object lives, the
// functions that are set here are called instead of the system's, in this process and its children.
// All others are the real ones.
//
//     SyscallFaults faults;
//     faults.fsync = Failing(EIO);
#ifndef ORVADRCORE_TESTS_SYSCALL_FAULTS_H
#define ORVADRCORE_TESTS_SYSCALL_FAULTS_H

#include <spawn.h>
#include <sys/stat.h>
#include <sys/types.h>

#include <cerrno>
#include <cstdio>
#include <functional>
#include <string>
#include <vector>

// A call of posix_spawn. Path and arguments may be replaced before it is passed on.
struct SpawnCall {
    pid_t* pid;
    const char* path;
    const posix_spawn_file_actions_t* files;
    const posix_spawnattr_t* attributes;
    char* const* arguments;
    char* const* environment;

    std::vector<std::string> Arguments() const;
};

struct SyscallAnswers {
    std::function<int(const char*, int, mode_t)> open;  // open64, too
    std::function<ssize_t(int, void*, std::size_t)> read;
    std::function<ssize_t(int, const void*, std::size_t)> write;
    std::function<int(int, mode_t)> fchmod;
    std::function<int(int)> fsync;
    std::function<int(int)> fdatasync;
    std::function<int(int, int)> flock;
    std::function<int(int, int, void*)> fcntl;
    std::function<int(const char*, const char*)> rename;
    std::function<int(const char*, struct stat*)> stat;
    std::function<int(const char*, struct stat64*)> stat64;
    std::function<int(const char*, struct stat*)> lstat;
    std::function<int(int, struct stat*)> fstat;
    std::function<int(int)> close;
    std::function<int(const char*)> unlink;
    std::function<ssize_t(const char*, char*, std::size_t)> readlink;
    std::function<int(int*, int)> pipe2;
    std::function<int(int, int)> dup2;
    std::function<pid_t(pid_t, int*, int)> waitpid;
    std::function<ssize_t(void*, std::size_t, unsigned int)> getrandom;
    std::function<FILE*(int, const char*)> fdopen;
    std::function<unsigned int(unsigned int)> sleep;

    // The clone that the platform layer calls by number. All other numbers go to the system.
    std::function<long(long)> clone;

    // posix_spawn. Returns an error number, as that does.
    std::function<int(const SpawnCall&)> spawn;
};

struct SyscallFaults : SyscallAnswers {
    SyscallFaults();
    SyscallFaults(const SyscallFaults&) = delete;
    SyscallFaults& operator=(const SyscallFaults&) = delete;
    ~SyscallFaults();

    // From now on all functions are the real ones again.
    void Clear() { SyscallAnswers::operator=({}); }
};

// Fails with -1 and this errno, whatever the arguments.
inline auto Failing(int error)
{
    return [error](const auto&... /*arguments*/) {
        errno = error;
        return -1;
    };
}

// The same for posix_spawn, which returns the error.
inline auto FailingToStart(int error)
{
    return [error](const SpawnCall& /*call*/) { return error; };
}

// The real functions.
int RealOpen(const char* path, int flags, mode_t mode);
ssize_t RealRead(int fd, void* buffer, std::size_t size);
ssize_t RealWrite(int fd, const void* buffer, std::size_t size);
int RealFchmod(int fd, mode_t mode);
int RealFsync(int fd);
int RealFdatasync(int fd);
int RealFlock(int fd, int operation);
int RealFcntl(int fd, int command, void* argument);
int RealRename(const char* from, const char* to);
int RealStat(const char* path, struct stat* status);
int RealStat64(const char* path, struct stat64* status);
int RealLstat(const char* path, struct stat* status);
int RealFstat(int fd, struct stat* status);
int RealClose(int fd);
int RealUnlink(const char* path);
ssize_t RealReadlink(const char* path, char* buffer, std::size_t size);
int RealPipe2(int* ends, int flags);
int RealDup2(int from, int to);
pid_t RealWaitpid(pid_t pid, int* status, int options);
ssize_t RealGetrandom(void* buffer, std::size_t size, unsigned int flags);
FILE* RealFdopen(int fd, const char* mode);
unsigned int RealSleep(unsigned int seconds);
long RealClone(long flags);
int RealSpawn(const SpawnCall& call);

#endif
