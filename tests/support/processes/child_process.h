// A second process for tests in which processes meet. It runs a function and says with its exit
// code whether all was well; what goes on inside is told and awaited through pipes, never by
// sleeping.
//
//     ChildProcess holder([&](ChildProcess::Link& link) {
//         TakeTheLock();
//         link.Tell();       // the lock is held
//         link.Await();      // until the test has seen enough
//     });
//     holder.Await();
//     ...
//     holder.Tell();
//     EXPECT_EQ(holder.Join(), 0);
//
// Every wait ends after a deadline: the child is killed and the test fails.
#ifndef ORVADRCORE_TESTS_CHILD_PROCESS_H
#define ORVADRCORE_TESTS_CHILD_PROCESS_H

#include <sys/types.h>

#include <functional>

class ChildProcess {
  public:
    // One side of the two pipes between test and child.
    class Link {
      public:
        Link(int readEnd, int writeEnd) : in(readEnd), out(writeEnd) {}

        // Wakes the other side, once for each call.
        void Tell() const;

        // Waits until the other side has told. False when it is gone or the deadline has passed.
        bool Await() const;

        void Close();

      private:
        int in;
        int out;
    };

    // Starts a process that runs `body` and ends, with code 0, or 1 when `body` throws. Nothing of
    // the test's own exit handlers or destructors runs in it.
    explicit ChildProcess(const std::function<void(Link&)>& body);
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;
    ~ChildProcess();  // kills a child that was not joined

    void Tell() const { link.Tell(); }
    bool Await() const { return link.Await(); }
    pid_t Pid() const { return pid; }

    // Sends a signal.
    void Kill(int signal) const;

    // Waits for the end. The exit code; 128 plus the number of the signal that ended it.
    int Join();

  private:
    pid_t pid = -1;
    Link link{-1, -1};
};

#endif
