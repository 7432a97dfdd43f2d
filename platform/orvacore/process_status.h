// What /proc says of a process.
#ifndef ORVACORE_PROCESS_STATUS_H
#define ORVACORE_PROCESS_STATUS_H

#include <sys/types.h>

#include <optional>

struct ProcessStatus {
    char state;                // of its first thread: 'R', 'S', ..., 'Z' when that has ended
    long threads;              // 1 for a zombie, more when only the first thread has ended
    unsigned long long start;  // in clock ticks since boot
};

// None when there is no such process, or when it may not be looked at.
std::optional<ProcessStatus> ReadProcessStatus(pid_t pid);

#endif
