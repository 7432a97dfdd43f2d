// What /proc says of processes. Used by the library and by the platform stand-ins.
#ifndef ORVADRCORE_SRC_BASE_PROCESS_STATUS_H
#define ORVADRCORE_SRC_BASE_PROCESS_STATUS_H

#include <sys/types.h>

#include <optional>

namespace OrvaDRCore {

struct ProcessStatus {
    char state;                // of its first thread: 'R', 'S', ..., 'Z' when that has ended
    long threads;              // 1 for a zombie, more when only the first thread has ended
    unsigned long long start;  // in clock ticks since boot
};

// None when there is no such process, or when it may not be looked at.
std::optional<ProcessStatus> ReadProcessStatus(pid_t pid);

// Whether a process lives, whoever its user is; with `start` not 0, only if it was started then.
// Neither a zombie nor a single thread of a process counts. A process that /proc does not show is
// taken for the one that is meant.
bool IsProcessAlive(pid_t pid, unsigned long long start = 0);

}  // namespace OrvaDRCore

#endif
