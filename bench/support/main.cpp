// Checks that the contestants of each item agree, measures them in turn, and prints a table: see
// --help. The benchmarks keep their files in the working directory, in /dev/shm and, for locks, in
// /tmp/.orvadr_lock, and remove them at the end.
#include <benchmark/benchmark.h>

#include <CLI/CLI.hpp>
#include <cstdio>
#include <exception>
#include <string>
#include <vector>

#include "support/bench.h"
#include "support/report.h"

namespace {

using Bench::Item;

constexpr int ExitUsage = 2;

struct Options {
    bool quick = false;
    bool curves = false;
    bool writers = false;
    std::string out;
    std::string text;
};

void AddOptions(CLI::App& app, Options& options)
{
    app.add_flag("--quick", options.quick, "each item once and briefly");
    auto* curves = app.add_flag("--curves", options.curves, "measure how the cost grows");
    app.add_flag("--writers", options.writers, "measure many processes that write to one file")
        ->excludes(curves);
    app.add_option("--out", options.out,
                   "write the figures to NAME.csv and NAME.md, and those of processes to "
                   "NAME-processes.csv and NAME-processes.md")
        ->type_name("NAME");
    app.add_option("TEXT", options.text, "only items whose name contains this")->type_name("");
}

// Repetitions are shuffled, so that a machine that is slow for a while slows all contestants.
void InitializeLibrary(bool quick)
{
    std::vector<std::string> arguments{"orvadr_bench",
                                       "--benchmark_enable_random_interleaving=true"};
    arguments.emplace_back(quick ? "--benchmark_repetitions=1" : "--benchmark_repetitions=5");
    arguments.emplace_back(quick ? "--benchmark_min_time=0.0001" : "--benchmark_min_time=0.1");
    std::vector<char*> pointers;
    pointers.reserve(arguments.size());
    for (std::string& argument : arguments) pointers.push_back(argument.data());
    int count = static_cast<int>(pointers.size());
    benchmark::Initialize(&count, pointers.data());
}

void AddItems(bool curves)
{
    if (curves) {
        Bench::AddCurves();
        return;
    }
    Bench::AddRecords();
    Bench::AddWide();
    Bench::AddMany();
    Bench::AddVolumes();
    Bench::AddTexts();
    Bench::AddJson();
    Bench::AddKeyValue();
    Bench::AddLocks();
    Bench::AddCache();
    Bench::AddMisc();
}

void NamePeersLeftOut()
{
    struct Peer {
        const char* name;
        bool there;
    };
    for (const Peer& peer : {Peer{"SQLiteCpp", BENCH_HAS_SQLITECPP}, Peer{"SOCI", BENCH_HAS_SOCI},
                             Peer{"inih", BENCH_HAS_INIH}, Peer{"GLib", BENCH_HAS_GLIB},
                             Peer{"Boost", BENCH_HAS_BOOST}}) {
        if (!peer.there) std::printf("left out: %s is not installed\n", peer.name);
    }
}

// Every contestant must give the first one's result.
void CheckResults(const Item& item)
{
    std::string expected;
    for (const Bench::Contestant& contestant : item.contestants) {
        const std::string result = contestant.result();
        Bench::Require(!result.empty(), ("no result: " + item.name).c_str());
        if (expected.empty()) expected = result;
        if (result == expected) continue;
        throw Bench::Failure(item.name + ": " + contestant.name + " gives\n" +
                             result.substr(0, 1000) + "\nbut " + item.contestants.front().name +
                             " gives\n" + expected.substr(0, 1000));
    }
}

void Run(const Options& options)
{
    if (options.writers) {
        NamePeersLeftOut();
        Bench::RunWriters(options.out, options.quick ? 1 : 10);
        return;
    }
    InitializeLibrary(options.quick);
    AddItems(options.curves);
    NamePeersLeftOut();

    std::vector<Item> chosen;
    for (const Item& item : Bench::Items()) {
        if (item.name.find(options.text) != std::string::npos) chosen.push_back(item);
    }
    Bench::Collector collector;
    if (!chosen.empty()) Bench::PrintCaption();
    for (const Item& item : chosen) {
        CheckResults(item);
        benchmark::RunSpecifiedBenchmarks(&collector, "^" + item.name + "/");
        Bench::PrintItem(item, collector);
    }
    const std::string& out = options.out;
    if (!out.empty()) {
        Bench::WriteCsv(out + ".csv", chosen, collector);
        Bench::WriteMarkdown(out + ".md", chosen, collector);
    }
    if (options.curves && std::string("processes").find(options.text) != std::string::npos) {
        const std::string processes = out.empty() ? "" : out + "-processes";
        Bench::RunCrowds(processes, options.quick ? 1 : 5, options.quick ? 1 : 2);
    }
}

int Main(int argc, char** argv)
{
    CLI::App app("Measures the library, the same work by hand, and other libraries.");
    Options options;
    AddOptions(app, options);
    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError& error) {  // --help is one, too
        return app.exit(error) == 0 ? 0 : ExitUsage;
    }
    Run(options);
    return 0;
}

}  // namespace

int main(int argc, char** argv)
{
    try {
        return Main(argc, argv);
    } catch (const std::exception& failure) {
        (void)std::fprintf(stderr, "orvadr_bench: %s\n", failure.what());
        return 1;
    }
}
