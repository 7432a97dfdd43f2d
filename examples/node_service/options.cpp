#include "options.h"

#include "node_registry/api_help.h"

namespace NodeService {

using NodeRegistry::Reading;
using NodeRegistry::ReadNumber;
using NodeRegistry::ReadSetting;

namespace {

constexpr int MaxPort = 65535;
constexpr int MaxThreads = 256;

constexpr const char* Introduction =
    R"(
Answers requests about the remote nodes of a storage appliance over HTTP: POST
/webapi takes one JSON object and answers with its reply. The nodes are kept in
an SQLite file, which other services and node_registry may use at the same time.
Ends on SIGTERM and SIGINT, once the requests that it has begun are answered.

Options:
  --listen ADDRESS:PORT
              where to listen (default 127.0.0.1:8470); an IPv6 address stands
              in brackets, port 0 is any that is free. The line "listening on
              ADDRESS:PORT" on standard output says that it does
  --threads COUNT
              how many requests are answered at the same time, 1 to 256
              (default 16); each thread has a database connection of its own
)";

constexpr const char* Rest =
    R"(  --verbose   log lines also on standard error; they always go to syslog
  --help      this text

Every request that reached the registry is answered with HTTP 200 and the reply,
which says how it went. What did not reach it gets a reply of the same form with
another code: 400 (no HTTP), 404 (another path), 405 (another method), 413 (more
than 1 MiB), 415 (a form with files).

)";

constexpr const char* ExitCodes =
    R"(
Exit codes:
  0  ended by SIGTERM or SIGINT
  1  could not listen, or not go on listening
  2  wrong options
)";

// Splits "127.0.0.1:8470" or "[::1]:8470".
bool ReadAddress(const std::string& text, Address& ret_address)
{
    const std::size_t colon = text.rfind(':');
    if (colon == std::string::npos) return false;
    std::string host = text.substr(0, colon);
    if (host.size() > 2 && host.front() == '[' && host.back() == ']') {
        host = host.substr(1, host.size() - 2);
    } else if (host.empty() || host.find_first_of(":[]") != std::string::npos) {
        return false;
    }
    if (!ReadNumber(text.substr(colon + 1), 0, MaxPort, ret_address.port)) return false;
    ret_address.host = host;
    return true;
}

}  // namespace

const char* const UsageText =
    "usage: node_service [--listen ADDRESS:PORT] [--threads COUNT] [--db FILE]\n"
    "                    [--status-timeout SECONDS] [--status-dir DIRECTORY]\n"
    "                    [--verbose] [--help]\n";

std::string HelpText()
{
    return std::string(UsageText) + Introduction + NodeRegistry::SettingsHelp + Rest +
           NodeRegistry::ApiHelp + ExitCodes;
}

bool ReadOptions(int argc, const char* const* argv, Options& ret_options)
{
    Options options;
    for (int index = 1; index < argc; ++index) {
        const Reading reading = ReadSetting(argc, argv, index, options.settings);
        if (reading == Reading::Refused) return false;
        if (reading == Reading::Taken) continue;

        const std::string word = argv[index];
        const bool hasValue = index + 1 < argc;
        if (word == "--listen" && hasValue) {
            if (!ReadAddress(argv[++index], options.address)) return false;
        } else if (word == "--threads" && hasValue) {
            if (!ReadNumber(argv[++index], 1, MaxThreads, options.threads)) return false;
        } else if (word == "--verbose") {
            options.isVerbose = true;
        } else if (word == "--help") {
            options.wantsHelp = true;
        } else {
            return false;
        }
    }
    ret_options = options;
    return true;
}

}  // namespace NodeService
