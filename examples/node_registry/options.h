// The command line.
#ifndef NODE_REGISTRY_OPTIONS_H
#define NODE_REGISTRY_OPTIONS_H

#include <string>

#include "settings.h"

namespace NodeRegistry {

struct Options {
    Settings settings;
    std::string input = "-";  // standard input
    bool isVerbose = false;
    bool isPretty = false;
    bool wantsHelp = false;
};

// False if the command line is wrong.
bool ReadOptions(int argc, const char* const* argv, Options& ret_options);

// The short help after a wrong command line, and the full one.
extern const char* const UsageText;
std::string HelpText();

}  // namespace NodeRegistry

#endif
