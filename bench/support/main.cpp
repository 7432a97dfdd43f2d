// Checks the contestants of each item against each other, measures them by turns, and prints a table.
//
//     orvadr_bench [--quick] [--curves | --writers] [--out NAME] [TEXT]
//
// TEXT picks the items whose name holds it. The figures go to NAME.csv, as a table to NAME.md, and
// those of processes to NAME-processes.csv and .md. Files of the benchmarks lie in the working directory, in
// /dev/shm and, for locks, in /tmp/.orvadr_lock; they are removed at the end.
#include <benchmark/benchmark.h>

#include <cstdio>
#include <exception>
#include <string>
#include <vector>

#include "support/bench.h"
#include "support/report.h"

namespace {

using Bench::Item;

struct Options {
    bool quick = false;
    bool curves = false;
    bool writers = false;
    std::string out;
    std::string text;
};

Options ParseOptions(const std::vector<std::string>& arguments)
{
    Options options;
    for (auto at = arguments.begin(); at != arguments.end(); ++at) {
        if (*at == "--quick") {
            options.quick = true;
        } else if (*at == "--curves") {
            options.curves = true;
        } else if (*at == "--writers") {
            options.writers = true;
        } else if (*at == "--out" && at + 1 != arguments.end()) {
            options.out = *++at;
        } else {
            Bench::Require(at->compare(0, 2, "--") != 0, "unknown option");
            options.text = *at;
        }
    }
    return options;
}

// The repetitions of an item's contestants are shuffled: what slows the machine down for a while
// meets all of them.
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
    Bench::AddMany();
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
        if (!peer.there) std::printf("left out: %s is not on this system\n", peer.name);
    }
}

// All contestants of an item give what the first one gives.
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

}  // namespace

int main(int argc, char** argv)
{
    try {
        Run(ParseOptions({argv + 1, argv + argc}));
        return 0;
    } catch (const std::exception& failure) {
        (void)std::fprintf(stderr, "orvadr_bench: %s\n", failure.what());
        return 1;
    }
}
