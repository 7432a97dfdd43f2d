// Answers of fork and of the clock that cannot be had at will, as syscall_faults.h gives them for
// files. While a ProcessFaults object lives, the functions that are set here answer in the system's
// place, in this process and in those that it forks; afterwards both are the real ones.
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

// The real function, for answers that begin with the system's own.
pid_t RealFork();

#endif
