#include "processes.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <functional>
#include <memory>
#include <optional>

#include "base/file_io.h"
#include "base/json_helpers.h"
#include "text.h"

namespace Orvadr {

namespace {

constexpr std::size_t LongestCommand = 4096;

using Directory = std::unique_ptr<DIR, int (*)(DIR*)>;

Directory OpenDirectory(const std::string& path)
{
    return {::opendir(path.c_str()), ::closedir};
}

// Calls a function with each name in a directory that is a number.
void ForEachNumber(const Directory& directory, const std::function<void(int)>& take)
{
    // NOLINTNEXTLINE(concurrency-mt-unsafe): each directory has one reader
    while (const dirent* const entry = ::readdir(directory.get())) {
        const std::string name = entry->d_name;
        int number = 0;
        const char* const end = name.data() + name.size();
        const auto [stop, error] = std::from_chars(name.data(), end, number);
        if (error == std::errc() && stop == end) take(number);
    }
}

std::string PathOf(pid_t pid, const char* name)
{
    return "/proc/" + std::to_string(pid) + "/" + name;
}

// Notes a process that has one of the files open as this descriptor.
void NoteUse(pid_t pid, int fd, FileUse& use)
{
    use.openers.insert(pid);
    std::string text;
    (void)OrvaDRCore::ReadRegularFile(PathOf(pid, "fdinfo/") + std::to_string(fd), text);
    for (const KernelLock& lock : ParseLocks(text)) {
        if (lock.isFlock) use.flockHolders[pid] = use.flockHolders[pid] || lock.isExclusive;
    }
}

void NoteUses(pid_t pid, const std::set<FileId>& files, FileUses& uses)
{
    const Directory descriptors = OpenDirectory(PathOf(pid, "fd"));
    if (!descriptors) {
        const bool hasEnded = errno == ENOENT || errno == ESRCH;
        uses.isComplete = uses.isComplete && hasEnded;
        return;
    }
    bool isSeen = true;
    ForEachNumber(descriptors, [&](int fd) {
        struct stat status {};
        const std::string name = std::to_string(fd);
        if (::fstatat(::dirfd(descriptors.get()), name.c_str(), &status, 0) != 0) {
            isSeen = isSeen && errno != EACCES;  // the list can be seen, but not what is in it
            return;
        }
        const FileId id{status.st_dev, status.st_ino};
        if (files.count(id) > 0) NoteUse(pid, fd, uses.files[id]);
    });
    if (isSeen) uses.seen.insert(pid);
    uses.isComplete = uses.isComplete && isSeen;
}

}  // namespace

std::string CommandOf(pid_t pid)
{
    std::string command;
    if (!OrvaDRCore::ReadRegularFile(PathOf(pid, "cmdline"), command, LongestCommand)) {
        return NotPermitted;
    }
    const std::size_t last = command.find_last_not_of('\0');
    command.erase(last == std::string::npos ? 0 : last + 1);
    if (command.empty()) {
        (void)OrvaDRCore::ReadRegularFile(PathOf(pid, "comm"), command, LongestCommand);
        return "[" + command.substr(0, command.find('\n')) + "]";
    }
    std::replace(command.begin(), command.end(), '\0', ' ');
    return command;
}

Json::Value DescribeProcess(pid_t pid, const std::string& command)
{
    Json::Value object(Json::objectValue);
    object["pid"] = pid;
    object["command"] = OrvaDRCore::ToJsonText(command);
    return object;
}

std::string ProcessLine(const Json::Value& process)
{
    return process["pid"].asString() + " " + Printable(process["command"].asString());
}

FileUses FindUses(const std::set<FileId>& files)
{
    FileUses uses;
    const Directory processes = OpenDirectory("/proc");
    uses.isComplete = processes != nullptr;
    if (processes) ForEachNumber(processes, [&](pid_t pid) { NoteUses(pid, files, uses); });
    return uses;
}

}  // namespace Orvadr
