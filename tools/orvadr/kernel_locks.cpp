#include "kernel_locks.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>

#include <limits>
#include <locale>
#include <sstream>

#include "base/file_io.h"

namespace Orvadr {

namespace {

constexpr const char* LockTable = "/proc/locks";
constexpr const char* MountTable = "/proc/self/mountinfo";

// Reads "fe:00:1234", with a device in hexadecimal digits.
bool ReadFileId(std::istream& words, FileId& file)
{
    unsigned int major = 0;
    unsigned int minor = 0;
    char colon = 0;
    words >> std::hex >> major >> colon >> minor >> colon >> std::dec >> file.inode;
    file.device = ::makedev(major, minor);
    return !words.fail();
}

// Reads "1: FLOCK  ADVISORY  WRITE 4242 fe:00:1234 0 EOF", in a fdinfo file after "lock:".
std::optional<KernelLock> ParseLock(const std::string& line)
{
    std::istringstream words(line);
    words.imbue(std::locale::classic());
    std::string number;
    std::string type;
    std::string ignored;
    std::string access;
    std::string end;
    KernelLock lock{};
    words >> number;
    if (number == "lock:") words >> number;
    words >> type >> ignored >> access >> lock.pid;
    if (!ReadFileId(words, lock.file)) return std::nullopt;
    words >> lock.from >> end;
    if (words.fail() || (access != "READ" && access != "WRITE")) return std::nullopt;
    if (type != "FLOCK" && type != "POSIX" && type != "OFDLCK") return std::nullopt;

    lock.isFlock = type == "FLOCK";
    lock.isExclusive = access == "WRITE";
    std::istringstream(end) >> lock.to;
    if (end == "EOF") lock.to = std::numeric_limits<std::uint64_t>::max();
    return lock;
}

}  // namespace

std::vector<KernelLock> ParseLocks(const std::string& text)
{
    std::vector<KernelLock> locks;
    std::istringstream lines(text);
    for (std::string line; std::getline(lines, line);) {
        if (const auto lock = ParseLock(line)) locks.push_back(*lock);
    }
    return locks;
}

std::vector<KernelLock> ReadKernelLocks()
{
    std::string text;
    (void)OrvaDRCore::ReadRegularFile(LockTable, text);
    return ParseLocks(text);
}

std::optional<dev_t> FindMountDevice(const std::string& mountinfo, std::uint64_t mountId)
{
    std::istringstream lines(mountinfo);
    for (std::string line; std::getline(lines, line);) {
        // "27 1 254:0 / / rw ..."
        std::istringstream words(line);
        words.imbue(std::locale::classic());
        std::uint64_t id = 0;
        std::uint64_t parent = 0;
        unsigned int major = 0;
        unsigned int minor = 0;
        char colon = 0;
        words >> id >> parent >> major >> colon >> minor;
        if (!words.fail() && id == mountId) return ::makedev(major, minor);
    }
    return std::nullopt;
}

std::optional<FileId> KernelIdOf(const std::string& path)
{
    struct statx status {};
    if (::statx(AT_FDCWD, path.c_str(), 0, STATX_INO | STATX_MNT_ID, &status) != 0) {
        return std::nullopt;
    }
    FileId file{::makedev(status.stx_dev_major, status.stx_dev_minor), status.stx_ino};
    std::string mounts;
    if ((status.stx_mask & STATX_MNT_ID) != 0 && OrvaDRCore::ReadRegularFile(MountTable, mounts)) {
        file.device = FindMountDevice(mounts, status.stx_mnt_id).value_or(file.device);
    }
    return file;
}

}  // namespace Orvadr
