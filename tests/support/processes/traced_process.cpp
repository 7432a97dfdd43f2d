#include "support/processes/traced_process.h"

#include <signal.h>
#include <sys/ptrace.h>
#include <sys/uio.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <map>
#include <set>

#include "base/errno.h"
#include "support/processes/reap.h"

using OrvaDRCore::RetryOnEintr;

namespace {

constexpr unsigned int DeadlineSeconds = 60;  // ends a child that hangs

constexpr int SystemCallStop = SIGTRAP | 0x80;
constexpr int UsualOptions = PTRACE_O_EXITKILL | PTRACE_O_TRACESYSGOOD;
constexpr int StartEvents = PTRACE_O_TRACEFORK | PTRACE_O_TRACEVFORK | PTRACE_O_TRACECLONE;

bool Trace(__ptrace_request request, pid_t pid, long data)
{
    return ::ptrace(request, pid, nullptr, data) == 0;
}

// The PTRACE_EVENT_... of a stop; 0 for none.
int EventOf(int status)
{
    return WIFSTOPPED(status) ? status >> 16 : 0;
}

// The new process at a stop for one of the StartEvents.
pid_t ForkedBy(pid_t pid)
{
    unsigned long forked = 0;
    return ::ptrace(PTRACE_GETEVENTMSG, pid, nullptr, &forked) == 0 ? static_cast<pid_t>(forked)
                                                                    : -1;
}

SystemCall CallOf(pid_t pid)
{
    __ptrace_syscall_info info{};
    if (::ptrace(PTRACE_GET_SYSCALL_INFO, pid, sizeof info, &info) <= 0) std::abort();
    SystemCall call{};
    call.hasEnded = info.op == PTRACE_SYSCALL_INFO_EXIT;
    if (call.hasEnded) {
        call.result = info.exit.rval;
    } else {
        call.number = info.entry.nr;
        std::copy(std::begin(info.entry.args), std::end(info.entry.args), call.arguments.begin());
    }
    return call;
}

// A process and all processes forked from it, one of which is to be killed.
class Family {
  public:
    Family(pid_t first, int member, int call)
        : victim_(static_cast<std::size_t>(member)), callsLeft_(call)
    {
        Meet(first);
    }

    bool IsAlive() const { return !living_.empty(); }
    bool HasKilled() const { return killed_; }

    void Go(pid_t pid, int signal)
    {
        const bool isWatched = !killed_ && members_.at(pid) == victim_;
        Trace(isWatched ? PTRACE_SYSCALL : PTRACE_CONT, pid, signal);
    }

    // Handles a stop or the end of a member.
    void Take(pid_t pid, int status)
    {
        if (!WIFSTOPPED(status)) {
            living_.erase(pid);  // reported twice if its parent was killed before reaping it
            return;
        }
        Meet(pid);
        const int event = EventOf(status);
        const int signal = WSTOPSIG(status);
        if (event != 0) {
            Meet(ForkedBy(pid));  // when a program is started, the process itself
        } else if (signal == SystemCallStop && !CallOf(pid).hasEnded && --callsLeft_ == 0) {
            killed_ = true;
            ::kill(pid, SIGKILL);
            return;
        }
        // A new member starts with a SIGSTOP, which is not passed on.
        const bool isSent = event == 0 && signal != SystemCallStop && signal != SIGSTOP;
        Go(pid, isSent ? signal : 0);
    }

  private:
    // Parent and child both report a fork, in any order. The child may have ended by then.
    void Meet(pid_t pid)
    {
        if (pid > 0 && members_.emplace(pid, members_.size()).second) living_.insert(pid);
    }

    std::map<pid_t, std::size_t> members_;  // those that have ended, too
    std::set<pid_t> living_;
    std::size_t victim_;
    int callsLeft_;
    bool killed_ = false;
};

}  // namespace

