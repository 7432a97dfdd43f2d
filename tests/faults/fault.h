// Makes every call of an operation fail once. A trial prepares what the operation needs, runs it
// with a fault, checks what the fault has left behind, and runs it again without. It is repeated
// for each system call and each allocation of the operation, in this process and in those that it
// forks:
//
//     EveryCallFails("toFile", [] {
//         const TempDir dir;
//         const Outcome outcome = WithFault([&] { return toFile(Json::Value(1), path); });
//         EXPECT_EQ(ReadFile(path), outcome.succeeded ? "1" : "(cannot be read)");
//         EXPECT_TRUE(toFile(Json::Value(1), path));
//     });
//
// For all operations it checks: no crash, no hang, no exception except when memory runs out, no
// child that continues its parent's work, no leaked descriptor, memory or process. Pauses and
// sleeps take no time, and a directory of the test stands in for /tmp/.orvadr_lock.
#ifndef ORVADRCORE_TESTS_FAULT_H
#define ORVADRCORE_TESTS_FAULT_H

#include <gtest/gtest.h>

#include <functional>
#include <string>

// What can be made to fail.
enum class Call {
    Open,
    Read,
    Write,
    Fchmod,
    Fsync,
    Rename,
    Unlink,
    Close,
    Stat,  // and lstat
    Fstat,
    Flock,
    Fcntl,
    Fork,
    Clone,
    Pipe,
    Dup,
    Waitpid,
    Spawn,
    Getrandom,
    Fdopen,
    Memory,     // one allocation
    AllMemory,  // an allocation and all after it
    // SQLite's access to its files: see faulty_vfs.h.
    DbOpen,
    DbAccess,
    DbDelete,
    DbRead,
    DbWrite,
    DbSync,
    DbTruncate,
    DbFileSize,
    DbLock,
    DbCheckLock,
    DbSharedMemory,
    DbSharedLock,
    None
};

// The result of an operation with a fault.
struct Outcome {
    bool succeeded;  // it returned true
    bool threw;      // it ran out of memory
    int lines;       // written to the log

    // A failure must be logged.
    void ExpectLogged() const
    {
        EXPECT_TRUE(succeeded || threw || lines > 0) << "nothing is logged";
    }
};

// Runs an operation with the fault, and waits for the processes that it started.
Outcome WithFault(const std::function<bool()>& operation);

// Counts a call. Returns the error with which it must fail, or 0.
int Strike(Call call);

// Whether this trial makes one of these calls fail.
bool IsFailing(Call call);

// Where the test keeps a file that belongs below /tmp/.orvadr_lock. Its directory exists.
std::string PlaceOfLock(const std::string& path);

// Repeats a trial for all system calls and allocations, or for all of SQLite's file accesses.
void EveryCallFails(const std::string& operation, const std::function<void()>& trial);
void EveryDatabaseCallFails(const std::string& operation, const std::function<void()>& trial);

#endif
