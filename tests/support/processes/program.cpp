#include "support/processes/program.h"

#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <utility>

#include "support/processes/reap.h"

namespace {

// Far longer than any test has to wait: it only ends what hangs.
constexpr std::chrono::seconds Deadline{100};

struct Pipe {
    int readEnd;
    int writeEnd;
};

Pipe MakePipe()
{
    std::array<int, 2> ends{};
    if (::pipe2(ends.data(), O_CLOEXEC) < 0) std::abort();
    return {ends[0], ends[1]};
}

void Close(int& descriptor)
{
    if (descriptor >= 0) ::close(descriptor);
    descriptor = -1;
}

// Appends what has arrived in a pipe, and closes the pipe at its end.
void Receive(int& descriptor, std::string& text)
{
    std::array<char, 65536> buffer{};
    const ssize_t count = ::read(descriptor, buffer.data(), buffer.size());
    if (count > 0) {
        text.append(buffer.data(), static_cast<std::size_t>(count));
    } else if (count == 0 || errno != EINTR) {
        Close(descriptor);
    }
}

}  // namespace

Program::Program(const std::vector<std::string>& arguments)
    : deadline_(std::chrono::steady_clock::now() + Deadline)
{
    // When the program ends early, writing to it must not end the test.
    static_cast<void>(std::signal(SIGPIPE, SIG_IGN));

    const Pipe toIn = MakePipe();
    const Pipe fromOut = MakePipe();
    const Pipe fromErr = MakePipe();
    posix_spawn_file_actions_t actions;
    ::posix_spawn_file_actions_init(&actions);
    ::posix_spawn_file_actions_adddup2(&actions, toIn.readEnd, STDIN_FILENO);
    ::posix_spawn_file_actions_adddup2(&actions, fromOut.writeEnd, STDOUT_FILENO);
    ::posix_spawn_file_actions_adddup2(&actions, fromErr.writeEnd, STDERR_FILENO);

    // The program starts with the default action, as from a shell.
    posix_spawnattr_t attributes;
    sigset_t defaults;
    ::sigemptyset(&defaults);
    ::sigaddset(&defaults, SIGPIPE);
    ::posix_spawnattr_init(&attributes);
    ::posix_spawnattr_setsigdefault(&attributes, &defaults);
    ::posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETSIGDEF);

    std::vector<char*> words;
    words.reserve(arguments.size() + 1);
    for (const std::string& argument : arguments) {
        words.push_back(const_cast<char*>(argument.c_str()));
    }
    words.push_back(nullptr);
    if (::posix_spawn(&pid_, words[0], &actions, &attributes, words.data(), environ) != 0) {
        std::abort();
    }
    ::posix_spawnattr_destroy(&attributes);
    ::posix_spawn_file_actions_destroy(&actions);

    ::close(toIn.readEnd);
    ::close(fromOut.writeEnd);
    ::close(fromErr.writeEnd);
    in_ = toIn.writeEnd;
    out_ = fromOut.readEnd;
    err_ = fromErr.readEnd;
    ::fcntl(in_, F_SETFL, O_NONBLOCK);  // a full pipe must not keep us from reading
}

Program::~Program()
{
    Close(in_);
    Close(out_);
    Close(err_);
    if (pid_ < 0) return;
    ::kill(pid_, SIGKILL);
    Reap(pid_);
}

void Program::Send(const std::string& text)
{
    unsent_ += text;
    WriteUnsent();
}

std::string Program::ReadLine()
{
    std::size_t end = unread_.find('\n');
    while (end == std::string::npos) {
        if (out_ < 0 || !Pump()) return {};
        end = unread_.find('\n');
    }
    std::string line = unread_.substr(0, end);
    unread_.erase(0, end + 1);
    return line;
}

void Program::CloseOutput()
{
    Close(out_);
}

void Program::Kill(int signal) const
{
    ::kill(pid_, signal);
}

ProgramResult Program::Finish()
{
    isInputComplete_ = true;
    while (in_ >= 0 || out_ >= 0 || err_ >= 0) {
        if (Pump()) continue;
        ::kill(pid_, SIGKILL);
        break;
    }
    return {Reap(std::exchange(pid_, -1)), unread_, errors_};
}

// Writes as much as fits into the pipe. Gives up when the program has closed it.
void Program::WriteUnsent()
{
    const ssize_t count = ::write(in_, unsent_.data(), unsent_.size());
    if (count > 0) unsent_.erase(0, static_cast<std::size_t>(count));
    if (count < 0 && errno == EPIPE) {
        unsent_.clear();
        Close(in_);
    }
}

// Waits for an event on the pipes and handles it. False after the deadline.
bool Program::Pump()
{
    if (isInputComplete_ && unsent_.empty()) Close(in_);
    // poll ignores -1: a closed pipe, or the input when nothing is left to write.
    std::array<pollfd, 3> pipes{pollfd{unsent_.empty() ? -1 : in_, POLLOUT, 0},
                                pollfd{out_, POLLIN, 0}, pollfd{err_, POLLIN, 0}};
    const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(
        deadline_ - std::chrono::steady_clock::now());
    if (left.count() <= 0) return false;
    if (in_ < 0 && out_ < 0 && err_ < 0) return true;
    if (::poll(pipes.data(), pipes.size(), static_cast<int>(left.count())) <= 0) return true;

    if (pipes[0].revents != 0) WriteUnsent();
    if (pipes[1].revents != 0) Receive(out_, unread_);
    if (pipes[2].revents != 0) Receive(err_, errors_);
    return true;
}

ProgramResult RunProgram(const std::vector<std::string>& arguments, const std::string& input)
{
    Program program(arguments);
    program.Send(input);
    return program.Finish();
}
