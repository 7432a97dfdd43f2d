// orvadr: shows what the DR programs have on disk, and who uses it. It changes nothing.
#include <CLI/CLI.hpp>

#include <algorithm>
#include <clocale>
#include <cstdio>
#include <exception>
#include <functional>
#include <iostream>
#include <string>
#include <string_view>
#include <vector>

#include "commands.h"
#include "output.h"

namespace {

using Orvadr::ExitCode;
using Orvadr::Report;
using Orvadr::Style;

using Words = std::vector<std::string>;

constexpr const char* ExitCodes =
    "Exit codes:\n"
    "  0  all is well\n"
    "  1  something is not: see the command\n"
    "  2  wrong usage\n"
    "  3  something could not be looked at\n"
    "\n"
    "orvadr(1) and a page for each command, such as orvadr-cache(1), say more.";

struct Command {
    const char* name;
    const char* description;
    const char* words;  // what its arguments are
    const char* wordsDescription;
    bool needsWords;
    std::function<Report(const Words&)> run;
};

std::vector<Command> Commands()
{
    return {
        {"cache",
         "Show whether caches are fresh, and who refreshes them. Code 1 unless all are fresh.",
         "FILE", "cache files, such as /var/dr/nodes.cached", true, Orvadr::ReportCaches},
        {"db", "Check SQLite databases, and show who has them open. Code 1 unless all are ok.",
         "FILE", "databases, such as /var/dr/nodes.db", true, Orvadr::ReportDatabases},
        {"lock", "Show who holds locks. Code 1 when one of those named is held.", "NAME",
         "as programs name it, below /tmp/.orvadr_lock; all lock files without any", false,
         Orvadr::ReportLocks},
        {"error", "Show what error codes mean. Code 1 for one that there is not.", "CODE|NAME",
         "such as 404 or ERR_NODE_EXIST; all of them without any", false, Orvadr::ReportErrors},
    };
}

// CLI11 splits a word such as "[a,b]", drops an empty one and takes "--" only in front of all names, but
// these may be names of files. A mark in front of them keeps them whole.
constexpr char Mark = '\1';

Words MarkWords(int argc, const char* const* argv)
{
    Words words;
    bool areNames = false;  // after "--"
    for (const std::string& word : Words(argv + 1, argv + argc)) {
        const bool isSpecial =
            word.empty() || std::string_view("[{%\1").find(word[0]) != std::string_view::npos;
        if (!areNames && word == "--") {
            areNames = true;
        } else {
            words.push_back(areNames || isSpecial ? Mark + word : word);
        }
    }
    std::reverse(words.begin(), words.end());  // as CLI11 wants them
    return words;
}

void Unmark(Words& words)
{
    for (std::string& word : words) {
        if (word[0] == Mark) word.erase(0, 1);
    }
}

// Reads the command line and runs the command. CLI11 reports by exceptions, which end here.
ExitCode Run(int argc, const char* const* argv)
{
    CLI::App app("Shows what the DR programs have on disk, and who uses it. Changes nothing.");
    app.name("orvadr");
    app.footer(ExitCodes);
    app.set_version_flag("--version", "orvadr " ORVADR_VERSION);
    app.require_subcommand(1);

    bool wantsJson = false;
    Words words;
    const auto addJson = [&](CLI::App& to) {
        to.add_flag("--json", wantsJson, "Print an array of objects, for programs");
    };
    addJson(app);
    const std::vector<Command> commands = Commands();
    for (const Command& command : commands) {
        CLI::App* const sub = app.add_subcommand(command.name, command.description);
        sub->add_option(command.words, words, command.wordsDescription)
            ->required(command.needsWords);
        addJson(*sub);
    }
    try {
        app.parse(MarkWords(argc, argv));
    } catch (const CLI::ParseError& error) {
        return app.exit(error) == 0 ? ExitCode::AllWell : ExitCode::WrongUsage;
    }
    Unmark(words);
    if (std::find(words.begin(), words.end(), "") != words.end()) {
        std::cerr << "An empty name names nothing\nRun with --help for more information.\n";
        return ExitCode::WrongUsage;
    }
    const auto command = std::find_if(commands.begin(), commands.end(), [&](const Command& each) {
        return app.got_subcommand(each.name);
    });
    return Orvadr::Print(command->run(words), wantsJson ? Style::Json : Style::Table);
}

}  // namespace

int main(int argc, char** argv)
{
    // The width of characters is that of UTF-8, whatever the user's language.
    (void)std::setlocale(LC_CTYPE, "C.UTF-8");  // NOLINT(concurrency-mt-unsafe)
    try {
        return static_cast<int>(Run(argc, argv));
    } catch (const std::exception& error) {                        // GCOVR_EXCL_LINE: out of memory
        (void)std::fprintf(stderr, "orvadr: %s\n", error.what());  // GCOVR_EXCL_LINE: likewise
        return static_cast<int>(ExitCode::NotSeen);                // GCOVR_EXCL_LINE: likewise
    }
}
