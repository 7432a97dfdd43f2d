// Every call fails once. A trial prepares what an operation needs, runs it with a fault set, looks
// at what the fault has left behind and runs it again without. It is repeated for each system call
// and each allocation that the operation makes, in this process or in those that it forks, until
// there is none left to fail:
//
//     EveryCallFails("toFile", [] {
//         const TempDir dir;
//         const Outcome outcome = WithFault([&] { return toFile(Json::Value(1), path); });
//         EXPECT_EQ(ReadFile(path), outcome.succeeded ? "1" : "(cannot be read)");
//         EXPECT_TRUE(toFile(Json::Value(1), path));
//     });
//
// What holds for all operations is looked at here: no crash, no hang, no exception but those of
// memory running out, no child that goes on with its parent's work, no descriptor, no memory and no
// process left behind. Pauses and sleeps are passed over, and what belongs below /tmp/.orvadr_lock
// lies in a directory of the test's own.
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
    Stat,  // lstat, too
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
    AllMemory,  // an allocation and all behind it
    // Of SQLite's way to its files: see faulty_vfs.h.
    DbOpen,
    DbAccess,
    DbDelete,
    DbRead,
    DbWrite,
    DbSync,
    DbTruncate,
    DbFileSize,
    DbLock,
    DbLookAtLock,
    DbSharedMemory,
    DbSharedLock,
    None
};

// How an operation with a fault went.
struct Outcome {
    bool succeeded;  // it answered true
    bool threw;      // it ran out of memory
    int lines;       // that it wrote

    // A failure has to be told in the log.
    void ExpectSpoken() const { EXPECT_TRUE(succeeded || threw || lines > 0) << "nothing is told"; }
};

// Runs an operation with the fault set, and waits for the processes that it leaves behind.
Outcome WithFault(const std::function<bool()>& operation);

// Counts a call. Answers the error that it is to fail with; 0 for none.
int Strike(Call call);

// Whether it is these calls that fail in this trial.
bool IsFailing(Call call);

// Where the file of a name below /tmp/.orvadr_lock lies, in a directory that is there.
std::string PlaceOfLock(const std::string& path);

// Repeats a trial for all system calls and allocations, or for all calls of SQLite's.
void EveryCallFails(const std::string& operation, const std::function<void()>& trial);
void EveryDatabaseCallFails(const std::string& operation, const std::function<void()>& trial);

#endif
