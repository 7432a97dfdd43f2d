#include "cache_fixture.h"

#include <fcntl.h>
#include <orvacore/orvacore.h>
#include <sys/file.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <utility>

#include "base/json_helpers.h"
#include "child_checks.h"
#include "test_files.h"

Json::Value TestCache::GetInfo() const
{
    calls.emplace_back("GetInfo");
    return info();
}

Json::Value TestCache::GetDefaultValue() const
{
    calls.emplace_back("GetDefaultValue");
    return defaultValue ? defaultValue() : Cache::GetDefaultValue();
}

bool TestCache::GetUpdatedData(Json::Value& data) const
{
    calls.emplace_back("GetUpdatedData");
    return produce(data);
}

bool TestCache::IsValidData(const Json::Value& data) const
{
    calls.emplace_back("IsValidData");
    return isValid(data);
}

bool TestCache::IsNeedUpdate(const Json::Value& data) const
{
    calls.emplace_back("IsNeedUpdate");
    return isNeedUpdate ? isNeedUpdate(data) : Cache::IsNeedUpdate(data);
}

bool TestCache::IsUpdatedDataRequired() const
{
    calls.emplace_back("IsUpdatedDataRequired");
    return isRequired ? isRequired() : Cache::IsUpdatedDataRequired();
}

std::vector<std::string> TestCache::TakeCalls()
{
    return std::exchange(calls, {});
}

std::size_t TestCache::CountCalls(const std::string& operation) const
{
    return static_cast<std::size_t>(std::count(calls.begin(), calls.end(), operation));
}

HeldLock::HeldLock(const std::string& path, int operation) : fd(OpenFile(path, O_RDONLY))
{
    EXPECT_EQ(RealFlock(fd, operation | LOCK_NB), 0);
}

void HeldLock::Free()
{
    if (fd >= 0) ::close(std::exchange(fd, -1));
}

CacheFixture::CacheFixture() : LoggedTest("cache.cpp")
{
    faults.open = [this](const char* name, int flags, mode_t mode) {
        opened.emplace_back(name);
        return RealOpen(Place(name).c_str(), flags, mode);
    };
    faults.stat = [this](const char* name, struct stat* status) {
        return RealStat(Place(name).c_str(), status);
    };
    faults.sleep = [this](unsigned int seconds) {
        sleeps.push_back(seconds);
        return 0U;
    };
    // An ordinary user could open a lock file that the library has made only once.
    std::filesystem::create_directories(std::filesystem::path(lockFile).parent_path());
    WriteFile(lockFile, "");
}

std::string CacheFixture::Place(const std::string& name) const
{
    for (const std::string place : {"/tmp/.orvadr_lock", "/tmp/default_dr_cache"}) {
        if (name.compare(0, place.size(), place) == 0) {
            return shared.Path() + name.substr(std::string("/tmp").size());
        }
    }
    return name;
}

TestCache CacheFixture::Another(bool updatedRequired, int retries, long timeout) const
{
    return {dir.Path(), "status", timeout, updatedRequired, retries};
}

void CacheFixture::WriteCache(const Json::Value& data) const
{
    Json::Value document;
    document["cached_data"] = data;
    WriteFile(path, OrvaDRCore::toString(document));
}

void CacheFixture::WriteCache(const Json::Value& data, std::time_t modifyTime) const
{
    WriteCache(data);
    SetModifyTime(path, modifyTime);
}

void CacheFixture::WriteStale(const Json::Value& data) const
{
    WriteCache(data, std::time(nullptr) - 10 * Timeout);
}

std::size_t CacheFixture::CountOpened(const std::string& name) const
{
    return static_cast<std::size_t>(std::count(opened.begin(), opened.end(), name));
}

void CacheFixture::ExpectPauses(std::size_t count, unsigned int shortest)
{
    const std::vector<unsigned int>& taken = pauses.Taken();
    EXPECT_EQ(taken.size() - pausesSeen, count);
    for (; pausesSeen < taken.size(); ++pausesSeen) {
        EXPECT_GE(taken[pausesSeen], shortest);
        EXPECT_LE(taken[pausesSeen], 1'000'000U);
    }
}

void CacheFixture::ExpectSleeps(std::size_t count)
{
    EXPECT_EQ(std::exchange(sleeps, {}), std::vector<unsigned int>(count, 1));
}

void CacheFixture::NoteLocking()
{
    faults.flock = [this](int fd, int operation) {
        if (IsLockFile(fd) && operation != LOCK_UN) locking.push_back(operation);
        return RealFlock(fd, operation);
    };
}

bool CacheFixture::IsLockFile(int fd) const
{
    struct stat status {};
    return ::fstat(fd, &status) == 0 && status.st_ino == InodeOf(lockFile);
}

ChildProcess CacheFixture::Updater() const
{
    return ChildProcess([this](ChildProcess::Link& link) {
        if (CoreLibProcPidFileCreate(pidPath.c_str()) == 0) link.Tell();
        link.Await();
    });
}

void CacheFixture::CheckInBackground(const std::function<void()>& checks)
{
    CheckInChild([&] {
        // A refresh whose starter has ended belongs to the next process above that says this.
        ASSERT_EQ(::prctl(PR_SET_CHILD_SUBREAPER, 1), 0);
        refreshGate = MakeGate();
        processes.fork = [this, caller = ::getpid()] {
            // The refresh is forked by a process between it and the caller.
            const bool isBetween = ::getpid() != caller;
            const pid_t pid = RealFork();
            if (pid == 0 && isBetween) refreshGate.Await();
            return pid;
        };
        checks();
        ExpectLines({});
    });
}

int CacheFixture::AwaitRefresh() const
{
    LetRefresh();
    int status = 0;
    while (::waitpid(-1, &status, 0) < 0) {
        if (errno != EINTR) return -1;
    }
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

LogLine CacheFixture::NoData() const
{
    return Debug("Load", "no data is cached in [" + path + "]");
}

LogLine CacheFixture::Unreadable() const
{
    return Debug("Load", "Failed to read data from cache [" + path + "]");
}

LogLine CacheFixture::UsesDefault() const
{
    return Debug("GetCachedData", "Failed to load cache [" + path + "], use default cache data");
}

LogLine CacheFixture::UsesOldData() const
{
    return Debug("Read", R"(Failed to update cache ["test cache"], use old cache data.)");
}

LogLine CacheFixture::Start() const
{
    return Debug("SetUpdating", "---> Start to update cache [" + path + "]");
}

LogLine CacheFixture::Finish() const
{
    return Debug("UnsetUpdating", "<--- Finish to update cache [" + path + "]");
}

// Both end in a blank, on purpose.
LogLine CacheFixture::StartWait() const
{
    return Debug("Update", "start to block wait cache [" + path + "] ");
}

LogLine CacheFixture::FinishWait() const
{
    return Debug("Update", "finish to block wait cache [" + path + "] ");
}

ChildProcess::Link MakeGate()
{
    std::array<int, 2> ends{};
    if (::pipe2(ends.data(), O_CLOEXEC) < 0) std::abort();
    return {ends[0], ends[1]};
}
