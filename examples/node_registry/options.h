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
    std::string help;  // the text to print if --help is given
};

// False if the command line is wrong.
bool ReadOptions(int argc, const char* const* argv, Options& ret_options);

// The short help after a wrong command line.
extern const char* const UsageText;

}  // namespace NodeRegistry

#endif
