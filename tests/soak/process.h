// The processes of a soak: programs that are started, killed, started again, and looked at through
// /proc.
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

// Fetches the ends of all processes that were started, and of those that came to us because their
// parent was killed: no zombie is left to be taken for a living process.
class Reaper {
  public:
    Reaper();
    Reaper(const Reaper&) = delete;
    Reaper& operator=(const Reaper&) = delete;
    ~Reaper();

    // How a process ended, as waitpid() tells it; none while it lives.
    std::optional<int> EndOf(pid_t pid);

    // Waits for that. None when it still lives when the time is up.
    std::optional<int> AwaitEnd(pid_t pid, milliseconds patience);

  private:
    void Collect();

    std::mutex mutex;
    std::map<pid_t, int> ends;
    bool isStopping = false;
    std::thread thread;
};

// "exit code 1" or "signal 9".
std::string DescribeEnd(int status);

// The ends of the pipes to a program's standard input and output.
struct Pipes {
    int in = -1;
    int out = -1;
};

// Starts a program whose path is the first word. Its errors go to the end of `logFile`. It is killed
// when the calling thread ends.
pid_t StartProgram(const std::vector<std::string>& words, const std::string& logFile,
                   Pipes& ret_pipes);

// The command line, state and place in the kernel of a process, for a message.
std::string Describe(pid_t pid);

std::string CommandOf(pid_t pid);
std::vector<pid_t> ChildrenOf(pid_t pid);

// What a process has in memory and open.
struct Usage {
    std::string name;
    pid_t pid = -1;
    long kiBytes = 0;  // of memory that is its own
    int descriptors = 0;
};
// When it is at rest: of several looks the one with the fewest descriptors counts, since a connection is
// closed a moment after the client has its reply.
Usage UsageOf(const std::string& name, pid_t pid);

}  // namespace Soak

#endif
