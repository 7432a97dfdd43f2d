// Programs are started by posix_spawn(), whose cost does not depend on the caller's memory.
//
// Usually a program is a child of the caller. If the caller's handling of SIGCHLD would lose the
// result, a companion is the parent: an intermediate process that waits for the program and then ends
// as it did. The companion is a child that sends no signal. The kernel keeps the result of such a
// child even if SIGCHLD is ignored, and a handler's waitpid(-1) does not get it. The program itself
// cannot be such a child, because execve() resets the signal to SIGCHLD.
#include <orvacore/orvacore.h>

#include <fcntl.h>
#include <signal.h>
#include <spawn.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdarg>
#include <cstring>
#include <memory>
#include <new>

#include "base/errno.h"
#include "child_report.h"

namespace {

using OrvaDRCore::PreserveErrno;
using OrvaDRCore::RetryOnEintr;

constexpr std::size_t MaxArguments = 16;
constexpr int FirstOther = STDERR_FILENO + 1;  // programs inherit no descriptor from here on
constexpr int ExitCannotStart = 127;

// The path, the arguments and a null pointer.
using Arguments = std::array<char*, MaxArguments + 1>;

// How a program is started: with the caller's signal mask, descriptors 0 to 2 and no others.
class Start {
  public:
    // `output` becomes descriptor 1, unless it is -1.
    Start(const Arguments& arguments, int output);
    Start(const Start&) = delete;
    Start& operator=(const Start&) = delete;
    ~Start();

    // Starts the program as a child of this process. Returns 0 or an errno.
    int Run(pid_t& program) const;

  private:
    const Arguments& arguments_;
    posix_spawn_file_actions_t files_{};
    posix_spawnattr_t attributes_{};
    int error_ = 0;
};

Start::Start(const Arguments& arguments, int output) : arguments_(arguments)
{
    ::posix_spawn_file_actions_init(&files_);
    if (output >= 0) error_ = ::posix_spawn_file_actions_adddup2(&files_, output, STDOUT_FILENO);
    if (error_ == 0) error_ = ::posix_spawn_file_actions_addclosefrom_np(&files_, FirstOther);

    // Programs expect the default, to wait for their own children.
    sigset_t defaults;
    ::sigemptyset(&defaults);
    ::sigaddset(&defaults, SIGCHLD);
    sigset_t mask;
    ::pthread_sigmask(SIG_SETMASK, nullptr, &mask);
    ::posix_spawnattr_init(&attributes_);
    ::posix_spawnattr_setsigdefault(&attributes_, &defaults);
    ::posix_spawnattr_setsigmask(&attributes_, &mask);
    ::posix_spawnattr_setflags(&attributes_, POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK);
}

Start::~Start()
{
    ::posix_spawnattr_destroy(&attributes_);
    ::posix_spawn_file_actions_destroy(&files_);
}

int Start::Run(pid_t& program) const
{
    if (error_ != 0) return error_;
    return ::posix_spawn(&program, arguments_[0], &files_, &attributes_, arguments_.data(),
                         environ);
}

// Waits for a child. Returns its exit code, or -1 with errno EINTR if a signal ended it, or ECHILD if
// somebody else got its result.
int WaitFor(pid_t pid)
{
    int status = 0;
    if (RetryOnEintr([&] { return ::waitpid(pid, &status, __WALL); }) < 0) return -1;
    if (WIFEXITED(status)) return WEXITSTATUS(status);
    errno = EINTR;
    return -1;
}

// Whether the kernel keeps a child's result until somebody waits for it. A handler of SIGCHLD may wait
// for any child.
bool KeepsResults()
{
    struct sigaction action {};
    return ::sigaction(SIGCHLD, nullptr, &action) == 0 && action.sa_handler == SIG_DFL &&
           (action.sa_flags & SA_NOCLDWAIT) == 0;
}

// Forks a child that sends no signal. The C library does not know about this fork, and other threads
// may hold locks: the child must not call anything that takes one.
pid_t ForkSilently()
{
    return static_cast<pid_t>(::syscall(SYS_clone, 0L, 0L, 0L, 0L, 0L));
}

// The companion. Signals stay blocked, so that it outlives the program.
[[noreturn]] void Accompany(const Start& start, int report)
{
    struct sigaction byDefault {};
    ::sigaction(SIGCHLD, &byDefault, nullptr);
    pid_t program = -1;
    const int error = start.Run(program);
    SendReport(report, &error, sizeof error);
    if (error != 0) ::_exit(ExitCannotStart);
    ::closefrom(0);  // so that the program's output ends with the program
    const int code = WaitFor(program);
    if (code < 0) ::kill(::getpid(), SIGKILL);
    ::_exit(code);
}

// Starts a program through a companion. The caller waits for the companion. Returns 0 or an errno.
int RunAccompanied(const Start& start, pid_t& companion)
{
    std::array<int, 2> pipe{};
    if (::pipe2(pipe.data(), O_CLOEXEC) < 0) return errno;
    sigset_t all;
    ::sigfillset(&all);
    sigset_t mask;
    ::pthread_sigmask(SIG_BLOCK, &all, &mask);
    companion = ForkSilently();
    if (companion == 0) Accompany(start, pipe[1]);
    int error = errno;
    ::pthread_sigmask(SIG_SETMASK, &mask, nullptr);
    ::close(pipe[1]);
    if (companion > 0) {
        if (!ReceiveReport(pipe[0], companion, &error, sizeof error)) error = ECHILD;
        if (error != 0) WaitFor(companion);
    }
    ::close(pipe[0]);
    return error;
}

// Starts a program. Returns the id of the process to wait for, which ends as the program does, or -1
// with errno set.
pid_t Spawn(const Arguments& arguments, int output)
{
    const Start start(arguments, output);
    pid_t pid = -1;
    const int error = KeepsResults() ? start.Run(pid) : RunAccompanied(start, pid);
    if (error == 0) return pid;
    errno = error;
    return -1;
}

// The cookie of a CoreLibPopen() stream.
struct Program {
    int output;  // reading end of the program's standard output
    pid_t pid;
};

// Starts a program whose output can be read from `program`.
bool SpawnForReading(const Arguments& arguments, Program& program)
{
    std::array<int, 2> pipe{};
    if (::pipe2(pipe.data(), O_CLOEXEC) < 0) return false;
    program = {pipe[0], Spawn(arguments, pipe[1])};
    const PreserveErrno preserve;
    ::close(pipe[1]);
    if (program.pid < 0) ::close(pipe[0]);
    return program.pid >= 0;
}

ssize_t ReadOutput(void* cookie, char* buffer, std::size_t size)
{
    const auto* program = static_cast<const Program*>(cookie);
    return RetryOnEintr([&] { return ::read(program->output, buffer, size); });
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
