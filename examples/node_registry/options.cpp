#include "options.h"

#include "api_help.h"
#include "command_line.h"

namespace NodeRegistry {

namespace {

constexpr const char* Introduction =
    R"(
Answers requests about the remote nodes of a storage appliance. Reads one JSON
object a line from the file INPUT, or from standard input when it is missing or
"-", and writes one JSON reply a line. The nodes are kept in an SQLite file,
which several of these programs may use at the same time.
)";

constexpr const char* ExitCodes =
    R"(
Exit codes:
  0  every line was answered, well or badly
  1  INPUT could not be read or standard output not be written
  2  wrong options
)";

}  // namespace

const char* const UsageText =
    "usage: node_registry [--db FILE] [--status-timeout SECONDS]\n"
    "                     [--status-dir DIRECTORY] [--verbose] [--pretty] [--help]\n"
    "                     [INPUT]\n";

bool ReadOptions(int argc, const char* const* argv, Options& ret_options)
{
    CLI::App app;
    Options options;
    bool wantsHelp = false;
    AddSettings(app, options.settings);
    app.add_flag("--verbose", options.isVerbose,
                 "log lines also on standard error; they always go to syslog");
    app.add_flag("--pretty", options.isPretty,
                 "for people: each request before its reply, errors by their name");
    AddHelp(app, wantsHelp);
    app.add_option("INPUT", options.input);
    if (!Parse(app, argc, argv)) return false;
    if (wantsHelp) {
        options.help =
            std::string(UsageText) + Introduction + OptionsText(app) + "\n" + ApiHelp + ExitCodes;
    }
    ret_options = options;
    return true;
}

}  // namespace NodeRegistry
