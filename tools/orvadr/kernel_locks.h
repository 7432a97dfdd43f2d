// The kernel's table of file locks, /proc/locks, which everybody may read.
#ifndef ORVADR_KERNEL_LOCKS_H
#define ORVADR_KERNEL_LOCKS_H

#include <sys/types.h>

#include <cstdint>
#include <optional>
#include <string>
#include <tuple>
#include <vector>

namespace Orvadr {

// A file, whatever it is called.
struct FileId {
    dev_t device;
    ino_t inode;

    bool operator<(const FileId& other) const
    {
        return std::tie(device, inode) < std::tie(other.device, other.inode);
    }
    bool operator==(const FileId& other) const
    {
        return device == other.device && inode == other.inode;
    }
};

struct KernelLock {
    bool isFlock;  // else a lock on a range of bytes, made by fcntl()
    bool isExclusive;
    pid_t pid;           // who took it; -1 if it belongs to an open file, not to a process
    FileId file;         // as the kernel numbers devices: see KernelIdOf()
    std::uint64_t from;  // the first byte and the last one, the largest number for all after `from`
    std::uint64_t to;
};

// The locks in a text with one on each line, as /proc/locks and the files in /proc/PID/fdinfo have them.
// Leaves out other lines, leases, and those who wait for a lock.
std::vector<KernelLock> ParseLocks(const std::string& text);

// All locks of the system.
std::vector<KernelLock> ReadKernelLocks();

// The device of a mount, from the text of /proc/PID/mountinfo.
std::optional<dev_t> FindMountDevice(const std::string& mountinfo, std::uint64_t mountId);

// A file as the kernel's table of locks has it. On some file systems, such as btrfs, that device is not
// the one that stat() tells.
std::optional<FileId> KernelIdOf(const std::string& path);

}  // namespace Orvadr

#endif
