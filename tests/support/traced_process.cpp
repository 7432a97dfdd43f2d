#include "traced_process.h"

#include <signal.h>
#include <sys/ptrace.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>

namespace {

constexpr unsigned int DeadlineSeconds = 60;  // ends a child that hangs, and so the wait for it

constexpr int SystemCallStop = SIGTRAP | 0x80;
constexpr int StartEvents = PTRACE_O_TRACEFORK | PTRACE_O_TRACEVFORK | PTRACE_O_TRACECLONE;

bool Trace(__ptrace_request request, pid_t pid, long data)
{
    return ::ptrace(request, pid, nullptr, data) == 0;
}

// Which of the PTRACE_EVENT_... a wait has told of; 0 for none.
int EventOf(int status)
{
    return WIFSTOPPED(status) ? status >> 16 : 0;
}

}  // namespace

TracedProcess::TracedProcess(const std::function<void()>& body)
{
    pid = ::fork();
    if (pid < 0) std::abort();
    if (pid == 0) {
        Trace(PTRACE_TRACEME, 0, 0);
        ::alarm(DeadlineSeconds);
        (void)::raise(SIGSTOP);
        try {
            body();
        } catch (...) {
            ::_exit(1);
        }
        ::_exit(0);
    }
    if (!Await(pid) || !Trace(PTRACE_SETOPTIONS, pid, PTRACE_O_EXITKILL | PTRACE_O_TRACESYSGOOD)) {
        std::abort();
    }
}

TracedProcess::~TracedProcess()
{
    Kill();
}

bool TracedProcess::Step()
{
    if (pid < 0) return false;
    int signal = 0;
    do {
        Trace(PTRACE_SYSCALL, pid, signal);
        if (!Await(pid)) {
            pid = -1;
            return false;
        }
        signal = WSTOPSIG(status);
    } while (signal != SystemCallStop);
    return true;
}

pid_t TracedProcess::RunToStartedProgram()
{
    Trace(PTRACE_SETOPTIONS, pid, PTRACE_O_EXITKILL | PTRACE_O_TRACEEXEC | StartEvents);
    Trace(PTRACE_CONT, pid, 0);
    pid_t newest = pid;
    while (Await(newest)) {
        const int event = EventOf(status);
        if (event == PTRACE_EVENT_EXEC) return newest;
        unsigned long forked = 0;
        const bool hasForked =
            event != 0 && ::ptrace(PTRACE_GETEVENTMSG, newest, nullptr, &forked) == 0;
        // A process between the child and the program is let go: nobody here waits for its end.
        Trace(hasForked && newest != pid ? PTRACE_DETACH : PTRACE_CONT, newest, 0);
        if (hasForked) newest = static_cast<pid_t>(forked);
    }
    return -1;
}

void TracedProcess::Release(pid_t program)
{
    Trace(PTRACE_DETACH, program, 0);
}

void TracedProcess::Kill()
{
    if (pid < 0) return;
    ::kill(pid, SIGKILL);
    while (Await(pid)) {
    }
    pid = -1;
}

int TracedProcess::ExitCode() const
{
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

// Waits for the next stop. False when there is none any more.
bool TracedProcess::Await(pid_t whom)
{
    while (::waitpid(whom, &status, __WALL) < 0) {
        if (errno != EINTR) std::abort();
    }
    return WIFSTOPPED(status);
}
