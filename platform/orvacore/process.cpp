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

// An attempt takes a few milliseconds. So many fail only if other threads do nothing but take the
// locks, or if one keeps its lock for long. The limit of time is for slow forks.
constexpr int MaxAttempts = 500;
constexpr int MinAttempts = 50;
constexpr std::chrono::seconds MaxTime{5};

// What the intermediate process reports to the caller.
struct ForkResult {
    pid_t pid;
    int error;  // of the second fork; EDEADLK when a lock could not be had
};

// The intermediate process's end of the pipe, for its signal handler.
int reportFd = -1;

[[noreturn]] void ReportStuck()
{
    const ForkResult stuck{-1, EDEADLK};
    SendReport(reportFd, &stuck, sizeof stuck);
    ::_exit(0);
}

// Somebody may wait for the end of a pipe or socket among the standard descriptors.
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

// In the intermediate process: forks the detached child, reports it to the caller and exits. Returns
// in the child, which is a copy of a process that holds no library lock.
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

// An intermediate process exits at once, so that init adopts its child: the caller never has to wait
// for that.
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
        // May fail: reaped by a SIGCHLD handler, or because the caller ignores SIGCHLD.
        OrvaDRCore::RetryOnEintr([&] { return ::waitpid(intermediate, nullptr, 0); });
    }
    ::close(pipe[0]);
    return result;
}

// Repeats the fork as long as another thread holds a library lock at that moment.
pid_t ForkDetached()
{
    using Clock = std::chrono::steady_clock;
    const Clock::time_point end = Clock::now() + MaxTime;
    ForkResult result = TryForkDetached();
    for (int attempt = 1; result.error == EDEADLK; ++attempt) {
        if (attempt == MaxAttempts || (attempt >= MinAttempts && Clock::now() > end)) break;
        TakeLibraryLocks();  // right after this they are most likely free
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
