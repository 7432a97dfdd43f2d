// The command line of the service.
#ifndef NODE_SERVICE_OPTIONS_H
#define NODE_SERVICE_OPTIONS_H

#include <string>

#include "node_registry/settings.h"

namespace NodeService {

// Where to listen. Port 0 is any that is free.
struct Address {
    std::string host = "127.0.0.1";
    int port = 8470;
};

struct Options {
    Address address;
    int threads = 16;
    NodeRegistry::Settings settings;
    bool isVerbose = false;
    bool wantsHelp = false;
};

// False for a command line that the usage does not allow.
bool ReadOptions(int argc, const char* const* argv, Options& ret_options);

// How the program is called: in short, for those who called it wrongly, and in full.
extern const char* const UsageText;
std::string HelpText();

}  // namespace NodeService

#endif
