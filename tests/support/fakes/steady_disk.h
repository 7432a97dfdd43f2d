// A disk that other programs on the machine cannot slow down, for tests that measure waiting times.
// It is a directory in memory, if the system has one. While the object lives, syncing any file
// takes a fixed time and does nothing else, in this process and its children.
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

    std::string File(const std::string& name) const { return dir_.File(name); }

  private:
    const TempDir dir_;
};

#endif
