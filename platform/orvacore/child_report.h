// A forked child's report to its parent: a few bytes through a pipe, in one write.
#ifndef ORVACORE_CHILD_REPORT_H
#define ORVACORE_CHILD_REPORT_H

#include <sys/types.h>

#include <cstddef>

// In the child.
void SendReport(int fd, const void* report, std::size_t size);

// In the parent: waits for the report. False, with `report` untouched, if the child has ended without
// one. Does not reap the child. Does not rely on the end of the pipe either: children that other
// threads have forked may hold the writing end, too.
bool ReceiveReport(int fd, pid_t child, void* report, std::size_t size);

#endif
