// Kills a process at every point where it could be killed.
#ifndef ORVADRCORE_TESTS_KILLS_H
#define ORVADRCORE_TESTS_KILLS_H

#include <functional>

struct Scene {
    std::function<void()> prepare;  // before each run
    std::function<void()> body;     // in the process that is killed
    std::function<void()> inspect;  // after each run, when all processes that it forked have ended
};

// Runs the scene many times. Kills the process before its first system call, then before its second
// and so on, until one run reaches its end. Then does the same with each process that it forks,
// directly or indirectly, while the others go on. `inspect` must not have to sleep. Stops at the
// first failed check. Reports the number of kills.
void KillEverywhere(const Scene& scene);

#endif
