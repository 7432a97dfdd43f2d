// A daemon under load, for minutes: see --help.
//
// The files, in the order in which they are best read: plan (what happens, and the bounds), soak (one
// run), company (the processes), channels, client and load (who asks), ledger (what they were told),
// chaos (what goes wrong), neighbour (a process of our own beside them), watch (looks on), checks (at
// the end), findings and report.
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
constexpr int ExitNoRights = 77;                 // as tests say that they were skipped
constexpr unsigned int LastResortSeconds = 300;  // beyond the length: then something in here hangs

constexpr const char* Usage =
    "usage: soak [--seconds COUNT] [--dir DIRECTORY]\n"
    "\n"
    "Runs the node registry as a service, two more on the command line and a neighbour\n"
    "on one database, with 64 clients on 127.0.0.1, for so many seconds (default 120, at\n"
    "least 10). Meanwhile processes are killed, the disk of the status is full, and the\n"
    "database is locked. Prints what was measured, and each promise that was broken; then\n"
    "DIRECTORY (default: a new one in /tmp), which holds the database and the log, is\n"
    "kept. Needs root, or user namespaces.\n"
    "\n"
    "Exit codes: 0 all promises were kept, 1 one was broken, 2 wrong options, 77 no rights.\n";

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

// An empty directory in full. Empty when there is none.
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
        std::fputs("soak: no directory, or no right to mount in it\n", stderr);
        return ExitNoRights;
    }
    static_cast<void>(std::signal(SIGPIPE, SIG_IGN));
    ::alarm(static_cast<unsigned int>(plan.length.count()) + LastResortSeconds);
    return Soak::Run(plan) ? EXIT_SUCCESS : EXIT_FAILURE;
}
