#include "company.h"

#include <netinet/in.h>
#include <poll.h>
#include <signal.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <thread>
#include <utility>

#include "support/processes/reap.h"

namespace Soak {

namespace {

constexpr milliseconds StartAgain{50};

// A free port for all services of the run. Each must be able to reuse it after the one before.
int FreePort()
{
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    socklen_t size = sizeof address;
    auto* any = reinterpret_cast<sockaddr*>(&address);
    const int fd = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const bool isFound = ::bind(fd, any, size) == 0 && ::getsockname(fd, any, &size) == 0;
    ::close(fd);
    return isFound ? ntohs(address.sin_port) : 0;
}

// Waits until the service says that it listens. False when it ends instead.
bool AwaitListening(Pipes pipes, milliseconds patience)
{
    std::array<char, 256> line{};
    pollfd waiting{pipes.out, POLLIN, 0};
    const bool isListening = ::poll(&waiting, 1, static_cast<int>(patience.count())) == 1 &&
                             ::read(pipes.out, line.data(), line.size()) > 0;
    ::close(pipes.in);
    ::close(pipes.out);
    return isListening;
}

}  // namespace

Member::Member(std::string called, Program started, const Bounds& limits, Reaper& reaping,
               Findings& where)
    : name_(std::move(called)),
      program_(std::move(started)),
      bounds_(limits),
      reaper_(reaping),
      findings_(where)
{
}

void Member::Start()
{
    const auto begin = Clock::now();
    isKilled_ = false;
    bool isWelcome = false;
    while (!isWelcome && Clock::now() - begin < bounds_.start) {
        Pipes pipes;
        pid_ = StartProgram(program_.words, program_.logFile, pipes);
        isWelcome = program_.welcome(pipes);
        if (!isWelcome) std::this_thread::sleep_for(StartAgain);
    }
    if (!isWelcome) findings_.Add(Promise::Ends, name_ + " cannot be started again");
    longestStart_ =
        std::max(longestStart_, std::chrono::duration_cast<milliseconds>(Clock::now() - begin));
}

void Member::Kill()
{
    isKilled_ = true;
    ++kills_;
    ::kill(pid_, SIGKILL);
}

void Member::Tend()
{
    const auto end = reaper_.EndOf(pid_);
    if (!end) return;
    if (!isKilled_) findings_.Add(Promise::Ends, name_ + " ended by itself: " + DescribeEnd(*end));
    Start();
}

void Member::End() const
{
    program_.tellToEnd(pid_);
    const auto end = reaper_.AwaitEnd(pid_, bounds_.end);
    if (!end) {
        findings_.Add(Promise::Ends, name_ + " does not end: " + Describe(pid_));
        ::kill(pid_, SIGKILL);
    } else if (ExitCodeOf(*end) != 0) {
        findings_.Add(Promise::Ends, name_ + " ended with " + DescribeEnd(*end));
    }
}

Company::Company(const Plan& plan, Reaper& reaping, Findings& where)
    : reaper_(reaping), findings_(where), port_(FreePort())
{
    const std::vector<std::string> settings = {
        "--db", plan.Database(), "--status-dir", plan.StatusDirectory(), "--status-timeout", "0"};
    const auto withSettings = [&](std::vector<std::string> words) {
        words.insert(words.end(), settings.begin(), settings.end());
        return words;
    };
    const std::string address = "127.0.0.1:" + std::to_string(port_);
    const auto await = [&plan](Pipes pipes) { return AwaitListening(pipes, plan.bounds.start); };
    const auto terminate = [](pid_t pid) { ::kill(pid, SIGTERM); };
    members_.push_back(std::make_unique<Member>(
        "node_service",
        Member::Program{withSettings({NODE_SERVICE_PROGRAM, "--verbose", "--listen", address}),
                        plan.LogFile("node_service"), await, terminate},
        plan.bounds, reaper_, findings_));
    for (int index = 1; index <= Registries; ++index) {
        AddLineProgram(plan, "node_registry " + std::to_string(index),
                       withSettings({NODE_REGISTRY_PROGRAM}));
    }
    AddLineProgram(plan, "neighbour",
                   {"/proc/self/exe", "--neighbour", plan.Database(), plan.StatusDirectory()});
}

// Adds a program that ends with its input.
void Company::AddLineProgram(const Plan& plan, const std::string& name,
                             std::vector<std::string> words)
{
    channels_.push_back(std::make_unique<LineChannel>(name, findings_));
    LineChannel* channel = channels_.back().get();
    const auto give = [channel](Pipes pipes) {
        channel->Give(pipes);
        return true;
    };
    const auto close = [channel](pid_t /*pid*/) { channel->Close(); };
    members_.push_back(std::make_unique<Member>(
        name, Member::Program{std::move(words), plan.LogFile(name), give, close}, plan.bounds,
        reaper_, findings_));
}

void Company::Start()
{
    for (const auto& member : members_) member->Start();
}

void Company::Tend()
{
    for (const auto& member : members_) member->Tend();
}

void Company::End()
{
    for (const auto& member : members_) member->End();
}

}  // namespace Soak
