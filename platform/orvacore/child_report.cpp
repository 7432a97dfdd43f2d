#include "child_report.h"

#include <poll.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>

#include "base/errno.h"

namespace {

// How often the parent checks whether the child is alive.
constexpr int CheckMSec = 20;

// Does not reap the child. On Linux before 4.7 the call fails, and the child counts as alive.
bool HasEnded(pid_t child)
{
    siginfo_t info{};
    const int flags = WEXITED | WNOHANG | WNOWAIT | __WALL;
    if (::waitid(P_PID, static_cast<id_t>(child), &info, flags) == 0) return info.si_pid == child;
    // Already reaped, by a SIGCHLD handler or because the caller ignores SIGCHLD.
    return errno == ECHILD;
}

bool CanRead(int fd, int timeoutMSec)
{
    pollfd waiting{fd, POLLIN, 0};
    return ::poll(&waiting, 1, timeoutMSec) > 0;
}

}  // namespace

void SendReport(int fd, const void* report, std::size_t size)
{
    OrvaDRCore::RetryOnEintr([&] { return ::write(fd, report, size); });
}

bool ReceiveReport(int fd, pid_t child, void* report, std::size_t size)
{
    while (!CanRead(fd, CheckMSec)) {
        // The report may have arrived between the two checks, just before the end.
        if (HasEnded(child) && !CanRead(fd, 0)) return false;
    }
    return OrvaDRCore::RetryOnEintr([&] { return ::read(fd, report, size); }) > 0;
}
