#include "base/replace_file.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/utsname.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <charconv>
#include <climits>
#include <cstdint>
#include <cstdio>
#include <ctime>
#include <limits>
#include <memory>

#include "base/errno.h"
#include "base/file_io.h"
#include "base/process_status.h"

namespace OrvaDRCore {

namespace {

constexpr mode_t PermissionBits = 07777;
constexpr mode_t NewFileMode = 0666;  // the kernel takes the umask off
constexpr mode_t OwnerOnly = 0600;    // until the file gets its own bits

constexpr const char* TemporarySuffix = ".orvadr-tmp";
constexpr std::size_t LongestEnding = 56;  // the suffix, and the longest numbers
constexpr unsigned int LastNumber = 9999;  // of the files of one process beside one path

constexpr double UnknownWriterSeconds =
    3600;                                // a file of an unknown writer is left over after that
constexpr std::size_t SomeNames = 4000;  // listing so many takes about a millisecond
constexpr std::size_t AllNames = std::numeric_limits<std::size_t>::max();

// Who writes a temporary file: part of its name.
struct Writer {
    std::uint32_t domain;  // in which process ids are unique; 0 when not known
    pid_t pid;
    unsigned long long start;  // in clock ticks since boot; 0 when not known
};

// A hash of the machine's name and the process-id namespace: on a network file system, or a volume
// that containers share, another process may have the same id. 0 if they are unknown.
std::uint32_t ReadDomain()
{
    std::array<char, 64> space{};  // "pid:[4026531836]"
    utsname machine{};
    if (::readlink("/proc/self/ns/pid", space.data(), space.size() - 1) < 0) return 0;
    if (::uname(&machine) < 0) return 0;
    std::uint32_t hash = 2166136261;  // FNV-1a
    for (const char byte : std::string(machine.nodename) + "/" + space.data()) {
        hash = (hash ^ static_cast<unsigned char>(byte)) * 16777619;
    }
    return hash;
}

Writer ThisProcess()
{
    const pid_t pid = ::getpid();
    const auto status = ReadProcessStatus(pid);
    return {ReadDomain(), pid, status ? status->start : 0};
}

// What follows the suffix: "3f9c01a7.4242.1870113.0".
std::string WriterText(const Writer& writer, unsigned int number)
{
    std::array<char, LongestEnding> text{};
    (void)std::snprintf(text.data(), text.size(), "%08x.%d.%llu.%u", writer.domain, writer.pid,
                        writer.start, number);
    return text.data();
}

// Removes a number, and a dot after it, from the beginning of the text.
template <class Number>
bool TakeNumber(std::string_view& text, Number& number, int base = 10)
{
    const char* const begin = text.data();
    const auto [end, error] = std::from_chars(begin, begin + text.size(), number, base);
    text.remove_prefix(static_cast<std::size_t>(end - begin));
    if (!text.empty() && text.front() == '.') text.remove_prefix(1);
    return error == std::errc();
}

// The writer named by a WriterText(); none for any other text.
std::optional<Writer> ParseWriter(const std::string_view text)
{
    Writer writer{};
    unsigned int number = 0;
    std::string_view rest = text;
    const bool isParsed = TakeNumber(rest, writer.domain, 16) && TakeNumber(rest, writer.pid) &&
                          TakeNumber(rest, writer.start) && TakeNumber(rest, number);
    if (!isParsed || writer.pid <= 0 || WriterText(writer, number) != text) return std::nullopt;
    return writer;
}

// Whether nobody writes a temporary file any more. A process of another domain cannot be checked: its
// file has to be old.
bool IsLeftOver(const std::string& path, const Writer& writer, const Writer& self)
{
    struct stat status {};
    if (::lstat(path.c_str(), &status) < 0 || !S_ISREG(status.st_mode)) return false;
    if (writer.domain != 0 && writer.domain == self.domain) {
        return !IsProcessAlive(writer.pid, writer.start);
    }
    return std::difftime(std::time(nullptr), status.st_mtime) > UnknownWriterSeconds;
}

struct CloseDirectory {
    void operator()(DIR* names) const { (void)::closedir(names); }
};

// Removes the left-overs whose path begins with `stem`, if they are among the first `most` names of
// the directory. What cannot be listed or removed stays.
void RemoveLeftOvers(const std::string& stem, const Writer& self, std::size_t most)
{
    const std::size_t nameAt = stem.rfind('/') + 1;  // 0 when there is none
    const std::string directory = stem.substr(0, nameAt);
    const std::string_view beginning = std::string_view(stem).substr(nameAt);
    const std::unique_ptr<DIR, CloseDirectory> names(::opendir((directory + ".").c_str()));
    for (std::size_t count = 0; names != nullptr && count < most; ++count) {
        const dirent* entry = ::readdir(names.get());  // NOLINT(concurrency-mt-unsafe): our own
        if (entry == nullptr) return;
        const std::string_view name = entry->d_name;
        if (name.substr(0, beginning.size()) != beginning) continue;
        const auto writer = ParseWriter(name.substr(beginning.size()));
        const std::string path = directory + entry->d_name;
        if (writer && IsLeftOver(path, *writer, self)) ::unlink(path.c_str());
    }
}

// How all temporary files for `path` begin: the path, its name shortened so that the longest ending
// fits NAME_MAX, and the suffix.
std::string StemOf(const std::string& path)
{
    const std::size_t nameAt = path.rfind('/') + 1;  // 0 when there is none
    return path.substr(0, nameAt + NAME_MAX - LongestEnding) + TemporarySuffix;
}

// Makes a new file and returns its path, too. Never opens what already exists, not even through a
// symbolic link.
FileDescriptor MakeTemporary(const std::string& stem, const Writer& self, mode_t mode,
                             std::string& path)
{
    for (unsigned int number = 0;; ++number) {  // other threads use the lower ones
        path = stem + WriterText(self, number);
        FileDescriptor file(path, O_WRONLY | O_CREAT | O_EXCL, mode);
        if (file.IsOpen() || errno != EEXIST || number == LastNumber) return file;
    }
}

bool Complete(const FileDescriptor& file, std::string_view text, std::optional<mode_t> mode,
              const std::string& temporary, const std::string& path)
{
    return WriteAll(file.Get(), text) && (!mode || ::fchmod(file.Get(), *mode) == 0) &&
           ::fsync(file.Get()) == 0 && std::rename(temporary.c_str(), path.c_str()) == 0;
}

}  // namespace

bool ReplaceFile(const std::string& path, std::string_view text, std::optional<mode_t> mode,
                 struct stat* made)
{
    struct stat old {};
    const bool isFile = ::stat(path.c_str(), &old) == 0 && S_ISREG(old.st_mode);
    if (!mode && isFile) mode = old.st_mode & PermissionBits;

    const std::string stem = StemOf(path);
    const Writer self = ThisProcess();
    // The first writer in each second lists a large directory completely.
    const bool isFirst = old.st_mtime != std::time(nullptr);
    RemoveLeftOvers(stem, self, isFirst ? AllNames : SomeNames);

    std::string temporary;
    const FileDescriptor file =
        MakeTemporary(stem, self, mode ? OwnerOnly : NewFileMode, temporary);
    if (!file.IsOpen()) return false;
    if (Complete(file, text, mode, temporary, path)) {
        // By descriptor: somebody else may have replaced `path` by now.
        if (made != nullptr && ::fstat(file.Get(), made) < 0) *made = {};
        return true;
    }

    const PreserveErrno preserve;
    ::unlink(temporary.c_str());
    return false;
}

}  // namespace OrvaDRCore
