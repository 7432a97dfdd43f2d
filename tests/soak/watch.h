// Watches during a soak: whether the status is refreshed, clients get answers and processes grow.
#ifndef ORVADRCORE_TESTS_SOAK_WATCH_H
#define ORVADRCORE_TESTS_SOAK_WATCH_H

#include <sys/types.h>

#include <atomic>
#include <ctime>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "company.h"
#include "findings.h"
#include "plan.h"
#include "process.h"

namespace Soak {

// Tells a file from the one that replaced it.
struct Edition {
    ino_t inode = 0;
    std::time_t seconds = 0;
    long nanoseconds = 0;

    bool operator!=(const Edition& other) const
    {
        return inode != other.inode || seconds != other.seconds || nanoseconds != other.nanoseconds;
    }
};

// Counts refreshes: each one replaces the status file. Reports when none happens although it could,
// and describes the process that is marked as refreshing.
class RefreshWatch {
  public:
    RefreshWatch(const Plan& plan, std::function<bool()> isDiskFull, Findings& findings);
    RefreshWatch(const RefreshWatch&) = delete;
    RefreshWatch& operator=(const RefreshWatch&) = delete;
    ~RefreshWatch() { Stop(); }

    void Stop();

    int Refreshes() const { return refreshes_; }
    milliseconds LongestGap() const { return longestGap_; }

  private:
    void Watch(Edition last);
    void Report(pid_t updater);

    const Plan& plan_;
    std::function<bool()> isDiskFull_;
    Findings& findings_;
    std::atomic<int> refreshes_{0};
    milliseconds longestGap_{0};
    std::atomic<bool> isStopping_{false};
    std::thread thread_;
};

// Reads the neighbour's output: a line for each time it has read the status.
class NeighbourWatch {
  public:
    explicit NeighbourWatch(LineChannel& channel);
    NeighbourWatch(const NeighbourWatch&) = delete;
    NeighbourWatch& operator=(const NeighbourWatch&) = delete;
    ~NeighbourWatch() { Stop(); }

    void Stop();

    // For use after Stop().
    int Reads() const { return reads_; }
    int Failures() const { return failures_; }
    milliseconds LongestGap() const { return longestGap_; }

  private:
    void Watch(LineChannel& channel);

    int reads_ = 0;
    int failures_ = 0;
    milliseconds longestGap_{0};
    std::atomic<bool> isStopping_{false};
    std::thread thread_;
};

// Measures the service and the registries. The neighbour is never idle.
std::vector<Usage> UsagesOf(const Company& company);

// Reports processes that lived through both measurements and have grown.
void CompareUsages(const Plan& plan, const std::vector<Usage>& before,
                   const std::vector<Usage>& after, Findings& findings);

}  // namespace Soak

#endif
