// What /proc says about processes.
#ifndef ORVADRCORE_SRC_BASE_PROCESS_STATUS_H
#define ORVADRCORE_SRC_BASE_PROCESS_STATUS_H

#include <sys/types.h>

#include <optional>

namespace OrvaDRCore {

struct ProcessStatus {
    char state;                // of the first thread: 'R', 'S', ..., 'Z' when that has ended
    long threads;              // 1 for a zombie; more if only the first thread has ended
    unsigned long long start;  // in clock ticks since boot
};

// None if there is no such process, or if /proc does not show it.
std::optional<ProcessStatus> ReadProcessStatus(pid_t pid);

// Whether a process of any user is alive; unless `start` is 0, only if it was started then. Zombies
// and ids of threads do not count. A process that /proc does not show counts, whenever it started.
bool IsProcessAlive(pid_t pid, unsigned long long start = 0);

}  // namespace OrvaDRCore

#endif
