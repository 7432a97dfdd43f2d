// A child that is led by the hand: it runs from one system call to the next, or up to the start of
// another program, and can be killed at exactly that point, or one that it forks.
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

// A system call at whose beginning or end a child stands.
struct SystemCall {
    bool hasEnded;
    std::uint64_t number;                    // these two at the beginning only
    std::array<std::uint64_t, 6> arguments;  //
    std::int64_t result;                     // at the end only; an error's number, negative
};

class TracedProcess {
  public:
    // Forks a child that stops before `body` and ends behind it with code 0, or 1 when it throws.
    explicit TracedProcess(const std::function<void()>& body);
    TracedProcess(const TracedProcess&) = delete;
    TracedProcess& operator=(const TracedProcess&) = delete;
    ~TracedProcess();  // kills what is left of it

    // Lets the child run to the next beginning or end of a system call. False when it has ended.
    bool Step();

    // Where Step() has let it run to.
    SystemCall Call() const;

    // What stands in the child's memory: so many bytes, or a text with a zero byte behind it.
    std::string Memory(std::uint64_t address, std::size_t size) const;
    std::string Text(std::uint64_t address) const;

    // Lets the child and all that comes of its forks run to their ends, but kills one of them
    // before its `call`-th system call, counted from 1. The child is `member` 0, the others follow
    // in the order of the forks. False when that one has ended before, or there is none.
    bool KillBefore(int member, int call);

    // Lets the child run until a program that it starts has just become that program, and stops the
    // program. The program's process id; -1 when none is started.
    pid_t RunToStartedProgram();

    // Lets a program that RunToStartedProgram() has stopped go on.
    static void Release(pid_t program);

    // Kills the child where it stands and waits for its end.
    void Kill();

    // Of a child that has ended: its exit code, or 128 plus the number of the signal.
    int ExitCode() const;

  private:
    bool Await(pid_t whom);

    pid_t pid = -1;  // -1 when it has ended
    int status = 0;  // what the last wait said
};

#endif
