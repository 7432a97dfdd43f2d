/// \file
/// Stand-in for the appliance's core library on Linux systems that lack it: the calls that the DR
/// library needs. Any thread may make them. None logs, and none throws unless memory runs out.
///
/// Programs are started without a shell and inherit descriptors 0, 1 and 2 only. In the program,
/// handled signals and SIGCHLD have their default action; ignored signals stay ignored.
///
/// A program is a child of the caller, who gets a SIGCHLD when it ends. If the caller ignores SIGCHLD,
/// handles it or has set SA_NOCLDWAIT, the result would be lost. An intermediate process then starts
/// the program, and the caller gets no SIGCHLD for it.
#ifndef ORVACORE_ORVACORE_H
#define ORVACORE_ORVACORE_H

#include <sys/types.h>

#include <cstdio>

// ------------------------------------------------------------------------------------ programs

/// Runs a program and waits for its end. The path is also its first argument; the first null argument
/// ends the others.
/// \return the program's exit code, or -1 with errno set: EINTR if a signal ended the program, ECHILD
///         if another thread got its result by waiting for all children, or why it did not start
int CoreLibExec(const char* path, const char* argument1, const char* argument2,
                const char* argument3, const char* argument4);

/// Starts a program and opens a stream that reads its standard output. The mode must be "r". Up to 15
/// further arguments (`const char*`) follow, then a null pointer.
/// \return the stream, to be closed with CoreLibPclose(), or null with errno set
FILE* CoreLibPopen(const char* path, const char* mode, ...);

/// Closes a stream of CoreLibPopen() and waits for its program.
/// \return 0 if the program ended with code 0, or -1, also if its result is not known
int CoreLibPclose(FILE* stream);

// ----------------------------------------------------------------------------- texts and files

/// Removes leading and trailing characters of two sets from a text, in place. A null set means white
/// space.
/// \return `text`, which may be null
char* CoreLibStrTrim(char* text, const char* leading, const char* trailing);

/// Whether a path names anything. Follows symbolic links.
bool CoreLibFileExist(const char* path);

/// \return 1 if a path names a directory, otherwise 0; follows symbolic links
int CoreLibFileCheckDir(const char* path);

// ----------------------------------------------------------------------------------- processes

/// The flag of CoreLibProcForkEx() for a child that nobody waits for; 0 is a plain fork.
constexpr int CORELIB_FORK_DETACHED = 0x40;

/// Forks.
///
/// With CORELIB_FORK_DETACHED the child is not the caller's: it needs no wait and never becomes the
/// caller's zombie, unless the caller adopts orphans, as process 1 does. It keeps working directory,
/// umask and signal handling. Its standard input, output and error become /dev/null if they are pipes
/// or sockets, so that a reader of the caller's output sees its end when the caller ends.
///
/// A fork copies locks as they are: one that another thread holds at that moment stays locked in
/// the child. In a detached child the locks of syslog(), time zones, error texts and std::locale are
/// free: an intermediate process tests them first, and if one is locked the caller forks again.
/// Usually that takes a millisecond. If a thread holds such a lock for long, the caller gives up
/// after 500 attempts, or after five seconds and 50 attempts.
/// \return the child's process id in the caller, 0 in the child, -1 with errno set on failure:
///         EDEADLK if a lock was never free
pid_t CoreLibProcForkEx(int flags);

/// \return 1 if a process of any user is alive, otherwise 0, also for zombies and ids of threads
int CoreLibProcAlive(pid_t pid);

/// Writes the caller's process id into a file: the id in decimals on the first line, and on the second
/// the start time in clock ticks since boot, which a later process with the same id does not have.
/// The file is replaced as a whole and everybody may read it.
/// \return 0, or -1 with errno set
int CoreLibProcPidFileCreate(const char* path);

/// \return the process id in a file, with or without a start time. 0 if there is no id, if it now
///         belongs to a later process, if the file is missing, cannot be read to its end or is no
///         regular file; a pipe is not waited for
pid_t CoreLibReadPidFile(const char* path);

#endif
