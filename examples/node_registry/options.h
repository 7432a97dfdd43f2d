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

// False for a command line that the usage does not allow.
bool ReadOptions(int argc, const char* const* argv, Options& ret_options);

// How the program is called: in short, for those who called it wrongly, and in full.
extern const char* const UsageText;
std::string HelpText();

}  // namespace NodeRegistry

#endif
