#include <orvacore/orvacore.h>

#include <fcntl.h>
#include <signal.h>
#include <sys/single_threaded.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>

#include "base/errno.h"
#include "base/process_status.h"
#include "child_report.h"
#include "library_locks.h"

namespace {

// Each attempt ends after a few milliseconds. That many fail only where other threads do nothing
// but take the locks, or where one keeps its lock for long. The time counts where forks are slow.
constexpr int MaxAttempts = 500;
constexpr int MinAttempts = 50;
constexpr std::chrono::seconds MaxTime{5};

// What the intermediate process reports to the caller.
struct ForkResult {
    pid_t pid;
    int error;  // of the second fork; EDEADLK when a lock could not be had
};

// Where the intermediate process reports to.
int reportFd = -1;

[[noreturn]] void ReportStuck()
{
    const ForkResult stuck{-1, EDEADLK};
    SendReport(reportFd, &stuck, sizeof stuck);
    ::_exit(0);
}

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

// In the intermediate process: forks the detached child, tells the caller about it and ends. The
// child is a copy of a process in which no library lock is held.
void ForkAgain(int reading, int writing, bool hasThreads)
{
    reportFd = writing;
    if (hasThreads) TakeLibraryLocksOr(ReportStuck);
    const pid_t pid = ::fork();
    if (pid == 0) {
        ::close(reading);
        ::close(writing);
        DetachStandardStreams();
        return;
    }
    const ForkResult result{pid, pid < 0 ? errno : 0};
    SendReport(writing, &result, sizeof result);
    ::_exit(0);
}

// The child of a child that ends at once belongs to init: the caller never has to wait for it.
ForkResult TryForkDetached()
{
    std::array<int, 2> pipe{};
    if (::pipe2(pipe.data(), O_CLOEXEC) < 0) return {-1, errno};
    const bool hasThreads = __libc_single_threaded == 0;
    const pid_t intermediate = ::fork();
    if (intermediate == 0) {
        ForkAgain(pipe[0], pipe[1], hasThreads);
        return {0, 0};
    }
    ForkResult result{intermediate, errno};
    ::close(pipe[1]);
    if (intermediate > 0) {
        if (!ReceiveReport(pipe[0], intermediate, &result, sizeof result)) result = {-1, ECHILD};
        // ECHILD means that a caller who ignores SIGCHLD, or its handler, has reaped it already.
        OrvaDRCore::RetryOnEintr([&] { return ::waitpid(intermediate, nullptr, 0); });
    }
    ::close(pipe[0]);
    return result;
}

// Forks again where another thread held a library lock at the moment of the fork.
pid_t ForkDetached()
{
    using Clock = std::chrono::steady_clock;
    const Clock::time_point end = Clock::now() + MaxTime;
    ForkResult result = TryForkDetached();
    for (int attempt = 1; result.error == EDEADLK; ++attempt) {
        if (attempt == MaxAttempts || (attempt >= MinAttempts && Clock::now() > end)) break;
        TakeLibraryLocks();  // right after that they are most likely to be free
        result = TryForkDetached();
    }
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
    return OrvaDRCore::IsProcessAlive(pid) ? 1 : 0;
}
