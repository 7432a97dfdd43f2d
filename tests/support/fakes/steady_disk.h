// A disk that other programs on the machine cannot slow down, for tests of how long something waits
// for something else: a directory in memory, where the system has such a place. While the object
// lives, here or in a process that this one has forked, flushing any file takes a fixed time and does
// nothing else.
#ifndef ORVADRCORE_TESTS_STEADY_DISK_H
#define ORVADRCORE_TESTS_STEADY_DISK_H

#include <string>

#include "support/fixtures/temp_dir.h"

class SteadyDisk {
  public:
    SteadyDisk();
    SteadyDisk(const SteadyDisk&) = delete;
    SteadyDisk& operator=(const SteadyDisk&) = delete;
    ~SteadyDisk();

    std::string File(const std::string& name) const { return dir.File(name); }

  private:
    const TempDir dir;
};

#endif
