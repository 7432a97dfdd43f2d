// A child process that runs a function. Its exit code says whether all went well. Test and child
// tell each other through pipes how far they are; neither sleeps.
//
//     ChildProcess holder([&](ChildProcess::Link& link) {
//         TakeTheLock();
//         link.Tell();       // the lock is held
//         link.Await();      // until the test is done
//     });
//     holder.Await();
//     ...
//     holder.Tell();
//     EXPECT_EQ(holder.Join(), 0);
//
// Every wait has a deadline: then the child is killed and the test fails.
#ifndef ORVADRCORE_TESTS_CHILD_PROCESS_H
#define ORVADRCORE_TESTS_CHILD_PROCESS_H

#include <sys/types.h>

#include <functional>

class ChildProcess {
  public:
    // One end of the connection between test and child.
    class Link {
      public:
        Link(int readEnd, int writeEnd) : in_(readEnd), out_(writeEnd) {}

        // Ends one Await() of the other side.
        void Tell() const;

        // Waits for a Tell() of the other side. False when that has ended, or after the deadline.
        bool Await() const;

        void Close();

      private:
        int in_;
        int out_;
    };

    // Forks a process that runs `body` and exits with code 0, or 1 when `body` throws. It runs no
    // exit handlers and no destructors of the test.
    explicit ChildProcess(const std::function<void(Link&)>& body);
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;
    ~ChildProcess();  // kills a child that was not joined

    void Tell() const { link_.Tell(); }
    bool Await() const { return link_.Await(); }
    pid_t Pid() const { return pid_; }

    void Kill(int signal) const;

    // Waits until it ends. Returns its exit code, or 128 plus the number of the signal that ended
    // it.
    int Join();

  private:
    pid_t pid_ = -1;
    Link link_{-1, -1};
};

#endif
