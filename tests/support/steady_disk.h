// A disk that other programs on the machine cannot slow down. While a SteadyDisk object lives, here or
// in a process that this one has forked, flushing a file takes a fixed time and does nothing else;
// afterwards it is what it always is. For tests of how long something waits for something else.
#ifndef ORVADRCORE_TESTS_STEADY_DISK_H
#define ORVADRCORE_TESTS_STEADY_DISK_H

class SteadyDisk {
  public:
    SteadyDisk();
    SteadyDisk(const SteadyDisk&) = delete;
    SteadyDisk& operator=(const SteadyDisk&) = delete;
    ~SteadyDisk();
};

#endif
