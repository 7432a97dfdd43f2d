// Compares the library with itself without shortcuts: see --help and README.md.
//
// Read the files in this order: script (a database and random operations), draw with values,
// conditions and commands (what operations are made from), operations (what they do), side (one of
// the two libraries), neighbour (connections without the library), comparison, faults.
#include <unistd.h>

#include <CLI/CLI.hpp>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <limits>
#include <random>

#include "comparison.h"
#include "support/fakes/syscall_faults.h"
#include "support/fixtures/temp_dir.h"

namespace {

using namespace Shapes;  // NOLINT(google-build-using-namespace): this is its program
using Clock = std::chrono::system_clock;  // the steady one stands still here

struct Options {
    std::uint64_t seed = 0;  // 0: half of the time from 1 on, half from a new one
    std::size_t operations = std::numeric_limits<std::size_t>::max();
    int seconds = 10;
    bool isSelfTest = false;
    bool isShowing = false;
};

// Runs scripts with one seed after the other. Returns whether there was no difference.
bool Compare(Comparison& comparison, std::uint64_t seed, std::size_t operations,
             Clock::time_point deadline)
{
    std::printf("seed %llu\n", static_cast<unsigned long long>(seed));
    std::fflush(stdout);
    for (std::size_t left = operations; left > 0 && Clock::now() < deadline; ++seed) {
        const Script script = MakeScript(seed);
        std::optional<Difference> difference = comparison.Run(script, left);
        if (difference) {
            std::printf("DIFFERENCE after %zu operations. Again: --seed %llu --operations %zu\n%s",
                        comparison.CountOperations(), static_cast<unsigned long long>(seed),
                        difference->operation,
                        Report({script.seed, script.schema, script.limits, script.shortcuts, {}},
                               *difference)
                            .c_str());
            std::fflush(stdout);
            const Script shorter = comparison.Shrink(script, *difference);
            std::printf("The operations that matter:\n%s", Report(shorter, *difference).c_str());
            return false;
        }
        left -= std::min(left, script.operations.size());
    }
    return true;
}

// Each planted fault must be found.
bool FindFaults(const std::string& directory)
{
    constexpr std::size_t Enough = 50'000;
    bool areFound = true;
    for (const NamedFault& planted : AllFaults) {
        Comparison comparison(directory, planted.fault);
        bool isFound = false;
        for (std::uint64_t seed = 1; !isFound && comparison.CountOperations() < Enough; ++seed)
            isFound = comparison.Run(MakeScript(seed), Enough).has_value();
        std::printf("%s: %s after %zu operations\n", planted.name, isFound ? "found" : "NOT FOUND",
                    comparison.CountOperations());
        areFound = areFound && isFound;
    }
    return areFound;
}

bool Run(const Options& options, const std::string& directory)
{
    if (options.isSelfTest) return FindFaults(directory);
    Comparison comparison(directory);
    if (options.isShowing) comparison.ShowOperations();
    const Clock::time_point begin = Clock::now();
    const Clock::time_point end = begin + std::chrono::seconds(options.seconds);
    bool isSame = false;
    if (options.seed != 0) {
        isSame = Compare(comparison, options.seed, options.operations, end);
    } else {
        isSame =
            Compare(comparison, 1, options.operations, begin + (end - begin) / 2) &&
            Compare(comparison, std::random_device()() * 1'000'000ULL, options.operations, end);
    }
    const std::chrono::duration<double> time = Clock::now() - begin;
    const auto count = static_cast<double>(comparison.CountOperations());
    std::printf("%zu operations in %.0f s, %.0f per second: %s\n", comparison.CountOperations(),
                time.count(), count / time.count(), isSame ? "no difference" : "a DIFFERENCE");
    return isSame && count > 0;
}

// A directory in memory, if the system has one.
std::filesystem::path FastDirectory()
{
    const char* const inMemory = "/dev/shm";
    return ::access(inMemory, W_OK) == 0 ? inMemory : std::filesystem::temp_directory_path();
}

}  // namespace

int main(int argc, char** argv)
{
    Options options;
    CLI::App app(
        "Runs random operations on two databases, with and without the shortcuts of\n"
        "src/sqlite/sqlite_shortcuts.h, and compares all that can be noticed.",
        "shapes");
    app.add_option("--seed", options.seed, "of the first script; the others follow");
    app.add_option("--operations", options.operations, "stop after so many");
    app.add_option("--seconds", options.seconds, "stop after this time")->capture_default_str();
    app.add_flag("--show", options.isShowing, "print each operation, and what it does");
    app.add_flag("--self-test", options.isSelfTest, "plant faults, and fail if one is not found");
    CLI11_PARSE(app, argc, argv);

    SyscallFaults noDisk;  // nothing has to survive a power cut
    noDisk.fsync = noDisk.fdatasync = [](int) { return 0; };
    const TempDir directory(FastDirectory());
    return Run(options, directory.Path()) ? EXIT_SUCCESS : EXIT_FAILURE;
}
