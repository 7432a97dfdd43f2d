// Runs a program in a terminal.
#ifndef ORVADRCORE_TESTS_TERMINAL_H
#define ORVADRCORE_TESTS_TERMINAL_H

#include <functional>
#include <string>
#include <vector>

#include "support/processes/program.h"

// Runs a program in a pseudo-terminal that is so many columns wide, with more variables of the
// environment ("NO_COLOR=1"). `out` has everything that it writes, with the newlines of a text file.
// `onOutput` sees that after each piece, and returns what to type, usually nothing.
ProgramResult RunInTerminal(
    const std::vector<std::string>& arguments, unsigned short columns,
    const std::vector<std::string>& environment = {},
    const std::function<std::string(const std::string&)>& onOutput = nullptr);

#endif
