// The command line.
#ifndef NODE_REGISTRY_OPTIONS_H
#define NODE_REGISTRY_OPTIONS_H

#include <string>

namespace NodeRegistry {

struct Options {
    std::string database = "./node_registry.db";
    std::string input = "-";  // standard input
    int statusTimeout = 30;   // in seconds
    bool isVerbose = false;
    bool isPretty = false;
    bool wantsHelp = false;
};

// False for a command line that the usage does not allow.
bool ReadOptions(int argc, const char* const* argv, Options& ret_options);

// How the program is called: in short for those who called it wrongly, and all there is to know.
extern const char* const UsageText;
extern const char* const HelpText;

}  // namespace NodeRegistry

#endif
