// Starts programs, waits for their ends, and inspects them through /proc.
#ifndef ORVADRCORE_TESTS_SOAK_PROCESS_H
#define ORVADRCORE_TESTS_SOAK_PROCESS_H

#include <sys/types.h>

#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "plan.h"

namespace Soak {

// Reaps all children, and all processes that became children because their parent was killed: a
// zombie could be taken for a living process.
class Reaper {
  public:
    Reaper();
    Reaper(const Reaper&) = delete;
    Reaper& operator=(const Reaper&) = delete;
    ~Reaper();

    // The process's wait status; none while it lives.
    std::optional<int> EndOf(pid_t pid);

    // Waits for it. None if the process still lives after `patience`.
    std::optional<int> AwaitEnd(pid_t pid, milliseconds patience);

  private:
    void Collect();

    std::mutex mutex_;
    std::map<pid_t, int> ends_;
    bool isStopping_ = false;
    std::thread thread_;
};

// "exit code 1" or "signal 9".
std::string DescribeEnd(int status);

// Our ends of a program's standard input and output.
struct Pipes {
    int in = -1;
    int out = -1;
};

// Starts the program whose path is the first word. Its standard error is appended to `logFile`. It
// is killed when the calling thread ends.
pid_t StartProgram(const std::vector<std::string>& words, const std::string& logFile,
                   Pipes& ret_pipes);

// A process's id, command line, state and kernel function, for messages.
std::string Describe(pid_t pid);

std::string CommandOf(pid_t pid);
std::vector<pid_t> ChildrenOf(pid_t pid);

// The resources of a process.
struct Usage {
    std::string name;
    pid_t pid = -1;
    long kiBytes = 0;  // of private memory
    int descriptors = 0;
};
// Takes several samples and keeps the lowest number of descriptors, because the service closes a
// connection a moment after the client has its reply.
Usage UsageOf(const std::string& name, pid_t pid);

}  // namespace Soak

#endif
