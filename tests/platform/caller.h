// For the tests of the platform stand-ins: what a caller can set up before it forks or starts a
// program, and what it can see afterwards.
#ifndef ORVADRCORE_TESTS_PLATFORM_CALLER_H
#define ORVADRCORE_TESTS_PLATFORM_CALLER_H

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "support/processes/child_process.h"

// A pipe that programs inherit only if the caller passes it on.
class Pipe {
  public:
    Pipe()
    {
        if (::pipe2(ends_.data(), O_CLOEXEC) < 0) std::abort();
    }
    Pipe(const Pipe&) = delete;
    Pipe& operator=(const Pipe&) = delete;
    ~Pipe()
    {
        CloseReading();
        CloseWriting();
    }

    int Reading() const { return ends_[0]; }
    int Writing() const { return ends_[1]; }
    void CloseReading() { Close(ends_[0]); }
    void CloseWriting() { Close(ends_[1]); }

    void Write(const std::string& text) const
    {
        EXPECT_EQ(::write(Writing(), text.data(), text.size()), static_cast<ssize_t>(text.size()));
    }

    // Everything until the last writer but this process has closed its end.
    std::string ReadToEnd()
    {
        CloseWriting();
        std::string text;
        while (ReadOne(text)) {
        }
        return text;
    }

    // The next line.
    std::string ReadLine() const
    {
        std::string line;
        while (ReadOne(line) && line.back() != '\n') {
        }
        if (!line.empty()) line.pop_back();
        return line;
    }

  private:
    static constexpr int DeadlineMSec = 60'000;

    static void Close(int& fd)
    {
        if (fd >= 0) ::close(fd);
        fd = -1;
    }

    bool ReadOne(std::string& text) const
    {
        pollfd waiting{Reading(), POLLIN, 0};
        if (::poll(&waiting, 1, DeadlineMSec) <= 0) {
            ADD_FAILURE() << "nobody wrote or closed the pipe";
            return false;
        }
        char next = 0;
        if (::read(Reading(), &next, 1) != 1) return false;
        text += next;
        return true;
    }

    std::array<int, 2> ends_{-1, -1};
};

// The number that a text begins with, or 0.
inline long Number(const std::string& text)
{
    return std::strtol(text.c_str(), nullptr, 10);
}

// A process that no test waits for, killed at the end of the test.
struct Bystander {
    pid_t pid;

    explicit Bystander(const std::string& text) : pid(static_cast<pid_t>(Number(text))) {}
    Bystander(const Bystander&) = delete;
    Bystander& operator=(const Bystander&) = delete;
    ~Bystander()
    {
        if (pid > 0) ::kill(pid, SIGKILL);
    }
};

// The open descriptors of this process.
inline std::set<int> Descriptors()
{
    std::set<int> open;
    std::vector<int> listed;  // including that of the listing
    for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
        listed.push_back(static_cast<int>(Number(entry.path().filename())));
    }
    for (const int fd : listed) {
        if (::fcntl(fd, F_GETFD) >= 0) open.insert(fd);
    }
    return open;
}

// Allows `count` descriptors more than those that are open.
inline void LeaveDescriptors(int count)
{
    std::vector<int> free(static_cast<std::size_t>(count) + 1);
    for (int& fd : free) fd = ::fcntl(STDERR_FILENO, F_DUPFD, 0);
    for (const int fd : free) ::close(fd);
    rlimit limits{};
    ::getrlimit(RLIMIT_NOFILE, &limits);
    limits.rlim_cur = static_cast<rlim_t>(free.back());
    EXPECT_EQ(::setrlimit(RLIMIT_NOFILE, &limits), 0);
}

// Whether this process has a child, running or not yet waited for.
inline bool HasChildren()
{
    return ::waitpid(-1, nullptr, WNOHANG | __WALL) >= 0 || errno != ECHILD;
}

// The blocked signals and all actions, as a text to compare.
inline std::string SignalSettings()
{
    std::ostringstream text;
    const auto print = [&](const sigset_t& signals) {
        for (int signal = 1; signal <= SIGRTMAX; ++signal) text << ::sigismember(&signals, signal);
        text << '\n';
    };
    sigset_t blocked;
    ::pthread_sigmask(SIG_SETMASK, nullptr, &blocked);
    print(blocked);
    for (int signal = 1; signal <= SIGRTMAX; ++signal) {
        struct sigaction action {};
        if (::sigaction(signal, nullptr, &action) < 0) continue;
        constexpr int Restorer = 0x04000000;  // set by the C library with every action
        text << signal << ' ' << reinterpret_cast<void*>(action.sa_handler) << ' '
             << (action.sa_flags & ~Restorer) << ' ';
        print(action.sa_mask);
    }
    return text.str();
}

inline void SetSignal(int signal, void (*handler)(int), int flags = 0)
{
    struct sigaction action {};
    action.sa_handler = handler;
    action.sa_flags = flags;
    EXPECT_EQ(::sigaction(signal, &action, nullptr), 0);
}

inline void BlockSignal(int signal)
{
    sigset_t signals;
    ::sigemptyset(&signals);
    ::sigaddset(&signals, signal);
    EXPECT_EQ(::pthread_sigmask(SIG_BLOCK, &signals, nullptr), 0);
}

// A handler that waits for all children, as in event loops.
inline void ReapChildren(int)
{
    const int error = errno;
    while (::waitpid(-1, nullptr, WNOHANG) > 0) {
    }
    errno = error;
}

// How callers handle SIGCHLD.
struct ChildSignal {
    const char* name;
    void (*handler)(int);
    int flags;
};
const std::array<ChildSignal, 5> ChildSignals{{
    {"default", SIG_DFL, 0},
    {"ignored", SIG_IGN, 0},
    {"no zombies", SIG_DFL, SA_NOCLDWAIT},
    {"reaping handler", ReapChildren, SA_RESTART},
    {"reaping handler, no zombies", ReapChildren, SA_NOCLDWAIT},
}};

#endif
