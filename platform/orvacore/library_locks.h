// Locks of the C and C++ libraries that a fork copies as they are.
//
// A lock that another thread holds at the moment of a fork stays locked in the child for ever: the
// thread that would unlock it is not there. glibc takes care of its allocator and its streams. It
// does not take care of the locks below syslog(), time zones and error texts, and the C++ library
// does not take care of the lock that copies of std::locale take.
#ifndef ORVACORE_LIBRARY_LOCKS_H
#define ORVACORE_LIBRARY_LOCKS_H

// Takes each of these locks and unlocks it again. Waits for other threads that hold one.
void TakeLibraryLocks();

// The same in a process that was just forked and has a single thread. Where a lock cannot be had,
// `whenStuck` is called, from a signal handler, after a millisecond or a bit more; it must not
// return. Afterwards all signal settings are what they were.
void TakeLibraryLocksOr(void (*whenStuck)());

#endif
