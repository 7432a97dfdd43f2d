// A program is started through a process between it and the caller, which waits for the program and
// then ends as the program did. The one between is a child that sends no signal: the kernel throws
// the results of SIGCHLD children away when the caller ignores that signal, and a handler of the
// caller's may fetch them before we do; of a child without a signal neither holds. The program
// cannot be such a child itself: execve() makes SIGCHLD the signal of whoever calls it.
//
// The one between is forked, which takes the longer the more memory the caller has. It cannot live
// in the caller's memory as long as the program runs: it would share the C library's state with the
// thread that it came from. Its own child does live in its memory until it is the program.
#include <orvacore/orvacore.h>

#include <fcntl.h>
#include <signal.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <climits>
#include <cstdarg>
#include <cstring>
#include <memory>
#include <new>

namespace {

constexpr std::size_t MaxArguments = 16;
constexpr int FirstOther = STDERR_FILENO + 1;  // from here on descriptors are closed for programs
constexpr int ExitCannotStart = 127;

// A program's arguments, its path first, null last.
using Arguments = std::array<char*, MaxArguments + 1>;

// What the new processes need to know.
struct Start {
    char* const* arguments;
    int output;        // becomes descriptor 1; -1 leaves that as it is
    sigset_t signals;  // the caller's signal mask
};

// Forks a child that sends no signal. The C library knows nothing of it, and other threads may have
// held locks: the child makes system calls only.
pid_t ForkSilently()
{
    return static_cast<pid_t>(::syscall(SYS_clone, 0L, 0L, 0L, 0L, 0L));
}

// The exit code of a child; -1 when a signal ended it.
int WaitFor(pid_t pid)
{
    int status = 0;
    while (::waitpid(pid, &status, __WALL) < 0) {
        if (errno != EINTR) return -1;
    }
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

// Says into a pipe why a program could not be started; 0 when it was.
void SendError(int fd, int error)
{
    while (::write(fd, &error, sizeof error) < 0 && errno == EINTR) {
    }
}

// What was said; `silence` when the pipe was closed without a word.
int ReceiveError(int fd, int silence)
{
    int error = silence;
    while (::read(fd, &error, sizeof error) < 0 && errno == EINTR) {
    }
    return error;
}

// The caller's handlers are not for the new processes, and SIGCHLD must not be ignored there: they
// wait for children of their own.
void ResetSignals()
{
    for (int signal = 1; signal < NSIG; ++signal) {
        struct sigaction action {};
        if (::sigaction(signal, nullptr, &action) < 0 ||
            (action.sa_handler == SIG_IGN && signal != SIGCHLD)) {
            continue;
        }
        action.sa_flags = 0;
        action.sa_handler = SIG_DFL;
        ::sigaction(signal, &action, nullptr);
    }
}

// Descriptor 1 stays open across the start of the program also when it was `output` already.
bool RedirectOutput(int output)
{
    if (output < 0) return true;
    if (output == STDOUT_FILENO) return ::fcntl(output, F_SETFD, 0) == 0;
    return ::dup2(output, STDOUT_FILENO) >= 0;
}

// Leaves the standard descriptors open, and `report`, which is moved behind them when the caller
// had closed some.
bool ArrangeDescriptors(int output, int& report)
{
    const int moved = ::fcntl(report, F_DUPFD_CLOEXEC, FirstOther);
    if (moved < 0 || !RedirectOutput(output)) return false;
    report = moved;
    const auto kept = static_cast<unsigned int>(moved);
    return (kept == FirstOther || ::close_range(FirstOther, kept - 1, 0) == 0) &&
           ::close_range(kept + 1, UINT_MAX, 0) == 0;
}

[[noreturn]] void BecomeProgram(const Start& start, int report)
{
    ::pthread_sigmask(SIG_SETMASK, &start.signals, nullptr);
    ::execve(start.arguments[0], start.arguments, environ);
    SendError(report, errno);
    ::_exit(ExitCannotStart);
}

// Starts the program as a child. Answers 0, or why that failed.
int StartProgram(const Start& start, pid_t& program)
{
    std::array<int, 2> pipe{};  // closed by the start of the program
    if (::pipe2(pipe.data(), O_CLOEXEC) < 0) return errno;
    // The child makes system calls only, and this process stands still until it is the program.
    const pid_t child = ::vfork();  // NOLINT(clang-analyzer-security.insecureAPI.vfork)
    if (child < 0) return errno;
    if (child == 0) BecomeProgram(start, pipe[1]);  // NOLINT(clang-analyzer-unix.Vfork)
    program = child;
    ::close(pipe[1]);
    return ReceiveError(pipe[0], 0);
}

// The process between. Signals stay blocked in it: it is to outlive the program.
[[noreturn]] void Accompany(const Start& start, int report)
{
    ResetSignals();
    pid_t program = -1;
    const bool arranged = ArrangeDescriptors(start.output, report);
    const int error = arranged ? StartProgram(start, program) : errno;
    SendError(report, error);
    ::close_range(0, UINT_MAX, 0);  // who reads the program's output waits for the program alone
    const int code = error == 0 ? WaitFor(program) : ExitCannotStart;
    if (code < 0) ::kill(::getpid(), SIGKILL);
    ::_exit(code);
}

// Starts a program. Answers the id of the process to wait for, which ends as the program does; -1
// with errno set when the program cannot be started.
pid_t Spawn(const Arguments& arguments, int output)
{
    std::array<int, 2> pipe{};
    if (::pipe2(pipe.data(), O_CLOEXEC) < 0) return -1;
    Start start{arguments.data(), output, {}};
    sigset_t all;
    ::sigfillset(&all);
    ::pthread_sigmask(SIG_BLOCK, &all, &start.signals);
    const pid_t between = ForkSilently();
    if (between == 0) Accompany(start, pipe[1]);
    int error = errno;
    ::pthread_sigmask(SIG_SETMASK, &start.signals, nullptr);
    ::close(pipe[1]);
    // Other threads' children may hold the pipe open: its end is not what tells of the start.
    if (between > 0) error = ReceiveError(pipe[0], ECHILD);
    ::close(pipe[0]);
    if (between > 0 && error == 0) return between;

    if (between > 0) WaitFor(between);
    errno = error;
    return -1;
}

// What a stream of CoreLibPopen carries: no table of open programs is needed.
struct Program {
    int output;  // reading end of the program's standard output
    pid_t pid;
};

// Starts a program with a pipe for its output, whose reading end goes into `program`.
bool SpawnForReading(const Arguments& arguments, Program& program)
{
    std::array<int, 2> pipe{};
    if (::pipe2(pipe.data(), O_CLOEXEC) < 0) return false;
    program = {pipe[0], Spawn(arguments, pipe[1])};
    const int error = errno;
    ::close(pipe[1]);
    if (program.pid < 0) ::close(pipe[0]);
    errno = error;
    return program.pid >= 0;
}

ssize_t ReadOutput(void* cookie, char* buffer, std::size_t size)
{
    const auto* program = static_cast<const Program*>(cookie);
    ssize_t count = 0;
    do {
        count = ::read(program->output, buffer, size);
    } while (count < 0 && errno == EINTR);
    return count;
}

int CloseOutput(void* cookie)
{
    const std::unique_ptr<Program> program(static_cast<Program*>(cookie));
    ::close(program->output);
    return WaitFor(program->pid) == 0 ? 0 : -1;
}

FILE* OpenProgram(const Arguments& arguments)
{
    std::unique_ptr<Program> program(new (std::nothrow) Program{-1, -1});
    if (program == nullptr || !SpawnForReading(arguments, *program)) return nullptr;
    FILE* stream = ::fopencookie(program.get(), "r", {ReadOutput, nullptr, nullptr, CloseOutput});
    Program* cookie = program.release();
    if (stream == nullptr) CloseOutput(cookie);
    return stream;
}

}  // namespace

int CoreLibExec(const char* path, const char* argument1, const char* argument2,
                const char* argument3, const char* argument4)
{
    Arguments arguments{};
    std::size_t count = 0;
    for (const char* argument : {path, argument1, argument2, argument3, argument4}) {
        if (argument == nullptr) break;
        arguments[count++] = const_cast<char*>(argument);
    }
    if (count == 0) {
        errno = EINVAL;
        return -1;
    }
    const pid_t pid = Spawn(arguments, -1);
    return pid < 0 ? -1 : WaitFor(pid);
}

FILE* CoreLibPopen(const char* path, const char* mode, ...)
{
    Arguments arguments{};
    arguments[0] = const_cast<char*>(path);
    std::size_t count = 1;
    va_list rest;
    va_start(rest, mode);
    while (count < arguments.size()) {
        arguments[count] = va_arg(rest, char*);
        if (arguments[count] == nullptr) break;
        ++count;
    }
    va_end(rest);

    if (count == arguments.size() || path == nullptr || std::strcmp(mode, "r") != 0) {
        errno = EINVAL;
        return nullptr;
    }
    return OpenProgram(arguments);
}

int CoreLibPclose(FILE* stream)
{
    return std::fclose(stream) == 0 ? 0 : -1;
}
