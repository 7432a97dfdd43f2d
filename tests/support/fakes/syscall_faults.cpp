#include "support/fakes/syscall_faults.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/random.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>

#include "support/fakes/real_function.h"

namespace {

SyscallFaults* current = nullptr;

// Calls the function that a test has set, or the real one.
template <class Result, class... Arguments>
Result Answer(std::function<Result(Arguments...)> SyscallAnswers::*set,
              Result (*real)(Arguments...), Arguments... arguments)
{
    const bool isSet = current != nullptr && current->*set;
    return isSet ? (current->*set)(arguments...) : real(arguments...);
}

// The third argument of open, which callers pass only if a file may be created.
mode_t TakeMode(int flags, va_list rest)
{
    const bool makesFile = (flags & O_CREAT) != 0 || (flags & O_TMPFILE) == O_TMPFILE;
    return makesFile ? va_arg(rest, mode_t) : 0;
}

}  // namespace

SyscallFaults::SyscallFaults()
{
    if (current != nullptr) std::abort();
    current = this;
}

SyscallFaults::~SyscallFaults()
{
    current = nullptr;
}

int RealOpen(const char* path, int flags, mode_t mode)
{
    return RealFunction<decltype(::open)>("open")(path, flags, mode);
}

ssize_t RealRead(int fd, void* buffer, std::size_t size)
{
    return RealFunction<decltype(::read)>("read")(fd, buffer, size);
}

ssize_t RealWrite(int fd, const void* buffer, std::size_t size)
{
    return RealFunction<decltype(::write)>("write")(fd, buffer, size);
}

int RealFchmod(int fd, mode_t mode)
{
    return RealFunction<decltype(::fchmod)>("fchmod")(fd, mode);
}

int RealFsync(int fd)
{
    return RealFunction<decltype(::fsync)>("fsync")(fd);
}

int RealFdatasync(int fd)
{
    return RealFunction<decltype(::fdatasync)>("fdatasync")(fd);
}

int RealFlock(int fd, int operation)
{
    return RealFunction<decltype(::flock)>("flock")(fd, operation);
}

int RealFcntl(int fd, int command, void* argument)
{
    return RealFunction<decltype(::fcntl)>("fcntl")(fd, command, argument);
}

int RealRename(const char* from, const char* to)
{
    return RealFunction<decltype(::rename)>("rename")(from, to);
}

int RealStat(const char* path, struct stat* status)
{
    return RealFunction<decltype(::stat)>("stat")(path, status);
}

int RealStat64(const char* path, struct stat64* status)
{
    return RealFunction<int(const char*, struct stat64*)>("stat64")(path, status);
}

int RealLstat(const char* path, struct stat* status)
{
    return RealFunction<decltype(::lstat)>("lstat")(path, status);
}

int RealFstat(int fd, struct stat* status)
{
    return RealFunction<decltype(::fstat)>("fstat")(fd, status);
}

int RealClose(int fd)
{
    return RealFunction<decltype(::close)>("close")(fd);
}

int RealUnlink(const char* path)
{
    return RealFunction<decltype(::unlink)>("unlink")(path);
}

ssize_t RealReadlink(const char* path, char* buffer, std::size_t size)
{
    return RealFunction<decltype(::readlink)>("readlink")(path, buffer, size);
}

int RealPipe2(int* ends, int flags)
{
    return RealFunction<decltype(::pipe2)>("pipe2")(ends, flags);
}

int RealDup2(int from, int to)
{
    return RealFunction<decltype(::dup2)>("dup2")(from, to);
}

pid_t RealWaitpid(pid_t pid, int* status, int options)
{
    return RealFunction<decltype(::waitpid)>("waitpid")(pid, status, options);
}

ssize_t RealGetrandom(void* buffer, std::size_t size, unsigned int flags)
{
    return RealFunction<decltype(::getrandom)>("getrandom")(buffer, size, flags);
}

FILE* RealFdopen(int fd, const char* mode)
{
    return RealFunction<decltype(::fdopen)>("fdopen")(fd, mode);
}

long RealClone(long flags)
{
    return RealFunction<decltype(::syscall)>("syscall")(SYS_clone, flags, 0L, 0L, 0L, 0L);
}

unsigned int RealSleep(unsigned int seconds)
{
    return RealFunction<decltype(::sleep)>("sleep")(seconds);
}

int RealSpawn(const SpawnCall& call)
{
    return RealFunction<decltype(::posix_spawn)>("posix_spawn")(
        call.pid, call.path, call.files, call.attributes, call.arguments, call.environment);
}

std::vector<std::string> SpawnCall::Arguments() const
{
    std::vector<std::string> texts;
    for (char* const* at = arguments; *at != nullptr; ++at) texts.emplace_back(*at);
    return texts;
}

extern "C" int open(const char* path, int flags, ...)
{
    va_list rest;
    va_start(rest, flags);
    const mode_t mode = TakeMode(flags, rest);
    va_end(rest);
    return Answer(&SyscallAnswers::open, RealOpen, path, flags, mode);
}

