// Runs the program orvadr.
#ifndef ORVADRCORE_TESTS_ORVADR_H
#define ORVADRCORE_TESTS_ORVADR_H

#include <string>
#include <vector>

#include <json/value.h>
#include <json/writer.h>  // for the messages of failed checks

#include "support/processes/program.h"

using Words = std::vector<std::string>;

// Exit codes.
constexpr int AllWell = 0;
constexpr int NotWell = 1;
constexpr int WrongUsage = 2;
constexpr int NotSeen = 3;

ProgramResult RunOrvadr(const Words& words);

// What it prints with --json, and its exit code. The test fails unless the output follows the schema of
// the command, which is the first word.
struct Answer {
    int code;
    Json::Value objects;
    std::string err;

    // The only object.
    const Json::Value& Only() const;
};
Answer Ask(Words words);

// The command line of the program, for RunInTerminal().
Words CommandLine(const Words& words);

#endif
