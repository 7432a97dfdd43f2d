#include <orvacore/orvacore.h>

#include <fcntl.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>

#include "process_status.h"

namespace {

// What the process between caller and detached child says to the caller.
struct ForkResult {
    pid_t pid;
    int error;  // of the second fork; 0 when it succeeded
};

// Pipes and sockets among the standard descriptors lead to somebody who waits for their end.
void DetachStandardStreams()
{
    for (int fd = STDIN_FILENO; fd <= STDERR_FILENO; ++fd) {
        struct stat status {};
        if (::fstat(fd, &status) < 0 || (!S_ISFIFO(status.st_mode) && !S_ISSOCK(status.st_mode))) {
            continue;
        }
        const int null = ::open("/dev/null", O_RDWR | O_CLOEXEC);
        if (null >= 0) {
            ::dup2(null, fd);
            ::close(null);
        } else {
            ::close(fd);
        }
    }
}

// In the process between: forks the detached child, tells the caller about it and ends.
void ForkAgain(int reading, int writing)
{
    const pid_t pid = ::fork();
    if (pid == 0) {
        ::close(reading);
        ::close(writing);
        DetachStandardStreams();
        return;
    }
    const ForkResult result{pid, pid < 0 ? errno : 0};
    while (::write(writing, &result, sizeof result) < 0 && errno == EINTR) {
    }
    ::_exit(0);
}

// In the caller: what the process between says. It is a short one, and is waited for by its id.
ForkResult AwaitResult(pid_t between, int reading)
{
    ForkResult result{-1, ECHILD};
    ssize_t count = 0;
    do {
        count = ::read(reading, &result, sizeof result);
    } while (count < 0 && errno == EINTR);
    // ECHILD means that a caller who ignores SIGCHLD, or its handler, has it reaped already.
    while (::waitpid(between, nullptr, 0) < 0 && errno == EINTR) {
    }
    return result;
}

// The child of a child that ends at once belongs to init: the caller never has to wait for it.
pid_t ForkDetached()
{
    std::array<int, 2> pipe{};
    if (::pipe2(pipe.data(), O_CLOEXEC) < 0) return -1;
    const pid_t between = ::fork();
    if (between == 0) {
        ForkAgain(pipe[0], pipe[1]);
        return 0;
    }
    ForkResult result{between, errno};
    ::close(pipe[1]);
    if (between > 0) result = AwaitResult(between, pipe[0]);
    ::close(pipe[0]);
    if (result.pid < 0) errno = result.error;
    return result.pid;
}

}  // namespace

pid_t CoreLibProcForkEx(int flags)
{
    return (flags & CORELIB_FORK_DETACHED) != 0 ? ForkDetached() : ::fork();
}

int CoreLibProcAlive(pid_t pid)
{
    // Unlike kill, tgkill takes neither a group nor another thread for a process. It finds zombies,
    // too; where /proc hides the processes of others its word has to do.
    if (::tgkill(pid, pid, 0) < 0 && errno != EPERM) return 0;
    const auto status = ReadProcessStatus(pid);
    const bool ended = status && (status->state == 'Z' || status->state == 'X');
    return ended && status->threads <= 1 ? 0 : 1;
}
