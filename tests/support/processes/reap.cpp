#include "support/processes/reap.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>

#include <cerrno>

#include "base/errno.h"
#include "support/processes/await.h"

using OrvaDRCore::RetryOnEintr;

int ExitCodeOf(int status)
{
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

int Reap(pid_t pid)
{
    int status = 0;
    const pid_t ended = RetryOnEintr([&] { return ::waitpid(pid, &status, 0); });
    return ended < 0 ? -1 : ExitCodeOf(status);
}

void AwaitZombie(pid_t pid)
{
    siginfo_t ended{};
    EXPECT_EQ(::waitid(P_PID, static_cast<id_t>(pid), &ended, WEXITED | WNOWAIT), 0);
}

void ReapAll()
{
    EXPECT_TRUE(AwaitUntil([] {
        pid_t pid = 0;
        do {
            pid = ::waitpid(-1, nullptr, WNOHANG | __WALL);
        } while (pid > 0);
        return pid < 0 && errno == ECHILD;
    })) << "a process does not end";
}
