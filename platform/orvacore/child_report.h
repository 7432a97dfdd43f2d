// What a forked child reports to its parent: a few bytes through a pipe, in one piece.
#ifndef ORVACORE_CHILD_REPORT_H
#define ORVACORE_CHILD_REPORT_H

#include <sys/types.h>

#include <cstddef>

// In the child.
void SendReport(int fd, const void* report, std::size_t size);

// In the parent: waits for the report. False when the child has ended without one; `report` is
// untouched then. The child is left to be reaped. The end of the pipe is not what tells that it has
// ended: children of other threads may hold the writing end, too.
bool ReceiveReport(int fd, pid_t child, void* report, std::size_t size);

#endif
