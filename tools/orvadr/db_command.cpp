#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <set>

#include "base/json_helpers.h"
#include "base/process_status.h"
#include "commands.h"
#include "database.h"
#include "processes.h"
#include "text.h"

namespace Orvadr {

namespace {

using OrvaDRCore::ToJsonText;

// The bytes that SQLite locks: a writer that needs the file alone locks all of them but the second.
constexpr std::uint64_t FirstLockByte = 0x40000000;
constexpr std::uint64_t LastLockByte = FirstLockByte + 511;
constexpr std::uint64_t ReservedByte = FirstLockByte + 1;

// Shows on a terminal how far a check is that takes long.
class ProgressLine {
  public:
    explicit ProgressLine(const std::string& path) : path_(Printable(path)) {}
    ProgressLine(const ProgressLine&) = delete;
    ProgressLine& operator=(const ProgressLine&) = delete;
    ~ProgressLine()
    {
        if (isShown_) Write("\r\033[K");
    }

    void Show(int percent)
    {
        const auto now = Clock::now();
        if (!isTerminal_ || now - last_ < Pause) return;
        last_ = now;
        isShown_ = true;
        Write("\r\033[Kchecking " + path_ + ": " + std::to_string(percent) + " %");
    }

  private:
    using Clock = std::chrono::steady_clock;
    static constexpr std::chrono::milliseconds Pause{300};  // also before the first time

    static void Write(const std::string& text)
    {
        (void)std::fputs(text.c_str(), stderr);
        (void)std::fflush(stderr);
    }

    const std::string path_;
    const bool isTerminal_ = ::isatty(STDERR_FILENO) == 1;
    Clock::time_point last_ = Clock::now();
    bool isShown_ = false;
};

bool KeepsReadersOut(const KernelLock& lock)
{
    const bool isReservation = lock.from == ReservedByte && lock.to == ReservedByte;
    return lock.isExclusive && !isReservation && lock.from <= LastLockByte &&
           lock.to >= FirstLockByte;
}

// The processes that have the database open, or only those that keep readers out if `isLocked` and they
// are known. Those that may not be looked at are known by their locks.
Json::Value FindHolders(const std::string& path, bool isLocked)
{
    Json::Value holders(Json::arrayValue);
    struct stat status {};
    if (::stat(path.c_str(), &status) != 0) return holders;
    const FileId id{status.st_dev, status.st_ino};
    const std::optional<FileId> kernelId = KernelIdOf(path);
    std::set<pid_t> lockers;
    std::set<pid_t> blockers;
    for (const KernelLock& lock : ReadKernelLocks()) {
        if (lock.isFlock || lock.pid <= 0 || !(kernelId && lock.file == *kernelId)) continue;
        lockers.insert(lock.pid);
        if (KeepsReadersOut(lock)) blockers.insert(lock.pid);
    }
    FileUses uses = FindUses({id});
    std::set<pid_t> pids = uses.files[id].openers;
    pids.insert(lockers.begin(), lockers.end());
    if (isLocked && !blockers.empty()) pids = blockers;
    for (const pid_t pid : pids) {
        if (pid == ::getpid() || !OrvaDRCore::IsProcessAlive(pid)) continue;
        const bool isSeen = uses.seen.count(pid) > 0;
        holders.append(DescribeProcess(pid, isSeen ? CommandOf(pid) : NotPermitted));
    }
    return holders;
}

const char* NameOf(DatabaseState state)
{
    switch (state) {
        case DatabaseState::Ok: return "ok";
        case DatabaseState::Damaged: return "damaged";
        case DatabaseState::Locked: return "locked";
        case DatabaseState::Missing: return "missing";
        default: return "unreadable";
    }
}

ExitCode CodeOf(DatabaseState state)
{
    if (state == DatabaseState::Ok) return ExitCode::AllWell;
    return state == DatabaseState::Unreadable ? ExitCode::NotSeen : ExitCode::NotWell;
}

Json::Value Describe(const std::string& path, const DatabaseLook& look)
{
    Json::Value object(Json::objectValue);
    object["path"] = ToJsonText(path);
    object["state"] = NameOf(look.state);
    object["journal_mode"] =
        look.journalMode.empty() ? Json::Value() : Json::Value(look.journalMode);
    object["size_bytes"] = look.size ? Json::Value(Json::Int64{*look.size}) : Json::Value();
    object["tables"] = Json::Value(Json::arrayValue);
    for (const TableLook& table : look.tables) {
        Json::Value& entry = object["tables"].append(Json::Value(Json::objectValue));
        entry["name"] = ToJsonText(table.name);
        entry["rows"] = table.rows ? Json::Value(Json::Int64{*table.rows}) : Json::Value();
    }
    object["problems"] = Json::Value(Json::arrayValue);
    for (const std::string& problem : look.problems) object["problems"].append(ToJsonText(problem));
    object["holders"] = FindHolders(path, look.state == DatabaseState::Locked);
    return object;
}

void ReportOne(const std::string& path, Report& report)
{
    ProgressLine line(path);
    const DatabaseLook look = LookAtDatabase(path, [&](int percent) { line.Show(percent); });
    if (!look.reason.empty() && look.state == DatabaseState::Unreadable) {
        report.remarks.push_back(Printable(path) + ": " + look.reason);
    }
    report.Worsen(CodeOf(look.state));
    report.objects.append(Describe(path, look));
}

std::string TableLine(const Json::Value& table)
{
    const Json::Value& rows = table["rows"];
    return Printable(table["name"].asString()) + " " + (rows.isNull() ? "?" : rows.asString());
}

std::string ProblemLine(const Json::Value& problem)
{
    return Printable(problem.asString());
}

}  // namespace

Report ReportDatabases(const std::vector<std::string>& files)
{
    Report report;
    report.columns = {TextColumn("STATE", "state"),
                      TextColumn("JOURNAL", "journal_mode"),
                      {"SIZE", SizeCell},
                      TextColumn("FILE", "path"),
                      LinesColumn("TABLES", "tables", TableLine),
                      LinesColumn("PROBLEMS", "problems", ProblemLine),
                      LinesColumn("HOLDERS", "holders", ProcessLine)};
    for (const std::string& file : files) ReportOne(file, report);
    return report;
}

}  // namespace Orvadr
