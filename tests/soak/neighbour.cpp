#include "neighbour.h"

#include <spawn.h>
#include <sqlite3.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <deque>
#include <fstream>
#include <iterator>
#include <locale>
#include <thread>
#include <vector>

#include "examples/node_registry/handler.h"
#include "plan.h"

namespace Soak {

namespace {

constexpr milliseconds ReadEvery{20};
constexpr milliseconds StartEvery{50};
constexpr std::size_t MaxStarted = 40;  // alive at a time
constexpr const char* SleepSeconds = "2";
constexpr int BusyThreads = 2;
constexpr std::chrono::microseconds BusyEvery{200};

constexpr int LockPatienceMSec = 10'000;

// Starts programs that live for a while and inherit every descriptor that is not close-on-exec.
void StartPrograms(const std::atomic<bool>& isEnding)
{
    std::string program = "/bin/sleep";
    std::string argument = SleepSeconds;
    std::array<char*, 3> words = {program.data(), argument.data(), nullptr};
    std::deque<pid_t> started;
    while (!isEnding) {
        pid_t pid = -1;
        if (started.size() < MaxStarted &&
            ::posix_spawn(&pid, words[0], nullptr, nullptr, words.data(), environ) == 0) {
            started.push_back(pid);
        }
        while (!started.empty() && ::waitpid(started.front(), nullptr, WNOHANG) != 0) {
            started.pop_front();
        }
        std::this_thread::sleep_for(StartEvery);
    }
}

// Takes locks of the C and C++ libraries all the time: for syslog, time zones, locales, memory and
// a stream.
void KeepBusy(const std::atomic<bool>& isEnding)
{
    std::ofstream nowhere("/dev/null");
    while (!isEnding) {
        ::syslog(LOG_DEBUG, "the neighbour is busy");
        const std::time_t now = std::time(nullptr);
        std::tm local{};
        ::localtime_r(&now, &local);
        const std::locale copy;
        nowhere << std::vector<int>(100).size() << local.tm_sec << copy.name() << std::flush;
        std::this_thread::sleep_for(BusyEvery);
    }
}

void ReadStatus(const std::string& database, const std::string& statusDirectory,
                const std::atomic<bool>& isEnding)
{
    NodeRegistry::Settings settings;
    settings.database = database;
    settings.statusDirectory = statusDirectory;
    settings.statusTimeout = 0;
    NodeRegistry::Handler handler(settings);
    while (!isEnding) {
        const Json::Value reply =
            handler.Answer(R"({"api":"DR.Node","version":1,"method":"status"})");
        std::puts(reply["success"].asBool() ? "read" : "failed");
        static_cast<void>(std::fflush(stdout));
        std::this_thread::sleep_for(ReadEvery);
    }
}

bool Run(sqlite3* database, const char* statement)
{
    return sqlite3_exec(database, statement, nullptr, nullptr, nullptr) == SQLITE_OK;
}

}  // namespace

int RunNeighbour(const std::string& database, const std::string& statusDirectory)
{
    // A locale of our own, because streams copy the classic one without a lock.
    std::locale::global(std::locale(std::locale(), new std::numpunct<char>));
    static_cast<void>(std::signal(SIGPIPE, SIG_IGN));
    std::atomic<bool> isEnding{false};
    std::vector<std::thread> threads;
    threads.emplace_back([&] { ReadStatus(database, statusDirectory, isEnding); });
    threads.emplace_back([&] { StartPrograms(isEnding); });
    for (int count = 0; count < BusyThreads; ++count) {
        threads.emplace_back([&] { KeepBusy(isEnding); });
    }
    char byte = 0;
    while (::read(STDIN_FILENO, &byte, 1) > 0) {
    }
    isEnding = true;
    for (std::thread& thread : threads) thread.join();
    return EXIT_SUCCESS;
}

int HoldLock(const std::string& path)
{
    sqlite3* database = nullptr;
    bool isHeld = sqlite3_open(path.c_str(), &database) == SQLITE_OK;
    sqlite3_busy_timeout(database, LockPatienceMSec);
    isHeld = isHeld && Run(database, "BEGIN EXCLUSIVE");
    if (isHeld) std::this_thread::sleep_for(LockIsHeld);
    isHeld = isHeld && Run(database, "COMMIT");
    sqlite3_close(database);
    return isHeld ? EXIT_SUCCESS : EXIT_FAILURE;
}

}  // namespace Soak
