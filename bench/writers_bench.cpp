// Processes that insert row by row into one file at the same time, sometimes with readers: how many
// rows they store, how fair it is, who gives up, and what waiting costs.
#include <sys/mman.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <functional>

#include "support/bench.h"
#include "support/engines.h"

namespace Bench {

namespace {

using Clock = std::chrono::steady_clock;
using Milliseconds = std::chrono::duration<double, std::milli>;

constexpr std::size_t MaxProcesses = 128;

// Like a daemon that reads now and then.
constexpr useconds_t ReaderPauseUSec = 5000;

// How long they wait: we make six attempts of a second, with pauses; the others use a busy timeout.
constexpr unsigned int Retries = 5;
constexpr int PeersTimeoutMSec = 10'000;

struct PatientOurs : OurEngine {
    explicit PatientOurs(const std::string& path) : OurEngine(path, Retries) {}
};

template <class Engine>
struct PatientPeer : Engine {
    explicit PatientPeer(const std::string& path) : Engine(path, PeersTimeoutMSec) {}
};

// The results of one process.
struct Work {
    int done;
    int givenUp;
    double worstMSec;
    double processorSeconds;
};

// In memory that the processes share.
struct Board {
    std::atomic<int> ready;
    std::atomic<bool> isOpen;
    std::array<Work, MaxProcesses> work;
};

struct SharedBoard {
    SharedBoard()
    {
        void* memory = ::mmap(nullptr, sizeof(Board), PROT_READ | PROT_WRITE,
                              MAP_SHARED | MAP_ANONYMOUS, -1, 0);
        Require(memory != MAP_FAILED, "no shared memory");
        board = new (memory) Board{};
    }
    SharedBoard(const SharedBoard&) = delete;
    SharedBoard& operator=(const SharedBoard&) = delete;
    ~SharedBoard() { ::munmap(board, sizeof(Board)); }

    Board* board = nullptr;
};

struct Scene {
    const char* journal = "";
    std::size_t writers = 0;
    std::size_t readers = 0;
};

struct Figures {
    double insertsPerSecond = 0;
    double leastShare = 0;  // compared with the mean of all writers
    int givenUp = 0;
    double worstMSec = 0;
    double processorPercent = 0;  // of a core; the writer that used most
    double readsPerSecond = 0;
    double worstReadMSec = 0;
};

double ProcessorSeconds()
{
    rusage usage{};
    ::getrusage(RUSAGE_SELF, &usage);
    const auto seconds = [](const timeval& time) {
        return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_usec) / 1e6;
    };
    return seconds(usage.ru_utime) + seconds(usage.ru_stime);
}

// Repeats `act`, with pauses, until the time is up, and records the results.
template <class Act>
void WorkUntil(Clock::time_point end, Work& work, useconds_t pause, Act act)
{
    const double before = ProcessorSeconds();
    while (Clock::now() < end) {
        const auto begin = Clock::now();
        try {
            act();
            ++work.done;
        } catch (const std::exception&) {
            ++work.givenUp;
        }
        work.worstMSec = std::max(work.worstMSec, Milliseconds(Clock::now() - begin).count());
        if (pause > 0) ::usleep(pause);
    }
    work.processorSeconds = ProcessorSeconds() - before;
}

template <class Engine>
void RunProcess(const std::string& path, std::size_t process, bool isWriter, int seconds,
                Board& board)
{
    constexpr int IdsOfProcess = 10'000'000;
    Engine engine(path);
    ++board.ready;
    while (!board.isOpen) ::usleep(1000);
    const Clock::time_point end = Clock::now() + std::chrono::seconds(seconds);
    Work& work = board.work.at(process);
    if (isWriter) {
        Node node = MakeNode(static_cast<int>(process + 1) * IdsOfProcess);
        WorkUntil(end, work, 0, [&] {
            ++node.id;
            engine.Insert(node);
        });
    } else {
        WorkUntil(end, work, ReaderPauseUSec, [&] { engine.Select(1); });
    }
}

// Starts a process that runs `body`; returns its id.
pid_t Fork(const std::function<void()>& body)
{
    const pid_t child = ::fork();
    Require(child >= 0, "cannot fork");
    if (child > 0) return child;
    try {
        body();
        ::_exit(0);
    } catch (const std::exception& failure) {
        (void)std::fprintf(stderr, "process %d: %s\n", ::getpid(), failure.what());
        ::_exit(1);
    }
}

Figures Summarize(const Board& board, const Scene& scene, double seconds)
{
    Figures figures;
    int inserts = 0;
    int reads = 0;
    int least = board.work[0].done;
    for (std::size_t process = 0; process < scene.writers + scene.readers; ++process) {
        const Work& work = board.work.at(process);
        figures.givenUp += work.givenUp;
        if (process >= scene.writers) {
            reads += work.done;
            figures.worstReadMSec = std::max(figures.worstReadMSec, work.worstMSec);
            continue;
        }
        inserts += work.done;
        least = std::min(least, work.done);
        figures.worstMSec = std::max(figures.worstMSec, work.worstMSec);
        figures.processorPercent =
            std::max(figures.processorPercent, work.processorSeconds / seconds * 100);
    }
    Require(inserts > 0, "nothing was inserted");
    figures.insertsPerSecond = inserts / seconds;
    figures.leastShare = static_cast<double>(least) * static_cast<double>(scene.writers) / inserts;
    figures.readsPerSecond = reads / seconds;
    return figures;
}

template <class Engine>
Figures RunScene(const Scene& scene, int seconds)
{
    const TempDir dir(Place::Disk);
    const std::string path = dir.File("nodes.db");
    ExecText(OpenDatabase(path).get(), std::string("PRAGMA journal_mode=") + scene.journal);
    FillNodes(path, 1);
    const SharedBoard shared;
    Board& board = *shared.board;
    std::vector<pid_t> children;
    const std::size_t processes = scene.writers + scene.readers;
    for (std::size_t process = 0; process < processes; ++process) {
        children.push_back(Fork(
            [&] { RunProcess<Engine>(path, process, process < scene.writers, seconds, board); }));
    }
    while (board.ready < static_cast<int>(processes)) ::usleep(1000);
    const auto begin = Clock::now();
    board.isOpen = true;
    bool good = true;
    for (const pid_t child : children) {
        int status = 0;
        good = ::waitpid(child, &status, 0) == child && status == 0 && good;
    }
    Require(good, "a process failed");
    const std::chrono::duration<double> took = Clock::now() - begin;
    return Summarize(board, scene, took.count());
}

void Print(std::FILE* file, const char* format, const char* who, const Scene& scene,
           const Figures& figures)
{
    (void)std::fprintf(file, format, scene.journal, scene.writers, scene.readers, who,
                       figures.insertsPerSecond, figures.leastShare, figures.givenUp,
                       figures.worstMSec, figures.processorPercent, figures.readsPerSecond,
                       figures.worstReadMSec);
}

struct Library {
    const char* name;
    Figures (*run)(const Scene&, int);
};

// Opens a file and writes the caption; null if the path is empty.
using OpenFile = std::unique_ptr<std::FILE, int (*)(std::FILE*)>;
OpenFile OpenTable(const std::string& path, const char* caption)
{
    OpenFile file(path.empty() ? nullptr : std::fopen(path.c_str(), "we"), std::fclose);
    Require(path.empty() || file != nullptr, "cannot write the figures of writers");
    if (file != nullptr) (void)std::fputs(caption, file.get());
    return file;
}

}  // namespace

