// Answers of the system that cannot be had at will. While a SyscallFaults object lives, the
// functions that are set here answer in the system's place, in this process and in those that it
// forks; all others, and all of them afterwards, are the real ones.
//
//     SyscallFaults faults;
//     faults.fsync = Failing(EIO);
#ifndef ORVADRCORE_TESTS_SYSCALL_FAULTS_H
#define ORVADRCORE_TESTS_SYSCALL_FAULTS_H

#include <sys/stat.h>
#include <sys/types.h>

#include <cerrno>
#include <functional>

struct SyscallAnswers {
    std::function<int(const char*, int, mode_t)> open;  // of open64, too
    std::function<ssize_t(int, void*, std::size_t)> read;
    std::function<ssize_t(int, const void*, std::size_t)> write;
    std::function<int(int, mode_t)> fchmod;
    std::function<int(int)> fsync;
    std::function<int(int, int)> flock;
    std::function<int(int, int, void*)> fcntl;
    std::function<int(const char*, const char*)> rename;
    std::function<int(const char*, struct stat*)> stat;
    std::function<unsigned int(unsigned int)> sleep;

    // Runs in the process that is to become the program: what it notes the test sees in shared
    // memory only, as ProgramNotes has it.
    std::function<int(const char*, char* const*, char* const*)> execve;
};

struct SyscallFaults : SyscallAnswers {
    SyscallFaults();
    SyscallFaults(const SyscallFaults&) = delete;
    SyscallFaults& operator=(const SyscallFaults&) = delete;
    ~SyscallFaults();

    // From here on all are the real ones again.
    void Clear() { SyscallAnswers::operator=({}); }
};

// Answers -1 with that errno, whatever it is asked.
inline auto Failing(int error)
{
    return [error](const auto&... /*arguments*/) {
        errno = error;
        return -1;
    };
}

// The real functions, for answers that begin with the system's own.
int RealOpen(const char* path, int flags, mode_t mode);
ssize_t RealRead(int fd, void* buffer, std::size_t size);
ssize_t RealWrite(int fd, const void* buffer, std::size_t size);
int RealFchmod(int fd, mode_t mode);
int RealFsync(int fd);
int RealFlock(int fd, int operation);
int RealFcntl(int fd, int command, void* argument);
int RealRename(const char* from, const char* to);
int RealStat(const char* path, struct stat* status);
unsigned int RealSleep(unsigned int seconds);
int RealExecve(const char* path, char* const* arguments, char* const* environment);

#endif
