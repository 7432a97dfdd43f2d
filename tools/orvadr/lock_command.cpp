#include <sys/stat.h>

#include <cerrno>
#include <filesystem>
#include <optional>
#include <set>
#include <system_error>

#include <orvadrcore/file.h>
#include <orvadrcore/file_lock.h>

#include "base/json_helpers.h"
#include "base/process_status.h"
#include "commands.h"
#include "processes.h"
#include "text.h"

namespace Orvadr {

namespace {

namespace fs = std::filesystem;

using OrvaDRCore::FileLock;
using OrvaDRCore::ToJsonText;

// What the system knows about locks, looked up once for all lock files.
struct Knowledge {
    std::vector<KernelLock> locks;
    FileUses uses;
};

struct LockFile {
    std::string name;
    std::string path;
    int error;                 // why the file could not be looked at
    std::optional<FileId> id;  // none if it is missing
};

LockFile LookAt(const std::string& name)
{
    LockFile file{name, FileLock::getLockFilePath(name), 0, std::nullopt};
    struct stat status {};
    if (::stat(file.path.c_str(), &status) == 0) {
        if (!S_ISDIR(status.st_mode)) file.id = FileId{status.st_dev, status.st_ino};
    } else if (errno != ENOENT && errno != ENOTDIR) {
        file.error = errno;
    }
    return file;
}

void NoteUnseen(const std::string& path, const std::string& reason, Report& report)
{
    report.remarks.push_back(Printable(path) + ": " + reason);
    report.Worsen(ExitCode::NotSeen);
}

// Adds the names of all lock files in a directory and below. Names begin below the lock directory.
void ListNames(const fs::path& directory, const std::string& prefix, std::set<std::string>& names,
               Report& report)
{
    std::error_code error;
    fs::directory_iterator at(directory, error);
    for (; !error && at != fs::directory_iterator(); at.increment(error)) {
        std::error_code ignored;
        const std::string name = prefix + at->path().filename().string();
        if (!at->is_directory(ignored)) {
            names.insert(name);
        } else if (!at->is_symlink(ignored)) {
            ListNames(at->path(), name + "/", names, report);
        }
    }
    const bool isMissing = error == std::errc::no_such_file_or_directory;
    if (error && !isMissing) NoteUnseen(directory.string(), error.message(), report);
}

// Adds a holder that has the lock according to the kernel, but whose open files may not be seen.
void AddUnseenHolders(const std::vector<KernelLock>& locks, const FileUses& uses,
                      Json::Value& holders)
{
    for (const KernelLock& lock : locks) {
        const bool isUnseen = lock.pid > 0 && uses.seen.count(lock.pid) == 0;
        if (isUnseen && OrvaDRCore::IsProcessAlive(lock.pid)) {
            holders.append(DescribeProcess(lock.pid, NotPermitted));
        }
    }
}

std::vector<KernelLock> FlocksOf(const std::string& path, const Knowledge& knowledge)
{
    std::vector<KernelLock> locks;
    const std::optional<FileId> id = KernelIdOf(path);
    for (const KernelLock& lock : knowledge.locks) {
        if (lock.isFlock && id && lock.file == *id) locks.push_back(lock);
    }
    return locks;
}

void DescribeHolders(const LockFile& file, Knowledge& knowledge, Json::Value& object,
                     Report& report)
{
    const FileUse& use = knowledge.uses.files[*file.id];
    const std::vector<KernelLock> locks = FlocksOf(file.path, knowledge);
    bool isExclusive = false;
    Json::Value& holders = object["holders"];
    for (const auto& [pid, holdsExclusive] : use.flockHolders) {
        isExclusive = isExclusive || holdsExclusive;
        holders.append(DescribeProcess(pid, CommandOf(pid)));
    }
    AddUnseenHolders(locks, knowledge.uses, holders);
    for (const KernelLock& lock : locks) isExclusive = isExclusive || lock.isExclusive;

    const bool isHeld = !locks.empty() || !holders.empty();
    object["state"] = isExclusive ? "exclusive" : isHeld ? "shared" : "free";
    if (isHeld && holders.empty() && !knowledge.uses.isComplete) {
        NoteUnseen(file.path, "held by a process that may not be looked at", report);
    }
}

void Describe(const LockFile& file, Knowledge& knowledge, Report& report)
{
    Json::Value object(Json::objectValue);
    object["name"] = ToJsonText(file.name);
    object["path"] = ToJsonText(file.path);
    object["state"] = "missing";
    object["holders"] = Json::Value(Json::arrayValue);
    if (file.error != 0) {
        object["state"] = Json::Value();
        NoteUnseen(file.path, ErrorText(file.error), report);
    } else if (file.id) {
        DescribeHolders(file, knowledge, object, report);
    }
    report.objects.append(std::move(object));
}

bool IsHeld(const Json::Value& object)
{
    return object["state"] == "shared" || object["state"] == "exclusive";
}

}  // namespace

Report ReportLocks(const std::vector<std::string>& namesOrNone)
{
    Report report;
    report.columns = {TextColumn("STATE", "state", "?"), TextColumn("NAME", "name"),
                      LinesColumn("HOLDERS", "holders", ProcessLine)};

    std::vector<std::string> names = namesOrNone;
    if (names.empty()) {
        std::set<std::string> all;
        ListNames(OrvaDRCore::File::GetParentDir(FileLock::getLockFilePath("any")), "", all,
                  report);
        names.assign(all.begin(), all.end());
    }
    std::vector<LockFile> files;
    std::set<FileId> ids;
    for (const std::string& name : names) {
        files.push_back(LookAt(name));
        if (files.back().id) ids.insert(*files.back().id);
    }
    Knowledge knowledge{ReadKernelLocks(), FindUses(ids)};
    for (const LockFile& file : files) Describe(file, knowledge, report);

    for (const Json::Value& object : report.objects) {
        if (!namesOrNone.empty() && IsHeld(object)) report.Worsen(ExitCode::NotWell);
    }
    return report;
}

}  // namespace Orvadr