void RunWriters(const std::string& out, int seconds)
{
    const std::vector<Library> libraries
    {
        {Ours, RunScene<PatientOurs>}, {Bare, RunScene<PatientPeer<BareEngine>>},
#if BENCH_HAS_SQLITECPP
            {"SQLiteCpp", RunScene<PatientPeer<Peer<SqliteCpp>>>},
#endif
#if BENCH_HAS_SOCI
            {"SOCI", RunScene<PatientPeer<Peer<Soci>>>},
#endif
    };
    const OpenFile csv = OpenTable(out.empty() ? "" : out + ".csv",
                                   "journal,writers,readers,contestant,per_second,least_share,"
                                   "given_up,worst_ms,processor_percent,reads_per_second,"
                                   "worst_read_ms\n");
    const OpenFile page =
        OpenTable(out.empty() ? "" : out + ".md",
                  "| journal | writers | readers | who | inserts/s | least served | given up | "
                  "worst ms | processor | reads/s | worst read ms |\n"
                  "|---|--:|--:|---|--:|--:|--:|--:|--:|--:|--:|\n");
    std::printf("\n%-7s %7s %7s %-10s %9s %12s %8s %9s %9s %8s %9s\n", "journal", "writers",
                "readers", "who", "inserts/s", "least served", "given up", "worst ms", "processor",
                "reads/s", "worst ms");
    for (const char* journal : {"delete", "wal"}) {
        for (const Scene& scene :
             {Scene{journal, 1, 0}, Scene{journal, 16, 0}, Scene{journal, 64, 0},
              Scene{journal, 16, 4}, Scene{journal, 64, 16}}) {
            for (const Library& library : libraries) {
                const Figures figures = library.run(scene, seconds);
                Print(stdout, "%-7s %7zu %7zu %-10s %9.0f %12.2f %8d %9.1f %8.1f%% %8.0f %9.1f\n",
                      library.name, scene, figures);
                (void)std::fflush(stdout);
                if (out.empty()) continue;
                Print(csv.get(), "%s,%zu,%zu,%s,%.1f,%.3f,%d,%.3f,%.2f,%.1f,%.3f\n", library.name,
                      scene, figures);
                Print(page.get(),
                      "| %s | %zu | %zu | %s | %.0f | %.2f | %d | %.0f | %.1f %% | %.0f | %.0f |\n",
                      library.name, scene, figures);
            }
        }
    }
}

}  // namespace Bench