#ifndef __USE_FILE_OFFSET64  // with it the function above is open64
extern "C" int open64(const char* path, int flags, ...)
{
    va_list rest;
    va_start(rest, flags);
    const mode_t mode = TakeMode(flags, rest);
    va_end(rest);
    return Answer(&SyscallAnswers::open, RealOpen, path, flags | O_LARGEFILE, mode);
}
#endif

extern "C" ssize_t read(int fd, void* buffer, std::size_t size)
{
    return Answer(&SyscallAnswers::read, RealRead, fd, buffer, size);
}

extern "C" ssize_t write(int fd, const void* buffer, std::size_t size)
{
    return Answer(&SyscallAnswers::write, RealWrite, fd, buffer, size);
}

extern "C" int fchmod(int fd, mode_t mode) noexcept
{
    return Answer(&SyscallAnswers::fchmod, RealFchmod, fd, mode);
}

extern "C" int fsync(int fd)
{
    return Answer(&SyscallAnswers::fsync, RealFsync, fd);
}

extern "C" int fdatasync(int fd)
{
    return Answer(&SyscallAnswers::fdatasync, RealFdatasync, fd);
}

extern "C" int flock(int fd, int operation) noexcept
{
    return Answer(&SyscallAnswers::flock, RealFlock, fd, operation);
}

extern "C" int fcntl(int fd, int command, ...)
{
    va_list rest;
    va_start(rest, command);
    void* const argument = va_arg(rest, void*);  // as the C library does, whatever its type
    va_end(rest);
    return Answer(&SyscallAnswers::fcntl, RealFcntl, fd, command, argument);
}

extern "C" int rename(const char* from, const char* to) noexcept
{
    return Answer(&SyscallAnswers::rename, RealRename, from, to);
}

extern "C" int stat(const char* path, struct stat* status) noexcept
{
    return Answer(&SyscallAnswers::stat, RealStat, path, status);
}

// SQLite's. On 32-bit machines stat64() is another function for us, and its structure is not SQLite's, but
// the fake never reads it.
extern "C" int StatOfSqlite(const char* path, struct stat64* status) noexcept __asm__("stat64");
extern "C" int StatOfSqlite(const char* path, struct stat64* status) noexcept
{
    return Answer(&SyscallAnswers::stat64, RealStat64, path, status);
}

extern "C" int lstat(const char* path, struct stat* status) noexcept
{
    return Answer(&SyscallAnswers::lstat, RealLstat, path, status);
}

extern "C" int fstat(int fd, struct stat* status) noexcept
{
    return Answer(&SyscallAnswers::fstat, RealFstat, fd, status);
}

extern "C" int close(int fd)
{
    return Answer(&SyscallAnswers::close, RealClose, fd);
}

extern "C" int unlink(const char* path) noexcept
{
    return Answer(&SyscallAnswers::unlink, RealUnlink, path);
}

extern "C" ssize_t readlink(const char* path, char* buffer, std::size_t size) noexcept
{
    return Answer(&SyscallAnswers::readlink, RealReadlink, path, buffer, size);
}

extern "C" int pipe2(int* ends, int flags) noexcept
{
    return Answer(&SyscallAnswers::pipe2, RealPipe2, ends, flags);
}

extern "C" int dup2(int from, int to) noexcept
{
    return Answer(&SyscallAnswers::dup2, RealDup2, from, to);
}

extern "C" pid_t waitpid(pid_t pid, int* status, int options)
{
    return Answer(&SyscallAnswers::waitpid, RealWaitpid, pid, status, options);
}

extern "C" ssize_t getrandom(void* buffer, std::size_t size, unsigned int flags)
{
    return Answer(&SyscallAnswers::getrandom, RealGetrandom, buffer, size, flags);
}

extern "C" FILE* fdopen(int fd, const char* mode) noexcept
{
    return Answer(&SyscallAnswers::fdopen, RealFdopen, fd, mode);
}

// Passes on six arguments, the most that a system call has.
extern "C" long syscall(long number, ...) noexcept
{
    va_list rest;
    va_start(rest, number);
    std::array<long, 6> arguments{};
    for (long& argument : arguments) argument = va_arg(rest, long);
    va_end(rest);
    const auto [a, b, c, d, e, f] = arguments;
    if (number == SYS_clone) return Answer(&SyscallAnswers::clone, RealClone, a);
    return RealFunction<decltype(::syscall)>("syscall")(number, a, b, c, d, e, f);
}

extern "C" unsigned int sleep(unsigned int seconds)
{
    return Answer(&SyscallAnswers::sleep, RealSleep, seconds);
}

extern "C" int posix_spawn(pid_t* pid, const char* path, const posix_spawn_file_actions_t* files,
                           const posix_spawnattr_t* attributes, char* const* arguments,
                           char* const* environment)
{
    const SpawnCall call{pid, path, files, attributes, arguments, environment};
    const bool isSet = current != nullptr && current->spawn;
    return isSet ? current->spawn(call) : RealSpawn(call);
}
