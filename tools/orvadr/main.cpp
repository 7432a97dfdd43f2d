// orvadr: shows what the DR programs have on disk, and who uses it. It changes nothing.
#include <CLI/CLI.hpp>

#include <algorithm>
#include <array>
#include <clocale>
#include <cstdio>
#include <exception>
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

// What the help says at its end; code 1 means something else for each command.
std::string ExitCodes(const std::string& notWell)
{
    return "Exit codes:\n"
           "  0  all is well\n"
           "  1  " +
           notWell +
           "\n"
           "  2  wrong usage\n"
           "  3  something could not be looked at\n";
}

struct Command {
    const char* name;
    const char* description;
    const char* notWell;  // what exit code 1 means
    const char* words;    // what its arguments are
    const char* wordsDescription;
    bool needsWords;
    Report (*run)(const Words&);
};

constexpr std::array<Command, 4> Commands{{
    {"cache", "Show how old caches are, and who refreshes them", "a cache is not fresh", "FILE",
     "cache files, such as /var/dr/nodes.cached", true, Orvadr::ReportCaches},
    {"db", "Check SQLite databases, and show who has them open", "a database is not ok", "FILE",
     "databases, such as /var/dr/nodes.db", true, Orvadr::ReportDatabases},
    {"lock", "Show who holds locks", "a lock that was named is held", "NAME",
     "as programs name it; all locks without any", false, Orvadr::ReportLocks},
    {"error", "Show what error codes mean", "there is no such error", "CODE|NAME",
     "such as 404 or ERR_NODE_EXIST; all without any", false, Orvadr::ReportErrors},
}};

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
    app.footer(ExitCodes("something is not: see the command") +
               "\nMore is in orvadr(1), orvadr-cache(1), orvadr-db(1) and so on.");
    app.set_version_flag("--version", "orvadr " ORVADR_VERSION);
    app.require_subcommand(1);

    bool wantsJson = false;
    Words words;
    const auto addJson = [&](CLI::App& to) {
        to.add_flag("--json", wantsJson, "Print an array of objects, for programs");
    };
    addJson(app);
    for (const Command& command : Commands) {
        CLI::App* const sub = app.add_subcommand(command.name, command.description);
        sub->footer(ExitCodes(command.notWell));
        sub->add_option(command.words, words, command.wordsDescription)
            ->required(command.needsWords)
            ->type_name("");
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
    const auto* const command =
        std::find_if(Commands.begin(), Commands.end(),
                     [&](const Command& each) { return app.got_subcommand(each.name); });
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
