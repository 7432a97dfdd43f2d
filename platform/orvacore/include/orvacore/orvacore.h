/// \file
/// Stand-in for the appliance's core library on Linux systems that lack it: the calls that the DR
/// library needs. Every call may be made from any thread unless it says otherwise; none throws,
/// unless memory runs out, none logs.
///
/// Programs are started without a shell and inherit descriptors 0, 1 and 2, and no others. Handled
/// signals and SIGCHLD have their default action in the program; ignored signals stay ignored.
///
/// A program is a child of the caller, who gets a SIGCHLD when it ends. Where the caller ignores
/// SIGCHLD, has a handler for it or has set SA_NOCLDWAIT, the result would be lost. The program is
/// then started by a process of ours, and the caller gets no SIGCHLD for it.
#ifndef ORVACORE_ORVACORE_H
#define ORVACORE_ORVACORE_H

#include <sys/types.h>

#include <cstdio>

// ------------------------------------------------------------------------------------ programs

/// Runs a program and waits for its end.
/// \param path  the program's file; it is also its first argument
/// \param argument1,argument2,argument3,argument4  further arguments; the first null one ends them
/// \return 0 when the program ended with code 0, its code when it ended with another. Otherwise -1
///         with errno set: EINTR when a signal ended the program, ECHILD when another thread has
///         fetched its result by waiting for all children, and else why it could not be started
int CoreLibExec(const char* path, const char* argument1, const char* argument2,
                const char* argument3, const char* argument4);

/// Starts a program and gives a stream to read its standard output from.
/// \param path  the program's file; it is also its first argument
/// \param mode  "r", the only way there is
/// \param ...   further arguments (`const char*`), ended by a null pointer, 15 at most
/// \return the stream, to be closed with CoreLibPclose(); null with errno set when the program
///         cannot be started or the mode is another
FILE* CoreLibPopen(const char* path, const char* mode, ...);

/// Closes a stream of CoreLibPopen() and waits for its program.
/// \return 0 when the program ended with code 0, otherwise -1, also where its result is not known
int CoreLibPclose(FILE* stream);

// ----------------------------------------------------------------------------- texts and files

/// Cuts characters off both ends of a text, in place.
/// \param text      the text; null is given back as it is
/// \param leading   the characters to cut at the beginning; null means white space
/// \param trailing  the characters to cut at the end; null means white space
/// \return `text`
char* CoreLibStrTrim(char* text, const char* leading, const char* trailing);

/// Whether a path names anything, symbolic links followed.
bool CoreLibFileExist(const char* path);

/// \return 1 when a path names a directory, symbolic links followed, otherwise 0
int CoreLibFileCheckDir(const char* path);

// ----------------------------------------------------------------------------------- processes

/// The flag of CoreLibProcForkEx() for a child that nobody waits for.
constexpr int CORELIB_FORK_DETACHED = 0x40;

/// Forks.
///
/// A detached child is no child of the caller: it needs no wait and never becomes the caller's
/// zombie, unless the caller is the one who adopts orphans, as process 1 is. It keeps working
/// directory, umask and signal handling. Those of its standard input, output and error that are
/// pipes or sockets become /dev/null, so that whoever reads the caller's output meets its end when
/// the caller ends.
///
/// A fork copies locks as they are: one that another thread holds at that moment stays locked in
/// the child. In a detached child the locks that syslog(), time zones, error texts and std::locale
/// take are free: an intermediate process tries them first, and where one is locked the caller
/// forks again. Usually that takes a millisecond. Where a thread holds such a lock for long, the
/// caller gives up after 500 attempts, or after five seconds and 50 attempts.
/// \param flags  CORELIB_FORK_DETACHED, or 0 for a plain fork
/// \return the child's process id in the caller, 0 in the child, -1 with errno set on failure;
///         EDEADLK when a lock was never free
pid_t CoreLibProcForkEx(int flags);

/// \return 1 when a process lives, whoever its user is, otherwise 0; neither a zombie nor a single
///         thread of a process is a process that lives
int CoreLibProcAlive(pid_t pid);

/// Writes the caller's process id into a file: the id in decimals on the first line, the process's
/// start time in clock ticks since boot on the second, by which a later process with the same id is
/// told apart. The file is replaced whole and may be read by everyone.
/// \return 0, or -1 with errno set
int CoreLibProcPidFileCreate(const char* path);

/// \return the process id in a file, also in one that holds nothing but the id; 0 when there is no
///         file, no id in it, or when the id now belongs to a process that was started later; 0
///         also when it cannot be read to its end, or is no regular file, which is not waited for
pid_t CoreLibReadPidFile(const char* path);

#endif
