#include "watch.h"

#include <sys/stat.h>

#include <algorithm>
#include <fstream>
#include <utility>

namespace Soak {

namespace {

constexpr milliseconds LookEvery{2};

Edition EditionOf(const std::string& path)
{
    struct stat status {};
    if (::stat(path.c_str(), &status) != 0) return {};
    return {status.st_ino, status.st_mtim.tv_sec, status.st_mtim.tv_nsec};
}

// The process in a pid file; 0 without one.
pid_t MarkedIn(const std::string& pidFile)
{
    pid_t pid = 0;
    std::ifstream(pidFile) >> pid;
    return pid;
}

}  // namespace

RefreshWatch::RefreshWatch(const Plan& thePlan, std::function<bool()> isFull, Findings& where)
    : plan_(thePlan), isDiskFull_(std::move(isFull)), findings_(where)
{
    // Taken before the thread starts: every later refresh counts.
    thread_ = std::thread([this, first = EditionOf(plan_.StatusFile())] { Watch(first); });
}

void RefreshWatch::Stop()
{
    isStopping_ = true;
    if (thread_.joinable()) thread_.join();
}

void RefreshWatch::Watch(Edition last)
{
    auto lastChange = Clock::now();
    auto lastReport = lastChange;
    pid_t reported = -1;  // report each process once
    while (!isStopping_) {
        std::this_thread::sleep_for(LookEvery);
        const auto now = Clock::now();
        const Edition edition = EditionOf(plan_.StatusFile());
        if (edition != last) ++refreshes_;
        if (edition != last || isDiskFull_()) lastChange = lastReport = now;
        last = edition;
        longestGap_ =
            std::max(longestGap_, std::chrono::duration_cast<milliseconds>(now - lastChange));
        if (now - lastReport > plan_.bounds.stale) {
            const pid_t updater = MarkedIn(plan_.StatusFile() + ".pid");
            if (updater != reported) Report(updater);
            reported = updater;
            lastReport = now;
        }
    }
}

void RefreshWatch::Report(pid_t updater)
{
    findings_.Add(Promise::Refreshes,
                  "the status has not been refreshed for " +
                      std::to_string(plan_.bounds.stale.count()) + " ms; " +
                      (updater == 0 ? std::string("no process is marked as refreshing")
                                    : "marked as refreshing: " + Describe(updater)));
}

NeighbourWatch::NeighbourWatch(LineChannel& channel)
{
    thread_ = std::thread([this, &channel] { Watch(channel); });
}

void NeighbourWatch::Stop()
{
    isStopping_ = true;
    if (thread_.joinable()) thread_.join();
}

void NeighbourWatch::Watch(LineChannel& channel)
{
    auto last = Clock::now();
    while (!isStopping_) {
        const std::optional<std::string> line = channel.ReadLine();
        if (!line) continue;
        const auto now = Clock::now();
        ++(*line == "read" ? reads_ : failures_);
        longestGap_ = std::max(longestGap_, std::chrono::duration_cast<milliseconds>(now - last));
        last = now;
    }
}

std::vector<Usage> UsagesOf(const Company& company)
{
    std::vector<Usage> usages = {UsageOf(company.Service().Name(), company.Service().Pid())};
    for (std::size_t index = 0; index < Registries; ++index) {
        const Member& registry = company.Registry(index);
        usages.push_back(UsageOf(registry.Name(), registry.Pid()));
    }
    return usages;
}

void CompareUsages(const Plan& plan, const std::vector<Usage>& before,
                   const std::vector<Usage>& after, Findings& findings)
{
    const auto check = [&](const Usage& usage, const char* what, long first, long last, long more) {
        if (last <= first + more) return;
        findings.Add(Promise::Growth, usage.name + " had " + std::to_string(first) + " " + what +
                                          ", and has " + std::to_string(last));
    };
    for (std::size_t index = 0; index < before.size(); ++index) {
        const Usage& first = before[index];
        const Usage& last = after[index];
        if (first.pid != last.pid) continue;
        check(last, "open descriptors", first.descriptors, last.descriptors,
              plan.bounds.descriptors);
        if (plan.length < LongEnoughForMemory) continue;
        check(last, "KiB of memory", first.kiBytes, last.kiBytes, plan.bounds.kiBytes);
    }
}

}  // namespace Soak
