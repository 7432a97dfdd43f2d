// Named locks: exclusive, shared, with retries, across a fork and between threads. Needs root. A lock in
// a directory of its own, which does not.
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <iostream>
#include <string>
#include <thread>

#include <orvadrcore/file_lock.h>

using OrvaDRCore::FileLock;
using OrvaDRCore::FileLockState;

namespace {

// [alone]
bool ChangeRegistry(const std::string& name)
{
    FileLock lock(name);
    if (!lock.lock(LOCK_EX | LOCK_NB, 5)) return false;  // six attempts, a second apart
    // Only one process at a time gets here.
    std::cout << "changed\n";
    return true;  // the lock object's destructor frees the lock
}
// [/alone]

// [own]
// Any user can call this with a directory that it may write to.
bool ChangeNotes(const std::string& dir)
{
    FileLock lock("notes", dir);
    switch (lock.acquire(LOCK_EX, std::chrono::milliseconds(500))) {
        case FileLockState::Taken: break;
        case FileLockState::Held: std::cout << "somebody else changes them\n"; return false;
        case FileLockState::Failed: return false;  // the log says why
    }
    std::cout << "notes changed\n";
    return true;
}
// [/own]

bool Share(const std::string& name)
{
    // [shared]
    FileLock reader(name);
    FileLock otherReader(name);
    FileLock writer(name);
    std::cout << "reader:       " << reader.lock(LOCK_SH | LOCK_NB, 0) << '\n';
    std::cout << "other reader: " << otherReader.lock(LOCK_SH | LOCK_NB, 0) << '\n';
    std::cout << "writer:       " << writer.lock(LOCK_EX | LOCK_NB, 0) << '\n';
    reader.unlock();
    otherReader.unlock();
    std::cout << "writer again: " << writer.lock(LOCK_EX | LOCK_NB, 0) << '\n';
    // [/shared]
    return true;
}

// [fork]
// A child that needs the lock for itself takes it with an object of its own.
bool LockInChild(const std::string& name)
{
    const pid_t child = ::fork();
    if (child == 0) {
        FileLock lock(name);
        const bool locked = lock.lock(LOCK_EX | LOCK_NB, 0);
        ::_exit(locked ? EXIT_SUCCESS : EXIT_FAILURE);  // exiting frees the lock
    }
    int status = 0;
    return child > 0 && ::waitpid(child, &status, 0) == child && status == 0;
}
// [/fork]

// [threads]
// One object per thread. Objects exclude each other within one process, too.
int CountInTwoThreads(const std::string& name)
{
    int count = 0;
    std::atomic<bool> failed{false};
    const auto add = [&] {
        FileLock lock(name);
        for (int i = 0; i < 1000; ++i) {
            if (!lock.lock(LOCK_EX, 0)) failed = true;  // waits
            ++count;
            lock.unlock();
        }
    };
    std::thread one(add);
    std::thread other(add);
    one.join();
    other.join();
    return failed ? -1 : count;
}
// [/threads]

}  // namespace

int main()
{
    const std::string name = "guide." + std::to_string(::getpid());
    std::cout << std::boolalpha;
    bool done = ChangeRegistry(name) && ChangeNotes(std::filesystem::current_path() / "locks") &&
                Share(name) && LockInChild(name);
    std::cout << "counted: " << CountInTwoThreads(name) << '\n';

    FileLock mine(name);
    done = done && mine.lock(LOCK_EX, 0) && !LockInChild(name);
    // Safe only because nobody else uses this name: a lock file in use must stay.
    ::unlink(FileLock::getLockFilePath(name).c_str());
    return done ? EXIT_SUCCESS : EXIT_FAILURE;
}
