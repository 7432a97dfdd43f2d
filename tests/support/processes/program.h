// Runs a program as its users do: through its standard input, output, error and exit code.
//
//     EXPECT_EQ(RunProgram({"/usr/bin/sort"}, "b\na\n").out, "a\nb\n");
//
//     Program handler({path, "--db", file});
//     handler.Send(request + "\n");
//     EXPECT_EQ(handler.ReadLine(), reply);
//     EXPECT_EQ(handler.Finish().code, 0);
//
// A program that has not ended after a deadline is killed.
#ifndef ORVADRCORE_TESTS_PROGRAM_H
#define ORVADRCORE_TESTS_PROGRAM_H

#include <sys/types.h>

#include <chrono>
#include <string>
#include <vector>

struct ProgramResult {
    int code;  // the exit code, or 128 plus the number of the signal that ended it
    std::string out;
    std::string err;
};

class Program {
  public:
    // Starts the program whose path is the first argument.
    explicit Program(const std::vector<std::string>& arguments);
    Program(const Program&) = delete;
    Program& operator=(const Program&) = delete;
    ~Program();  // kills the program if it still runs

    // Writes to standard input. What does not fit into the pipe is written while ReadLine() and
    // Finish() wait.
    void Send(const std::string& text);

    // Waits for a line of standard output and takes it, without the newline. Empty when the output
    // ends or the deadline passes first.
    std::string ReadLine();

    // Closes our end of its standard output, so that it can write no more.
    void CloseOutput();

    pid_t Pid() const { return pid_; }

    void Kill(int signal) const;

    // Closes its input and waits until it ends. The result has the output that no ReadLine() took.
    ProgramResult Finish();

  private:
    void WriteUnsent();
    bool Pump();

    pid_t pid_ = -1;
    int in_ = -1;  // our ends of the pipes; -1 when closed
    int out_ = -1;
    int err_ = -1;
    bool isInputComplete_ = false;
    std::string unsent_;
    std::string unread_;
    std::string errors_;
    std::chrono::steady_clock::time_point deadline_;
};

// Runs a program with this input to its end.
ProgramResult RunProgram(const std::vector<std::string>& arguments, const std::string& input = "");

#endif
