// What the command lines of the registry's programs have in common. CLI11 reads them: "--db FILE" may
// also be written "--db=FILE".
#ifndef NODE_REGISTRY_COMMAND_LINE_H
#define NODE_REGISTRY_COMMAND_LINE_H

#include <CLI/CLI.hpp>

#include <string>

#include "settings.h"

namespace NodeRegistry {

// Accepts only a decimal number from `least` to `most`. Otherwise false, and `ret_number` keeps its
// value.
bool ReadNumber(const std::string& text, int least, int most, int& ret_number);

// Such a number as the value of an option. By itself, CLI11 would read 010 as an octal number.
CLI::Validator Decimal(int least, int most);

// Adds the options for the settings.
void AddSettings(CLI::App& app, Settings& ret_settings);

// Adds --help, as an option like the others.
void AddHelp(CLI::App& app, bool& ret_wantsHelp);

// Sets the variables of the options that are given; of one that is repeated, the last counts. False
// if the command line is wrong.
bool Parse(CLI::App& app, int argc, const char* const* argv);

// What the help says about the options.
std::string OptionsText(const CLI::App& app);

}  // namespace NodeRegistry

#endif
