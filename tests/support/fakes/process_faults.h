// Replaces fork and time, as syscall_faults.h replaces the calls for files. While a ProcessFaults
// object lives, the functions that are set here are called instead of the system's, in this process
// and its children.
//
//     ProcessFaults faults;
//     faults.time = [] { return 1'700'000'000; };
#ifndef ORVADRCORE_TESTS_PROCESS_FAULTS_H
#define ORVADRCORE_TESTS_PROCESS_FAULTS_H

#include <sys/types.h>

#include <ctime>
#include <functional>

struct ProcessFaults {
    std::function<pid_t()> fork;
    std::function<std::time_t()> time;

    ProcessFaults();
    ProcessFaults(const ProcessFaults&) = delete;
    ProcessFaults& operator=(const ProcessFaults&) = delete;
    ~ProcessFaults();
};

// The real function.
pid_t RealFork();

#endif
