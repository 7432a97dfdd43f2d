#include "cache/updater_mark.h"

#include <orvacore/orvacore.h>
#include <sys/file.h>
#include <unistd.h>

#include <orvadrcore/utils.h>

namespace OrvaDRCore {

namespace {

constexpr unsigned int LockRetries = 5;  // a second apart

constexpr unsigned int MinWaitMSec = 300;
constexpr unsigned int MaxWaitMSec = 1000;

bool IsLiving(pid_t pid)
{
    return pid > 0 && CoreLibProcAlive(pid) == 1;
}

}  // namespace

UpdaterMark::UpdaterMark(const std::string& cachePath)
    : pidPath_(cachePath + ".pid"), lockName_(cachePath + ".lock")
{
}

pid_t UpdaterMark::Read() const
{
    return CoreLibReadPidFile(pidPath_.c_str());
}

bool UpdaterMark::IsOfLivingProcess() const
{
    return IsLiving(Read());
}

bool UpdaterMark::Set() const
{
    return CoreLibProcPidFileCreate(pidPath_.c_str()) == 0;
}

void UpdaterMark::Remove() const
{
    ::unlink(pidPath_.c_str());
}

bool UpdaterMark::IsUpdating() const
{
    MarkLock lock(*this);
    return !lock.LockShared() || IsOfLivingProcess();
}

void UpdaterMark::WaitForUpdater(const std::function<bool()>& isStale) const
{
    do {
        RandomSleepInMSec(MinWaitMSec, MaxWaitMSec);
    } while (IsUpdating() && isStale());
}

MarkLock::~MarkLock()
{
    if (!isHeld_) return;
    try {
        (void)lock_.lock(LOCK_UN, 0);  // unlock() would ignore descriptor 0
    } catch (...) {
        // Out of memory: closing the file has to do.
    }
}

bool MarkLock::LockShared()
{
    return isHeld_ = lock_.lock(LOCK_SH | LOCK_NB, LockRetries);
}

bool MarkLock::LockExclusive()
{
    return isHeld_ = lock_.lock(LOCK_EX | LOCK_NB, LockRetries);
}

}  // namespace OrvaDRCore
