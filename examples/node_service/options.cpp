#include "options.h"

#include "node_registry/api_help.h"
#include "node_registry/command_line.h"

namespace NodeService {

namespace {

constexpr int MaxPort = 65535;
constexpr int MaxThreads = 256;

constexpr const char* Introduction =
    R"(
Answers requests about the remote nodes of a storage appliance over HTTP: POST
/webapi takes one JSON object and answers with its reply. The nodes are kept in
an SQLite file, which other services and node_registry may use at the same time.
Ends on SIGTERM and SIGINT, once the requests that it has begun are answered.
)";

constexpr const char* Rest =
    R"(
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
    const std::string port = text.substr(colon + 1);
    if (!NodeRegistry::ReadNumber(port, 0, MaxPort, ret_address.port)) return false;
    ret_address.host = host;
    return true;
}

}  // namespace

const char* const UsageText =
    "usage: node_service [--listen ADDRESS:PORT] [--threads COUNT] [--db FILE]\n"
    "                    [--status-timeout SECONDS] [--status-dir DIRECTORY]\n"
    "                    [--verbose] [--help]\n";

bool ReadOptions(int argc, const char* const* argv, Options& ret_options)
{
    CLI::App app;
    Options options;
    bool wantsHelp = false;
    app.add_option(
           "--listen",
           [&](const CLI::results_t& values) {
               return ReadAddress(values.back(), options.address);
           },
           "where to listen (default 127.0.0.1:8470); an IPv6 address stands\n"
           "in brackets, port 0 is any that is free. The line \"listening on\n"
           "ADDRESS:PORT\" on standard output says that it does")
        ->type_name("ADDRESS:PORT");
    app.add_option("--threads", options.threads,
                   "how many requests are answered at the same time, 1 to 256\n"
                   "(default 16); each thread has a database connection of its own")
        ->type_name("COUNT")
        ->transform(NodeRegistry::Decimal(1, MaxThreads));
    NodeRegistry::AddSettings(app, options.settings);
    app.add_flag("--verbose", options.isVerbose,
                 "log lines also on standard error; they always go to syslog");
    NodeRegistry::AddHelp(app, wantsHelp);
    if (!NodeRegistry::Parse(app, argc, argv)) return false;
    if (wantsHelp) {
        options.help = std::string(UsageText) + Introduction + NodeRegistry::OptionsText(app) +
                       Rest + NodeRegistry::ApiHelp + ExitCodes;
    }
    ret_options = options;
    return true;
}

}  // namespace NodeService
