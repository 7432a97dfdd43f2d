// Locks of the C and C++ libraries, and forks.
//
// A lock that another thread holds at the moment of a fork stays locked in the child for ever: the
// thread that would unlock it does not exist there. glibc takes care of its allocator and its
// streams, but not of the locks inside syslog(), time zones and error texts. The C++ library does not
// take care of the lock that copies of std::locale take.
#ifndef ORVACORE_LIBRARY_LOCKS_H
#define ORVACORE_LIBRARY_LOCKS_H

// Takes each of these locks and frees it again. Waits for other threads that hold one.
void TakeLibraryLocks();

// The same in a process that was just forked and has a single thread. If a lock cannot be taken, calls
// `whenStuck` from a signal handler after a little more than a millisecond; it must not return.
// Restores all signal settings at the end.
void TakeLibraryLocksOr(void (*whenStuck)());

#endif
