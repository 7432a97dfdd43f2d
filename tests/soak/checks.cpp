#include "checks.h"

#include <fcntl.h>
#include <signal.h>
#include <sqlite3.h>
#include <sys/file.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <memory>
#include <set>
#include <system_error>
#include <thread>

#include "process.h"

namespace Soak {

namespace {

constexpr milliseconds LookEvery{20};

struct CloseDatabase {
    void operator()(sqlite3* database) const { sqlite3_close(database); }
};
using Database = std::unique_ptr<sqlite3, CloseDatabase>;

std::string ColumnText(sqlite3_stmt* statement, int column)
{
    const auto* text = sqlite3_column_text(statement, column);
    return text == nullptr ? "" : reinterpret_cast<const char*>(text);
}

// Calls `take` for each row. False if the statement fails.
bool ForEachRow(sqlite3* database, const char* text, const std::function<void(sqlite3_stmt*)>& take)
{
    sqlite3_stmt* statement = nullptr;
    if (sqlite3_prepare_v2(database, text, -1, &statement, nullptr) != SQLITE_OK) return false;
    int code = sqlite3_step(statement);
    for (; code == SQLITE_ROW; code = sqlite3_step(statement)) take(statement);
    sqlite3_finalize(statement);
    return code == SQLITE_DONE;
}

std::set<std::string> NamesIn(const std::string& directory)
{
    std::set<std::string> names;
    std::error_code ignored;
    for (const auto& entry : std::filesystem::directory_iterator(directory, ignored)) {
        names.insert(entry.path().filename());
    }
    return names;
}

// Describes the processes that have a file open.
std::string HoldersOf(const std::string& path)
{
    std::string holders;
    std::error_code ignored;
    for (const auto& process : std::filesystem::directory_iterator("/proc", ignored)) {
        const pid_t pid = std::atoi(process.path().filename().c_str());
        if (pid <= 0 || pid == ::getpid()) continue;
        for (const auto& open :
             std::filesystem::directory_iterator(process.path() / "fd", ignored)) {
            if (!std::filesystem::equivalent(open.path(), path, ignored)) continue;
            holders += (holders.empty() ? "" : "; ") + Describe(pid);
            break;
        }
    }
    return holders;
}

// Our children that should have ended. The neighbour's programs end by themselves.
std::vector<pid_t> UnexpectedChildren()
{
    std::vector<pid_t> children = ChildrenOf(::getpid());
    const auto isProgram = [](pid_t pid) {
        return CommandOf(pid).compare(0, 11, "/bin/sleep ") == 0;
    };
    children.erase(std::remove_if(children.begin(), children.end(), isProgram), children.end());
    return children;
}

}  // namespace

Comparison CheckDatabase(const std::string& path, const std::vector<const Ledger*>& ledgers,
                         Findings& findings)
{
    sqlite3* opened = nullptr;
    const int code = sqlite3_open_v2(path.c_str(), &opened, SQLITE_OPEN_READONLY, nullptr);
    const Database database(opened);
    std::vector<Row> rows;
    const auto takeRow = [&](sqlite3_stmt* row) {
        rows.push_back({ColumnText(row, 0), ColumnText(row, 1), sqlite3_column_int(row, 2)});
    };
    const auto takeProblem = [&](sqlite3_stmt* row) {
        const std::string problem = ColumnText(row, 0);
        if (problem != "ok") findings.Add(Promise::Integrity, problem);
    };
    if (code != SQLITE_OK || !ForEachRow(opened, "PRAGMA integrity_check", takeProblem) ||
        !ForEachRow(opened, "SELECT id,name,port FROM nodes", takeRow)) {
        findings.Add(Promise::Integrity, sqlite3_errmsg(opened));
        return {};
    }
    Comparison comparison = Compare(ledgers, rows);
    for (const std::string& problem : comparison.problems) findings.Add(Promise::Stored, problem);
    return comparison;
}

void CheckLock(const std::string& lockFile, Findings& findings)
{
    const int file = ::open(lockFile.c_str(), O_RDONLY | O_CLOEXEC);
    if (file >= 0 && ::flock(file, LOCK_EX | LOCK_NB) != 0) {
        findings.Add(Promise::LeftOvers, lockFile + " is locked by " + HoldersOf(lockFile));
    }
    if (file >= 0) ::close(file);
}

void CheckFiles(const Plan& plan, Findings& findings)
{
    const struct {
        std::string directory;
        std::set<std::string> expected;
    } places[] = {
        {std::filesystem::path(plan.Database()).parent_path(), {"nodes.db"}},
        {plan.StatusDirectory(), {"nodes.db.status.cached"}},
    };
    for (const auto& place : places) {
        const std::set<std::string> found = NamesIn(place.directory);
        for (const std::string& name : found) {
            if (place.expected.count(name) == 0) {
                findings.Add(Promise::LeftOvers, place.directory + "/" + name + " is left");
            }
        }
        for (const std::string& name : place.expected) {
            if (found.count(name) == 0) {
                findings.Add(Promise::LeftOvers, place.directory + "/" + name + " is missing");
            }
        }
    }
}

void CheckProcesses(const Plan& plan, Findings& findings)
{
    const auto deadline = Clock::now() + plan.bounds.end;
    std::vector<pid_t> left = UnexpectedChildren();
    while (!left.empty() && Clock::now() < deadline) {
        std::this_thread::sleep_for(LookEvery);
        left = UnexpectedChildren();
    }
    for (const pid_t pid : left) {
        findings.Add(Promise::Ends, "still there: " + Describe(pid));
        ::kill(pid, SIGKILL);
    }
}

void CheckGap(const Plan& plan, const std::string& name, milliseconds longestGap,
              Findings& findings)
{
    if (longestGap <= plan.bounds.gap) return;
    findings.Add(Promise::Starvation,
                 name + " got no answer for " + std::to_string(longestGap.count()) + " ms");
}

void CheckShares(const Plan& plan, const std::vector<const Client*>& clients, Findings& findings)
{
    std::size_t all = 0;
    for (const Client* client : clients) all += client->CountAnswers();
    const double average = static_cast<double>(all) / static_cast<double>(clients.size());
    if (average < plan.bounds.smallAverage) return;
    for (const Client* client : clients) {
        const std::size_t count = client->CountAnswers();
        if (static_cast<double>(count) >= average * plan.bounds.share) continue;
        findings.Add(Promise::Starvation, client->Name() + " got " + std::to_string(count) +
                                              " answers, where the average is " +
                                              std::to_string(std::lround(average)));
    }
}

}  // namespace Soak
