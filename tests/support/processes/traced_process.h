// A child process under ptrace. It runs to its next system call, or until it starts another
// program, and it or a process that it forks can be killed at exactly that point.
//
//     TracedProcess updater([&] { cache.Read(); });
//     while (updater.Step()) ...
#ifndef ORVADRCORE_TESTS_TRACED_PROCESS_H
#define ORVADRCORE_TESTS_TRACED_PROCESS_H

#include <sys/types.h>

#include <array>
#include <cstdint>
#include <functional>
#include <string>

// A system call that a child is about to make or has just made.
struct SystemCall {
    bool hasEnded;
    std::uint64_t number;                    // only before the call
    std::array<std::uint64_t, 6> arguments;  // only before the call
    std::int64_t result;                     // only after the call; a negative errno on failure
};

class TracedProcess {
  public:
    // Forks a child that stops before `body`. After it the child exits with 0, or 1 when it throws.
    explicit TracedProcess(const std::function<void()>& body);
    TracedProcess(const TracedProcess&) = delete;
    TracedProcess& operator=(const TracedProcess&) = delete;
    ~TracedProcess();  // kills the child if it still runs

    // Lets the child run to the next start or end of a system call. False when it has ended.
    bool Step();

    // The system call at which Step() has stopped it.
    SystemCall Call() const;

    // Bytes of the child's memory, or the text up to a zero byte.
    std::string Memory(std::uint64_t address, std::size_t size) const;
    std::string Text(std::uint64_t address) const;

    // Lets the child and all processes forked from it run to their ends, but kills one of them
    // before its `call`-th system call, counted from 1. The child is `member` 0, the others follow
    // in the order of the forks. False when that process does not exist or ended before that call.
    bool KillBefore(int member, int call);

    // Lets the child run until a program that it starts has just been loaded. Returns the id of the
    // program's process, which is stopped; -1 when none is started.
    pid_t RunToStartedProgram();

    // Lets the program go on that RunToStartedProgram() has stopped.
    static void Release(pid_t program);

    // Kills the child at this point and waits for its end.
    void Kill();

    // After its end: the exit code, or 128 plus the number of the signal.
    int ExitCode() const;

  private:
    bool Await(pid_t whom);

    pid_t pid_ = -1;  // -1 after its end
    int status_ = 0;  // from the last waitpid()
};

#endif
