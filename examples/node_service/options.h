// The command line of the service.
#ifndef NODE_SERVICE_OPTIONS_H
#define NODE_SERVICE_OPTIONS_H

#include <string>

#include "node_registry/settings.h"

namespace NodeService {

// Where to listen. Port 0 means any free port.
struct Address {
    std::string host = "127.0.0.1";
    int port = 8470;
};

struct Options {
    Address address;
    int threads = 16;
    NodeRegistry::Settings settings;
    bool isVerbose = false;
    std::string help;  // the text to print if --help is given
};

// False if the command line is wrong.
bool ReadOptions(int argc, const char* const* argv, Options& ret_options);

// The short help after a wrong command line.
extern const char* const UsageText;

}  // namespace NodeService

#endif