TracedProcess::TracedProcess(const std::function<void()>& body)
{
    pid_ = ::fork();
    if (pid_ < 0) std::abort();
    if (pid_ == 0) {
        Trace(PTRACE_TRACEME, 0, 0);
        ::setenv("ORVADR_TRACED", "1", 1);  // NOLINT(concurrency-mt-unsafe): for coverage_exit.cpp
        ::alarm(DeadlineSeconds);
        (void)::raise(SIGSTOP);
        try {
            body();
        } catch (...) {
            ::_exit(1);
        }
        ::_exit(0);
    }
    if (!Await(pid_) || !Trace(PTRACE_SETOPTIONS, pid_, UsualOptions)) {
        std::abort();
    }
}

TracedProcess::~TracedProcess()
{
    Kill();
}

bool TracedProcess::Step()
{
    if (pid_ < 0) return false;
    int signal = 0;
    do {
        Trace(PTRACE_SYSCALL, pid_, signal);
        if (!Await(pid_)) {
            pid_ = -1;
            return false;
        }
        signal = WSTOPSIG(status_);
    } while (signal != SystemCallStop);
    return true;
}

SystemCall TracedProcess::Call() const
{
    return CallOf(pid_);
}

std::string TracedProcess::Memory(std::uint64_t address, std::size_t size) const
{
    std::string bytes(size, '\0');
    iovec ours{bytes.data(), size};
    // NOLINTNEXTLINE(performance-no-int-to-ptr)
    void* const there = reinterpret_cast<void*>(static_cast<std::uintptr_t>(address));
    iovec theirs{there, size};
    const ssize_t count = ::process_vm_readv(pid_, &ours, 1, &theirs, 1, 0);
    bytes.resize(static_cast<std::size_t>(std::max<ssize_t>(count, 0)));
    return bytes;
}

std::string TracedProcess::Text(std::uint64_t address) const
{
    std::string text;
    for (std::string byte; !(byte = Memory(address + text.size(), 1)).empty() && byte[0] != '\0';) {
        text += byte;
    }
    return text;
}

bool TracedProcess::KillBefore(int member, int call)
{
    // Without PTRACE_O_TRACEEXEC a started program gets a SIGTRAP, which ends it.
    Trace(PTRACE_SETOPTIONS, pid_, UsualOptions | PTRACE_O_TRACEEXEC | StartEvents);
    Family family(pid_, member, call);
    family.Go(pid_, 0);
    while (family.IsAlive()) {
        int news = 0;
        const pid_t who = RetryOnEintr([&] { return ::waitpid(-1, &news, __WALL); });
        if (who < 0) std::abort();
        family.Take(who, news);
        if (who == pid_) status_ = news;
    }
    pid_ = -1;
    return family.HasKilled();
}

pid_t TracedProcess::RunToStartedProgram()
{
    Trace(PTRACE_SETOPTIONS, pid_, PTRACE_O_EXITKILL | PTRACE_O_TRACEEXEC | StartEvents);
    Trace(PTRACE_CONT, pid_, 0);
    pid_t newest = pid_;
    while (Await(newest)) {
        const int event = EventOf(status_);
        if (event == PTRACE_EVENT_EXEC) return newest;
        const pid_t forked = event != 0 ? ForkedBy(newest) : -1;
        // An intermediate process is released, because nobody here waits for its end.
        Trace(forked > 0 && newest != pid_ ? PTRACE_DETACH : PTRACE_CONT, newest, 0);
        if (forked > 0) newest = forked;
    }
    return -1;
}

void TracedProcess::Release(pid_t program)
{
    Trace(PTRACE_DETACH, program, 0);
}

void TracedProcess::Kill()
{
    if (pid_ < 0) return;
    ::kill(pid_, SIGKILL);
    while (Await(pid_)) {
    }
    pid_ = -1;
}

int TracedProcess::ExitCode() const
{
    return ExitCodeOf(status_);
}

// Waits for the next stop. False when the process has ended.
bool TracedProcess::Await(pid_t whom)
{
    if (RetryOnEintr([&] { return ::waitpid(whom, &status_, __WALL); }) < 0) std::abort();
    return WIFSTOPPED(status_);
}
