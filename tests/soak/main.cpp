// Puts a daemon under load for minutes: see --help.
//
// Read the files in this order: plan (what happens, and the bounds), soak (one run), company (the
// processes), channels, client and load (the requests), ledger (what clients were told), chaos
// (what goes wrong), neighbour (another daemon), watch (checks during the run), checks (after it),
// findings, report.
#include <unistd.h>

#include <charconv>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <string>
#include <system_error>

#include "neighbour.h"
#include "plan.h"
#include "soak.h"

namespace {

constexpr int ExitUsage = 2;
constexpr int ExitNoRights = 77;                 // CTest counts the test as skipped
constexpr unsigned int LastResortSeconds = 300;  // longer than the run: then the soak itself hangs

constexpr const char* Usage =
    "usage: soak [--seconds COUNT] [--dir DIRECTORY]\n"
    "\n"
    "Runs the node registry as a service, twice on the command line, and a neighbour, all\n"
    "on one database, with 64 clients on 127.0.0.1, for COUNT seconds (default 120, at\n"
    "least 10). Meanwhile it kills processes, fills the disk of the status and locks the\n"
    "database. Prints measurements and each broken promise. If a promise was broken, keeps\n"
    "DIRECTORY (default: a new one in /tmp) with the database and the log. Needs root or\n"
    "user namespaces.\n"
    "\n"
    "Exit codes: 0 all promises kept, 1 a promise broken, 2 wrong options, 77 no rights.\n";

bool ReadSeconds(const char* text, std::chrono::seconds& ret_length)
{
    int count = 0;
    const char* end = text + std::strlen(text);
    const auto [rest, error] = std::from_chars(text, end, count);
    if (error != std::errc() || rest != end || count < 10) return false;
    ret_length = std::chrono::seconds(count);
    return true;
}

bool ReadOptions(int argc, char** argv, Soak::Plan& plan)
{
    for (int index = 1; index < argc; index += 2) {
        const std::string option = argv[index];
        if (index + 1 == argc) return false;
        if (option == "--dir") {
            plan.directory = argv[index + 1];
        } else if (option != "--seconds" || !ReadSeconds(argv[index + 1], plan.length)) {
            return false;
        }
    }
    return true;
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
    if (!ReadOptions(argc, argv, plan)) {
        std::fputs(Usage, stderr);
        return ExitUsage;
    }
    plan.directory = MakeDirectory(plan.directory);
    if (plan.directory.empty() || !Soak::Prepare(plan)) {
        std::fputs("soak: cannot make the directory or mount in it\n", stderr);
        return ExitNoRights;
    }
    static_cast<void>(std::signal(SIGPIPE, SIG_IGN));
    ::alarm(static_cast<unsigned int>(plan.length.count()) + LastResortSeconds);
    return Soak::Run(plan) ? EXIT_SUCCESS : EXIT_FAILURE;
}
