#include "syscall_faults.h"

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <cstdarg>
#include <cstdio>
#include <cstdlib>

#include "real_function.h"

namespace {

SyscallFaults* current = nullptr;

// The answer of what is set in the function's place, or the function's own.
template <class Result, class... Arguments>
Result Answer(std::function<Result(Arguments...)> SyscallAnswers::*set,
              Result (*real)(Arguments...), Arguments... arguments)
{
    const bool isSet = current != nullptr && current->*set;
    return isSet ? (current->*set)(arguments...) : real(arguments...);
}

// The third argument of open, which is there only where a file may be made.
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

unsigned int RealSleep(unsigned int seconds)
{
    return RealFunction<decltype(::sleep)>("sleep")(seconds);
}

int RealExecve(const char* path, char* const* arguments, char* const* environment)
{
    return RealFunction<decltype(::execve)>("execve")(path, arguments, environment);
}

extern "C" int open(const char* path, int flags, ...)
{
    va_list rest;
    va_start(rest, flags);
    const mode_t mode = TakeMode(flags, rest);
    va_end(rest);
    return Answer(&SyscallAnswers::open, RealOpen, path, flags, mode);
}

extern "C" int open64(const char* path, int flags, ...)
{
    va_list rest;
    va_start(rest, flags);
    const mode_t mode = TakeMode(flags, rest);
    va_end(rest);
    return Answer(&SyscallAnswers::open, RealOpen, path, flags | O_LARGEFILE, mode);
}

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

extern "C" int flock(int fd, int operation) noexcept
{
    return Answer(&SyscallAnswers::flock, RealFlock, fd, operation);
}

extern "C" int fcntl(int fd, int command, ...)
{
    va_list rest;
    va_start(rest, command);
    void* const argument = va_arg(rest, void*);  // as the C library takes it, whatever is behind it
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

extern "C" unsigned int sleep(unsigned int seconds)
{
    return Answer(&SyscallAnswers::sleep, RealSleep, seconds);
}

extern "C" int execve(const char* path, char* const* arguments, char* const* environment) noexcept
{
    return Answer(&SyscallAnswers::execve, RealExecve, path, arguments, environment);
}
