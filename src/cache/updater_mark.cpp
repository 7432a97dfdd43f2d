#include "cache/updater_mark.h"

#include <orvacore/orvacore.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <orvadrcore/utils.h>

namespace OrvaDRCore {

namespace {

constexpr unsigned int LockRetries = 5;  // a second apart

constexpr unsigned int MinWaitMSec = 300;
constexpr unsigned int MaxWaitMSec = 1000;

// Of ClaimWithin().
constexpr unsigned int FirstLookMSec = 2;
constexpr unsigned int LongestLookMSec = 10;

// After the first looks only some check the mark, which costs many times as much as the file's status.
constexpr unsigned int ThoroughLooks = 8;
constexpr unsigned int LooksPerCheck = 4;

// For the lock around the removal of the own mark. Others hold it for moments.
constexpr std::chrono::milliseconds RemovalPatience{100};

constexpr mode_t OwnFileMode = 0600;

bool IsLiving(pid_t pid)
{
    return pid > 0 && CoreLibProcAlive(pid) == 1;
}

}  // namespace

UpdaterMark::UpdaterMark(const std::string& cachePath, const std::string& lockDir)
    : pidPath_(cachePath + ".pid"), lockName_(cachePath + ".lock"), lockDir_(lockDir)
{
    if (lockDir.empty()) return;
    const std::string name = cachePath.substr(cachePath.rfind('/') + 1);
    pidPath_ = lockDir + "/" + name + ".pid";
    lockName_ = name + ".lock";
}

std::string UpdaterMark::GetLockPath() const
{
    return lockDir_.empty() ? FileLock::getLockFilePath(lockName_) : lockDir_ + "/" + lockName_;
}

FileLock UpdaterMark::MakeLock() const
{
    return lockDir_.empty() ? FileLock(lockName_) : FileLock(lockName_, lockDir_);
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
    if (CoreLibProcPidFileCreate(pidPath_.c_str()) != 0) return false;
    if (!lockDir_.empty()) (void)::chmod(pidPath_.c_str(), OwnFileMode);
    return true;
}

void UpdaterMark::Remove() const
{
    ::unlink(pidPath_.c_str());
}

UpdaterMark::Claim UpdaterMark::ClaimWithin(const Deadline& deadline,
                                            const std::function<bool()>& isFresh) const
{
    Backoff pauses(FirstLookMSec, LongestLookMSec);
    unsigned int looks = 0;
    do {
        if (isFresh()) return Claim::NotNeeded;
        const bool isThorough = looks < ThoroughLooks || looks % LooksPerCheck == 0;
        const Claim claim = isThorough ? TryClaim(isFresh) : Claim::Busy;
        if (claim != Claim::Busy) return claim;
        ++looks;
    } while (pauses.Pause(deadline));
    return Claim::Busy;
}

UpdaterMark::Claim UpdaterMark::TryClaim(const std::function<bool()>& isFresh) const
{
    // Checked without the lock first, which waiting processes therefore leave to the others.
    if (IsOfLivingProcess()) return Claim::Busy;
    MarkLock lock(*this);
    switch (lock.Acquire(LOCK_EX, std::chrono::milliseconds(0))) {
        case FileLockState::Taken: break;
        case FileLockState::Held: return Claim::Busy;
        case FileLockState::Failed: return Claim::Unmarked;
    }
    if (IsOfLivingProcess()) return Claim::Busy;
    if (isFresh()) return Claim::NotNeeded;
    return Set() ? Claim::Marked : Claim::Unmarked;
}

void UpdaterMark::EndClaim() const noexcept
{
    try {
        MarkLock lock(*this);
        (void)lock.Acquire(LOCK_SH, RemovalPatience);
        const pid_t pid = Read();
        if (pid == ::getpid() || !IsLiving(pid)) Remove();
    } catch (...) {
        Remove();  // out of memory
    }
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

FileLockState MarkLock::Acquire(int operation, std::chrono::milliseconds patience)
{
    const FileLockState state = lock_.acquire(operation, patience);
    isHeld_ = state == FileLockState::Taken;
    return state;
}

}  // namespace OrvaDRCore
