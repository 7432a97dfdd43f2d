#include <orvacore/orvacore.h>

#include <fcntl.h>
#include <spawn.h>
#include <sys/types.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdarg>
#include <cstring>
#include <memory>
#include <new>

namespace {

constexpr const char* Whitespace = " \t\n\v\f\r";
constexpr std::size_t MaxArguments = 16;

// A program's arguments, the last one null.
using Arguments = std::array<char*, MaxArguments + 1>;

// What a stream of CoreLibPopen carries: no table of open programs is needed.
struct Program {
    int output;  // reading end of the program's standard output
    pid_t pid;
};

// The exit code of a child; -1 when it ended otherwise. For a caller that ignores SIGCHLD the
// kernel drops its children's results: the child is gone by then, and how it ended cannot be known.
int WaitFor(pid_t pid)
{
    int status = 0;
    while (::waitpid(pid, &status, 0) < 0) {
        if (errno != EINTR) return errno == ECHILD ? 0 : -1;
    }
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

// Starts a program with `output` as its descriptor 1 and none above 2. Answers an errno code.
int Spawn(const Arguments& arguments, int output, pid_t& pid)
{
    posix_spawn_file_actions_t actions;
    int error = ::posix_spawn_file_actions_init(&actions);
    if (error != 0) return error;
    error = ::posix_spawn_file_actions_adddup2(&actions, output, STDOUT_FILENO);
    if (error == 0) error = ::posix_spawn_file_actions_addclosefrom_np(&actions, STDERR_FILENO + 1);
    if (error == 0) {
        error = ::posix_spawn(&pid, arguments[0], &actions, nullptr, arguments.data(), environ);
    }
    ::posix_spawn_file_actions_destroy(&actions);
    return error;
}

// As Spawn, with a new pipe's reading end in `program`.
int SpawnForReading(const Arguments& arguments, Program& program)
{
    std::array<int, 2> pipe{};
    if (::pipe2(pipe.data(), O_CLOEXEC) < 0) return errno;
    const int error = Spawn(arguments, pipe[1], program.pid);
    ::close(pipe[1]);
    if (error == 0) {
        program.output = pipe[0];
    } else {
        ::close(pipe[0]);
    }
    return error;
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
    const int error = program != nullptr ? SpawnForReading(arguments, *program) : ENOMEM;
    if (error != 0) {
        errno = error;
        return nullptr;
    }
    FILE* stream = ::fopencookie(program.get(), "r", {ReadOutput, nullptr, nullptr, CloseOutput});
    Program* cookie = program.release();
    if (stream == nullptr) {
        CloseOutput(cookie);
        errno = ENOMEM;
    }
    return stream;
}

}  // namespace

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

char* CoreLibStrTrim(char* text, const char* leading, const char* trailing)
{
    if (text == nullptr) return nullptr;
    if (leading == nullptr) leading = Whitespace;
    if (trailing == nullptr) trailing = Whitespace;

    const char* begin = text + std::strspn(text, leading);
    const char* end = begin + std::strlen(begin);
    while (end > begin && std::strchr(trailing, end[-1]) != nullptr) --end;
    const auto length = static_cast<std::size_t>(end - begin);
    std::memmove(text, begin, length);
    text[length] = '\0';
    return text;
}
