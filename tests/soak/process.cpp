#include "process.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <system_error>

namespace Soak {

namespace {

constexpr milliseconds ReapEvery{5};
constexpr mode_t LogMode = 0644;
constexpr int Samples = 10;
constexpr milliseconds SampleEvery{20};

std::string ReadAll(const std::string& path)
{
    std::ostringstream text;
    text << std::ifstream(path, std::ios::binary).rdbuf();
    return text.str();
}

std::string OfProcess(pid_t pid, const std::string& file)
{
    return ReadAll("/proc/" + std::to_string(pid) + "/" + file);
}

// The value of a field in /proc/PID/status.
std::string StatusField(pid_t pid, const std::string& name)
{
    const std::string status = OfProcess(pid, "status");
    const std::size_t at = status.find("\n" + name + ":\t");
    if (at == std::string::npos) return {};
    const std::size_t begin = at + name.size() + 3;
    return status.substr(begin, status.find('\n', begin) - begin);
}

int CountOpen(pid_t pid)
{
    std::error_code ignored;
    const std::filesystem::directory_iterator open("/proc/" + std::to_string(pid) + "/fd", ignored);
    return static_cast<int>(std::distance(begin(open), end(open)));
}

// Runs in the new process, which may only make system calls.
[[noreturn]] void BecomeProgram(char* const* words, int in, int out, int log)
{
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);
    ::dup2(in, STDIN_FILENO);
    ::dup2(out, STDOUT_FILENO);
    ::dup2(log, STDERR_FILENO);
    ::execv(words[0], words);
    ::_exit(127);
}

}  // namespace

Reaper::Reaper()
{
    ::prctl(PR_SET_CHILD_SUBREAPER, 1);
    thread_ = std::thread([this] { Collect(); });
}

Reaper::~Reaper()
{
    {
        const std::lock_guard<std::mutex> lock(mutex_);
        isStopping_ = true;
    }
    thread_.join();
}

void Reaper::Collect()
{
    while (true) {
        {
            const std::lock_guard<std::mutex> lock(mutex_);
            if (isStopping_) return;
            int status = 0;
            for (pid_t pid = ::waitpid(-1, &status, WNOHANG); pid > 0;
                 pid = ::waitpid(-1, &status, WNOHANG)) {
                ends_[pid] = status;
            }
        }
        std::this_thread::sleep_for(ReapEvery);
    }
}

std::optional<int> Reaper::EndOf(pid_t pid)
{
    const std::lock_guard<std::mutex> lock(mutex_);
    const auto found = ends_.find(pid);
    if (found == ends_.end()) return std::nullopt;
    return found->second;
}

std::optional<int> Reaper::AwaitEnd(pid_t pid, milliseconds patience)
{
    const auto deadline = Clock::now() + patience;
    std::optional<int> status = EndOf(pid);
    while (!status && Clock::now() < deadline) {
        std::this_thread::sleep_for(ReapEvery);
        status = EndOf(pid);
    }
    return status;
}

std::string DescribeEnd(int status)
{
    return WIFEXITED(status) ? "exit code " + std::to_string(WEXITSTATUS(status))
                             : "signal " + std::to_string(WTERMSIG(status));
}

pid_t StartProgram(const std::vector<std::string>& words, const std::string& logFile,
                   Pipes& ret_pipes)
{
    std::array<int, 2> toIn{};
    std::array<int, 2> fromOut{};
    const int log = ::open(logFile.c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, LogMode);
    if (log < 0 || ::pipe2(toIn.data(), O_CLOEXEC) < 0 || ::pipe2(fromOut.data(), O_CLOEXEC) < 0) {
        std::abort();
    }
    std::vector<char*> arguments;
    arguments.reserve(words.size() + 1);
    for (const std::string& word : words) arguments.push_back(const_cast<char*>(word.c_str()));
    arguments.push_back(nullptr);

    const pid_t pid = ::fork();
    if (pid < 0) std::abort();
    if (pid == 0) BecomeProgram(arguments.data(), toIn[0], fromOut[1], log);
    ::close(toIn[0]);
    ::close(fromOut[1]);
    ::close(log);
    ret_pipes = {toIn[1], fromOut[0]};
    return pid;
}

std::string CommandOf(pid_t pid)
{
    std::string words = OfProcess(pid, "cmdline");
    std::replace(words.begin(), words.end(), '\0', ' ');
    return words;
}

std::string Describe(pid_t pid)
{
    return "process " + std::to_string(pid) + " [" + CommandOf(pid) + "] state [" +
           StatusField(pid, "State") + "] in [" + OfProcess(pid, "wchan") + "]";
}

std::vector<pid_t> ChildrenOf(pid_t pid)
{
    std::vector<pid_t> children;
    std::error_code ignored;
    for (const auto& entry : std::filesystem::directory_iterator("/proc", ignored)) {
        const pid_t child = std::atoi(entry.path().filename().c_str());
        if (child > 0 && StatusField(child, "PPid") == std::to_string(pid)) {
            children.push_back(child);
        }
    }
    return children;
}

Usage UsageOf(const std::string& name, pid_t pid)
{
    Usage usage{name, pid, std::atol(StatusField(pid, "RssAnon").c_str()), CountOpen(pid)};
    for (int sample = 1; sample < Samples; ++sample) {
        std::this_thread::sleep_for(SampleEvery);
        usage.descriptors = std::min(usage.descriptors, CountOpen(pid));
    }
    return usage;
}

}  // namespace Soak
