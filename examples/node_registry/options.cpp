#include "options.h"

#include "api_help.h"

namespace NodeRegistry {

namespace {

constexpr const char* Introduction =
    R"(
Answers requests about the remote nodes of a storage appliance. Reads one JSON
object a line from the file INPUT, or from standard input when it is missing or
"-", and writes one JSON reply a line. The nodes are kept in an SQLite file,
which several of these programs may use at the same time.

Options:
)";

constexpr const char* OwnOptions =
    R"(  --verbose   log lines also on standard error; they always go to syslog
  --pretty    for people: each request before its reply, errors by their name
  --help      this text

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

std::string HelpText()
{
    return std::string(UsageText) + Introduction + SettingsHelp + OwnOptions + ApiHelp + ExitCodes;
}

bool ReadOptions(int argc, const char* const* argv, Options& ret_options)
{
    Options options;
    bool hasInput = false;
    for (int index = 1; index < argc; ++index) {
        const Reading reading = ReadSetting(argc, argv, index, options.settings);
        if (reading == Reading::Refused) return false;
        if (reading == Reading::Taken) continue;

        const std::string word = argv[index];
        if (word == "--verbose") {
            options.isVerbose = true;
        } else if (word == "--pretty") {
            options.isPretty = true;
        } else if (word == "--help") {
            options.wantsHelp = true;
        } else if (!hasInput && (word == "-" || word.compare(0, 1, "-") != 0)) {
            options.input = word;
            hasInput = true;
        } else {
            return false;
        }
    }
    ret_options = options;
    return true;
}

}  // namespace NodeRegistry
