// A program run from outside, as its users run it: through its standard input, output and error
// and by its exit code.
//
//     const ProgramResult result = RunProgram({"/usr/bin/sort"}, "b\na\n");   // result.out
//     "a\nb\n"
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
    int code;  // the exit code; 128 plus the number of the signal that ended it
    std::string out;
    std::string err;
};

class Program {
  public:
    // Starts the program whose path is the first argument.
    explicit Program(const std::vector<std::string>& arguments);
    Program(const Program&) = delete;
    Program& operator=(const Program&) = delete;
    ~Program();  // kills a program that was not finished

    // Writes a text to standard input. What does not fit into the pipe follows while ReadLine and
    // Finish wait.
    void Send(const std::string& text);

    // Waits for a line of standard output and takes it, without its end. Empty when there is none
    // before the output ends or the deadline passes.
    std::string ReadLine();

    // Closes our end of its standard output.
    void CloseOutput();

    pid_t Pid() const { return pid; }

    // Sends it a signal.
    void Kill(int signal) const;

    // Ends its input and waits for its end. The result has the output that no ReadLine took.
    ProgramResult Finish();

  private:
    void WriteUnsent();
    bool Pump();

    pid_t pid = -1;
    int in = -1;  // our ends of the pipes; -1 when closed
    int out = -1;
    int err = -1;
    bool isInputComplete = false;
    std::string unsent;
    std::string unread;
    std::string errors;
    std::chrono::steady_clock::time_point deadline;
};

// One run from beginning to end.
ProgramResult RunProgram(const std::vector<std::string>& arguments, const std::string& input = "");

#endif
