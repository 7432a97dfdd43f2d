// Puts a daemon under load for minutes: see --help.
//
// Read the files in this order: plan (what happens, and the bounds), soak (one run), company (the
// processes), channels, client and load (the requests), ledger (what clients were told), chaos
// (what goes wrong), neighbour (another daemon), watch (checks during the run), checks (after it),
// findings, report.
#include <unistd.h>

#include <CLI/CLI.hpp>

#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <limits>
#include <string>
#include <system_error>

#include "examples/node_registry/command_line.h"
#include "neighbour.h"
#include "plan.h"
#include "soak.h"

namespace {

constexpr int ExitUsage = 2;
constexpr int ExitNoRights = 77;                 // CTest counts the test as skipped
constexpr unsigned int LastResortSeconds = 300;  // longer than the run: then the soak itself hangs

constexpr const char* Description =
    "Runs the node registry as a service, twice on the command line, and a neighbour, all\n"
    "on one database, with 64 clients on 127.0.0.1. Meanwhile it kills processes, fills the\n"
    "disk of the status and locks the database. Prints measurements and each broken promise.\n"
    "Needs root or user namespaces.\n";
constexpr const char* ExitCodes =
    "Exit codes: 0 all promises kept, 1 a promise broken, 2 wrong options, 77 no rights.";

constexpr int LeastSeconds = 10;

void AddOptions(CLI::App& app, int& ret_seconds, std::string& ret_directory)
{
    app.add_option("--seconds", ret_seconds, "how long")
        ->type_name("COUNT")
        ->transform(NodeRegistry::Decimal(LeastSeconds, std::numeric_limits<int>::max()))
        ->capture_default_str();
    app.add_option("--dir", ret_directory,
                   "keeps the database and the log if a promise was broken (default: a new\n"
                   "one in /tmp)")
        ->type_name("DIRECTORY");
    app.footer(ExitCodes);
}

// Makes an empty directory. Returns its full path, or an empty text on failure.
std::string MakeDirectory(const std::string& wanted)
{
    std::error_code error;
    if (wanted.empty()) {
        std::string made = "/tmp/orvadr-soak-XXXXXX";
        return ::mkdtemp(made.data()) == nullptr ? "" : made;
    }
    std::filesystem::remove_all(wanted, error);
    std::filesystem::create_directories(wanted, error);
    const std::filesystem::path full = std::filesystem::canonical(wanted, error);
    return error ? "" : full.string();
}

}  // namespace

int main(int argc, char** argv)
{
    const std::string role = argc > 1 ? argv[1] : "";
    if (role == "--neighbour" && argc == 4) return Soak::RunNeighbour(argv[2], argv[3]);
    if (role == "--hold" && argc == 3) return Soak::HoldLock(argv[2]);

    Soak::Plan plan;
    auto seconds = static_cast<int>(plan.length.count());
    CLI::App app(Description, "soak");
    AddOptions(app, seconds, plan.directory);
    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError& error) {
        return app.exit(error) == 0 ? EXIT_SUCCESS : ExitUsage;
    }
    plan.length = std::chrono::seconds(seconds);
    plan.directory = MakeDirectory(plan.directory);
    if (plan.directory.empty() || !Soak::Prepare(plan)) {
        std::fputs("soak: cannot make the directory or mount in it\n", stderr);
        return ExitNoRights;
    }
    static_cast<void>(std::signal(SIGPIPE, SIG_IGN));
    ::alarm(static_cast<unsigned int>(plan.length.count()) + LastResortSeconds);
    return Soak::Run(plan) ? EXIT_SUCCESS : EXIT_FAILURE;
}
