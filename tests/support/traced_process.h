// A child that is led by the hand: it runs from one system call to the next, or up to the start of
// another program, and can be killed at exactly that point.
//
//     TracedProcess updater([&] { cache.Read(); });
//     while (updater.Step()) ...
#ifndef ORVADRCORE_TESTS_TRACED_PROCESS_H
#define ORVADRCORE_TESTS_TRACED_PROCESS_H

#include <sys/types.h>

#include <functional>

class TracedProcess {
  public:
    // Forks a child that stops before `body` and ends behind it with code 0, or 1 when it throws.
    explicit TracedProcess(const std::function<void()>& body);
    TracedProcess(const TracedProcess&) = delete;
    TracedProcess& operator=(const TracedProcess&) = delete;
    ~TracedProcess();  // kills what is left of it

    // Lets the child run to the next beginning or end of a system call. False when it has ended.
    bool Step();

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
