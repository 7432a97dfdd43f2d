// A process that is killed wherever it stands.
#ifndef ORVADRCORE_TESTS_KILLS_H
#define ORVADRCORE_TESTS_KILLS_H

#include <functional>

// What is done once, and around it.
struct Scene {
    std::function<void()> prepare;  // before each process
    std::function<void()> body;     // in the process
    std::function<void()> inspect;  // behind each end, when all that the process forked has ended
};

// Plays the scene again and again and kills the process before one of its system calls each time,
// the first, the second and so on, until it gets to its end; likewise each process that it forks,
// or that those fork, while the others go on. Whoever comes next must not have to wait. Ends at the
// first check that fails. Reports the number of kills.
void KillEverywhere(const Scene& scene);

#endif
