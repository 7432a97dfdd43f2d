// Waiting for the ends of child processes.
#ifndef ORVADRCORE_TESTS_REAP_H
#define ORVADRCORE_TESTS_REAP_H

#include <sys/types.h>

// How a process ended, from what waitpid() reports: the exit code, or 128 plus the number of the
// signal.
int ExitCodeOf(int status);

// Waits for the end of a child, of any with -1. Its exit code as above; -1 without such a child.
int Reap(pid_t pid);

// Waits until a child has ended, and leaves it a zombie.
void AwaitZombie(pid_t pid);

// Waits for the ends of all children. The test fails when one is still there after a minute. A
// subreaper has the children of its dead descendants, too.
void ReapAll();

#endif
