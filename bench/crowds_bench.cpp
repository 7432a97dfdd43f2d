// How the cost grows with the number of processes that insert into one file at the same time.
#include <sqlite3.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <cstdio>

#include "support/bench.h"
#include "support/engines.h"
#include "support/report.h"

namespace Bench {

namespace {

using Clock = std::chrono::steady_clock;

struct Waits {
    std::size_t inserts = 0;
    double perSecond = 0;
    double median = 0;
    double percentile99 = 0;
    double worst = 0;
};

constexpr std::size_t MaxInserts = 1'000'000;  // by all processes together

// Numbers in shared memory; the first is their count.
struct Board {
    std::size_t count;
    std::array<float, MaxInserts> msec;
};

// Inserts until the time is up, and records how long each insert took.
template <class Engine>
void InsertUntil(const std::string& path, Clock::time_point end, int process, Board& board)
{
    constexpr int IdsOfProcess = 10'000'000;
    Engine engine(path);
    Node node = MakeNode(process * IdsOfProcess);
    while (Clock::now() < end) {
        ++node.id;
        const auto begin = Clock::now();
        engine.Insert(node);
        const std::chrono::duration<float, std::milli> took = Clock::now() - begin;
        const std::size_t at = __atomic_fetch_add(&board.count, 1U, __ATOMIC_RELAXED);
        if (at < MaxInserts) board.msec[at] = took.count();
    }
}

Waits Summarize(const Board& board, double seconds)
{
    const std::size_t count = std::min(board.count, MaxInserts);
    Require(count > 0, "nothing was inserted");
    std::vector<float> all(board.msec.begin(), board.msec.begin() + static_cast<long>(count));
    std::sort(all.begin(), all.end());
    return {board.count, static_cast<double>(board.count) / seconds, all[count / 2],
            all[count * 99 / 100], all.back()};
}

// The number of rows, counted without the engines.
std::size_t CountRows(const std::string& path)
{
    const Database db = OpenDatabase(path);
    const Statement count = Prepare(db.get(), "SELECT count(*) FROM nodes");
    Require(sqlite3_step(count.get()) == SQLITE_ROW, "no count");
    return static_cast<std::size_t>(sqlite3_column_int64(count.get(), 0));
}

template <class Engine>
Waits RunCrowd(Place place, int processes, int seconds)
{
    const TempDir dir(place);
    const std::string path = dir.File("nodes.db");
    FillNodes(path, 0);
    void* memory =
        ::mmap(nullptr, sizeof(Board), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    Require(memory != MAP_FAILED, "no shared memory");
    auto* board = static_cast<Board*>(memory);
    const auto begin = Clock::now();
    const auto end = begin + std::chrono::seconds(seconds);
    std::vector<pid_t> children;
    for (int process = 0; process < processes; ++process) {
        const pid_t child = ::fork();
        Require(child >= 0, "cannot fork");
        if (child == 0) {
            int code = 0;
            try {
                InsertUntil<Engine>(path, end, process, *board);
            } catch (const std::exception& failure) {
                (void)std::fprintf(stderr, "process %d: %s\n", process, failure.what());
                code = 1;
            }
            ::_exit(code);
        }
        children.push_back(child);
    }
    bool good = true;
    for (const pid_t child : children) {
        int status = 0;
        good = ::waitpid(child, &status, 0) == child && status == 0 && good;
    }
    const std::chrono::duration<double> took = Clock::now() - begin;
    const Waits waits = Summarize(*board, took.count());
    ::munmap(memory, sizeof(Board));
    Require(good, "a process failed");
    Require(CountRows(path) == waits.inserts, "rows are missing");
    return waits;
}

// Our connection, with a retry limit that is high enough.
struct PatientEngine : OurEngine {
    explicit PatientEngine(const std::string& path) : OurEngine(path, CrowdRetries) {}
    static constexpr unsigned int CrowdRetries = 100;
};

// SQLite's busy timeout, which waits as long as it takes.
struct WaitingEngine : BareEngine {
    explicit WaitingEngine(const std::string& path) : BareEngine(path, CrowdTimeoutMSec) {}
    static constexpr int CrowdTimeoutMSec = 600'000;
};

// The results for one place, number of processes and contestant.
struct Crowd {
    Place place = Place::Disk;
    int processes = 0;
    const char* who = "";
    std::vector<Waits> runs;
};

// The median over the runs.
double MedianOf(const Crowd& crowd, double Waits::*number)
{
    std::vector<double> numbers;
    for (const Waits& waits : crowd.runs) numbers.push_back(waits.*number);
    const auto half = numbers.begin() + static_cast<long>(numbers.size() / 2);
    std::nth_element(numbers.begin(), half, numbers.end());
    return *half;
}

Waits Summarize(const Crowd& crowd)
{
    Waits waits{0, MedianOf(crowd, &Waits::perSecond), MedianOf(crowd, &Waits::median),
                MedianOf(crowd, &Waits::percentile99), 0};
    for (const Waits& run : crowd.runs) waits.worst = std::max(waits.worst, run.worst);
    return waits;
}

// One line per run: place, contestant, processes, and the four figures.
void PrintCrowds(std::FILE* file, const char* format, const std::vector<Crowd>& crowds)
{
    for (const Crowd& crowd : crowds) {
        const Waits waits = Summarize(crowd);
        (void)std::fprintf(file, format, crowd.place == Place::Disk ? "disk" : "memory", crowd.who,
                           crowd.processes, waits.perSecond, waits.median, waits.percentile99,
                           waits.worst);
    }
}

void WriteCrowds(const std::string& path, const char* caption, const char* format,
                 const std::vector<Crowd>& crowds)
{
    std::FILE* file = std::fopen(path.c_str(), "we");
    Require(file != nullptr, "cannot write the figures of processes");
    (void)std::fputs(caption, file);
    PrintCrowds(file, format, crowds);
    Require(std::fclose(file) == 0, "cannot write the figures of processes");
}

}  // namespace

void RunCrowds(const std::string& out, int runs, int seconds)
{
    std::vector<Crowd> crowds;
    std::printf("\n%-10s %-9s %9s %11s %11s %11s %11s\n", "one file", "who", "processes",
                "inserts/s", "median ms", "99 % ms", "worst ms");
    for (const Place place : {Place::Disk, Place::Memory}) {
        for (const int processes : {1, 2, 4, 8}) {
            Crowd ours{place, processes, Ours, {}};
            Crowd bare{place, processes, Bare, {}};
            for (int run = 0; run < runs; ++run) {
                ours.runs.push_back(RunCrowd<PatientEngine>(place, processes, seconds));
                bare.runs.push_back(RunCrowd<WaitingEngine>(place, processes, seconds));
            }
            PrintCrowds(stdout, "%-10s %-9s %9d %11.0f %11.3f %11.3f %11.1f\n", {ours, bare});
            (void)std::fflush(stdout);
            crowds.insert(crowds.end(), {ours, bare});
        }
    }
    if (out.empty()) return;
    WriteCrowds(out + ".csv", "place,contestant,processes,per_second,median_ms,p99_ms,worst_ms\n",
                "%s,%s,%d,%.1f,%.3f,%.3f,%.3f\n", crowds);
    WriteCrowds(out + ".md",
                "| file on | who | processes | inserts/s | median ms | 99 % ms | worst ms |\n"
                "|---|---|--:|--:|--:|--:|--:|\n",
                "| %s | %s | %d | %.0f | %.3f | %.3f | %.1f |\n", crowds);
}

}  // namespace Bench
