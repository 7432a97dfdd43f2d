#include <orvacore/orvacore.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <ctime>
#include <optional>

#include "base/file_io.h"
#include "base/json_helpers.h"
#include "cache/cache_document.h"
#include "cache/freshness.h"
#include "cache/updater_mark.h"
#include "commands.h"
#include "processes.h"
#include "text.h"

namespace Orvadr {

namespace {

using OrvaDRCore::CacheFacts;
using OrvaDRCore::ToJsonText;
using OrvaDRCore::UpdaterMark;

// Larger files are not parsed, because a document may take fifty times its size in memory.
constexpr std::size_t LargestDocument = 16U << 20U;

// A cache file and, unless that is fresh or stale, what is wrong with it.
struct CacheLook {
    bool isMissing = false;
    std::optional<struct stat> status;
    std::optional<CacheFacts> facts;
    std::string trouble;
    ExitCode code = ExitCode::NotWell;
};

CacheLook Trouble(CacheLook look, const std::string& trouble, ExitCode code)
{
    look.trouble = trouble;
    look.code = code;
    return look;
}

bool IsAbsence(int error)
{
    return error == ENOENT || error == ENOTDIR;
}

bool BeginsLikeAnObject(const std::string& text)
{
    const std::size_t first = text.find_first_not_of(" \t\r\n");
    return first != std::string::npos && text[first] == '{';
}

// Opens nothing but a regular file, because to open another may wait or have an effect.
CacheLook LookAt(const std::string& path)
{
    CacheLook look;
    struct stat status {};
    if (::stat(path.c_str(), &status) != 0) {
        const int error = errno;
        look.isMissing = IsAbsence(error);
        return look.isMissing ? look : Trouble(look, ErrorText(error), ExitCode::NotSeen);
    }
    look.status = status;
    if (!S_ISREG(status.st_mode)) return Trouble(look, "no regular file", ExitCode::NotSeen);

    std::string text;
    if (!OrvaDRCore::ReadRegularFile(path, text, LargestDocument + 1)) {
        return Trouble(look, ErrorText(errno), ExitCode::NotSeen);
    }
    Json::Value document;
    if (text.size() > LargestDocument && BeginsLikeAnObject(text)) {
        return Trouble(look, "larger than 16 MiB, not read", ExitCode::NotSeen);
    }
    if (text.size() > LargestDocument || !OrvaDRCore::fromString(document, text)) {
        return Trouble(look, "no JSON document", ExitCode::NotWell);
    }
    look.facts = OrvaDRCore::ReadCacheFacts(document);
    return look.facts ? look : Trouble(look, "no document of a cache", ExitCode::NotWell);
}

// The living process in the pid file, or null. Takes no lock: the file is replaced as a whole.
Json::Value FindUpdater(const std::string& cachePath, Report& report)
{
    const UpdaterMark mark(cachePath);
    const std::string& path = mark.GetPidPath();
    struct stat status {};
    if (::stat(path.c_str(), &status) != 0 || !S_ISREG(status.st_mode)) return {};
    if (::access(path.c_str(), R_OK) != 0) {
        report.remarks.push_back(Printable(path) + ": " + ErrorText(errno));
        report.Worsen(ExitCode::NotSeen);
        return {};
    }
    const pid_t pid = mark.Read();
    if (pid <= 0 || CoreLibProcAlive(pid) != 1) return {};
    Json::Value updater = DescribeProcess(pid, CommandOf(pid));
    updater["since"] = Json::Int64{status.st_mtime};
    return updater;
}

// Null for what is not known.
template <class Type, class Number>
Json::Value ToJson(const std::optional<Number>& number)
{
    return number ? Json::Value(Type{*number}) : Json::Value();
}

const char* StateOf(const CacheLook& look)
{
    if (look.isMissing) return "missing";
    if (!look.facts) return "unreadable";
    const std::optional<std::int64_t>& timeout = look.facts->timeout;
    const bool isFresh = timeout && !OrvaDRCore::IsTooOld(look.status->st_mtime, *timeout);
    return isFresh ? "fresh" : "stale";
}

Json::Value Describe(const std::string& path, const CacheLook& look)
{
    Json::Value object(Json::objectValue);
    object["path"] = ToJsonText(path);
    object["state"] = StateOf(look);
    object["age_seconds"] = Json::Value();
    object["size_bytes"] = Json::Value();
    if (look.status) {
        object["age_seconds"] = Json::Int64{std::time(nullptr) - look.status->st_mtime};
        object["size_bytes"] = Json::Int64{look.status->st_size};
    }
    const bool isRead = look.facts.has_value();
    const CacheFacts facts = look.facts.value_or(CacheFacts{});
    object["timeout_seconds"] = ToJson<Json::Int64>(facts.timeout);
    object["begin"] = ToJson<Json::Int64>(facts.begin);
    object["finish"] = ToJson<Json::Int64>(facts.finish);
    object["last_refresh_seconds"] = ToJson<double>(facts.lastRefresh);
    object["longest_refresh_seconds"] = isRead ? Json::Value(facts.longestRefresh) : Json::Value();
    object["info"] = facts.info;
    return object;
}

void ReportOne(const std::string& path, Report& report)
{
    const CacheLook look = LookAt(path);
    Json::Value object = Describe(path, look);
    object["updater"] = FindUpdater(path, report);
    if (!look.trouble.empty()) report.remarks.push_back(Printable(path) + ": " + look.trouble);
    if (object["state"] != "fresh") report.Worsen(look.code);
    report.objects.append(std::move(object));
}

Column DurationColumn(const char* title, const char* key)
{
    return {title, [key](const Json::Value& object) {
                const Json::Value& seconds = object[key];
                return seconds.isNull() ? "" : DurationText(seconds.asDouble());
            }};
}

std::string UpdaterLines(const Json::Value& updater)
{
    if (updater.isNull()) return {};
    return ProcessLine(updater) + "\nsince " + TimeText(updater["since"].asInt64());
}

}  // namespace

Report ReportCaches(const std::vector<std::string>& files)
{
    Report report;
    report.columns = {
        TextColumn("STATE", "state"),
        DurationColumn("AGE", "age_seconds"),
        DurationColumn("TIME-OUT", "timeout_seconds"),
        DurationColumn("LAST", "last_refresh_seconds"),
        DurationColumn("LONGEST", "longest_refresh_seconds"),
        {"SIZE", SizeCell},
        TextColumn("FILE", "path"),
        {"UPDATER", [](const Json::Value& object) { return UpdaterLines(object["updater"]); }}};
    for (const std::string& file : files) ReportOne(file, report);
    return report;
}

}  // namespace Orvadr
