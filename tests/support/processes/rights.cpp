#include "support/processes/rights.h"

#include <grp.h>
#include <linux/capability.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <array>
#include <fstream>

namespace {

constexpr const char* LockDir = "/tmp/.orvadr_lock";
constexpr mode_t LockDirMode = 0755;

bool Put(const std::string& path, const std::string& text)
{
    std::ofstream file(path);
    file << text << std::flush;
    return file.good();
}

// From now on mounts of this process are visible to itself and its children only.
bool KeepMounts()
{
    return ::mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0;
}

bool DropCapabilities()
{
    __user_cap_header_struct header{_LINUX_CAPABILITY_VERSION_3, 0};
    std::array<__user_cap_data_struct, _LINUX_CAPABILITY_U32S_3> none{};
    // All six arguments, because the fake of syscall() reads as many.
    return ::syscall(SYS_capset, &header, none.data(), 0L, 0L, 0L, 0L) == 0;
}

}  // namespace

bool BecomeRoot()
{
    if (::geteuid() == 0) return true;

    const std::string user = std::to_string(::geteuid());
    const std::string group = std::to_string(::getegid());
    (void)::mkdir(LockDir, LockDirMode);
    return ::unshare(CLONE_NEWUSER | CLONE_NEWNS) == 0 && Put("/proc/self/setgroups", "deny") &&
           Put("/proc/self/uid_map", "0 " + user + " 1") &&
           Put("/proc/self/gid_map", "0 " + group + " 1") && KeepMounts() &&
           ::mount("tmpfs", LockDir, "tmpfs", 0, "mode=755") == 0;
}

bool LoseCapabilities()
{
    // Programs that root starts would get the others again.
    for (unsigned long capability = 0; capability <= CAP_LAST_CAP; ++capability) {
        (void)::prctl(PR_CAPBSET_DROP, capability, 0, 0, 0);
    }
    return DropCapabilities();
}

bool LoseRights()
{
    // A user namespace has no other user to become.
    const bool changed = ::setgroups(0, nullptr) == 0 && ::setresgid(Nobody, Nobody, Nobody) == 0 &&
                         ::setresuid(Nobody, Nobody, Nobody) == 0;
    return DropCapabilities() || changed;
}

bool MountSmallDisk(const std::string& directory, int bytes)
{
    const std::string options = "size=" + std::to_string(bytes);
    return ::unshare(CLONE_NEWNS) == 0 && KeepMounts() &&
           ::mount("tmpfs", directory.c_str(), "tmpfs", 0, options.c_str()) == 0;
}

bool MountCoarseDisk(const std::string& directory)
{
    return ::unshare(CLONE_NEWNS) == 0 && KeepMounts() &&
           ::mount("ramfs", directory.c_str(), "ramfs", 0, nullptr) == 0;
}
