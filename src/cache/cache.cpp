#include <orvadrcore/cache.h>

#include <orvacore/orvacore.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <ctime>
#include <functional>
#include <limits>
#include <optional>
#include <string>

#include <orvadrcore/file.h>
#include <orvadrcore/file_lock.h>
#include <orvadrcore/utils.h>

#include "base/file_io.h"
#include "base/json_helpers.h"
#include "base/log.h"
#include "base/replace_file.h"
#include "base/retry.h"

namespace OrvaDRCore {

namespace {

constexpr const char* DefaultPath = "/tmp/default_dr_cache";
constexpr int CacheDirMode = 0755;

constexpr int ProbeLock = LOCK_SH | LOCK_NB;    // to read the pid file
constexpr int MarkingLock = LOCK_EX | LOCK_NB;  // to check and write it
constexpr unsigned int LockRetries = 5;         // a second apart

constexpr int DetachedFork = 0x40;

struct PauseMSec {
    unsigned int min;
    unsigned int max;
    void operator()() const { RandomSleepInMSec(min, max); }
};
constexpr PauseMSec WaitPause{300, 1000};
constexpr PauseMSec ProducePause{500, 1000};
constexpr PauseMSec WritePause{300, 1000};

std::string GetCachedPath(const std::string& dir, const std::string& file)
{
    if (dir.empty() || file.empty()) {
        DR_LOG(Warn, "Invalid dir[%s] and file[%s] to cache", dir.c_str(), file.c_str());
        return DefaultPath;
    }
    if (!File::CreateDir(dir, CacheDirMode)) {
        DR_LOG(Err, "Failed to create [%s]", dir.c_str());
        return DefaultPath;
    }
    return dir + "/" + file + ".cached";
}

// In whole seconds since the epoch; -1 for what is not there.
std::time_t GetModifyTime(const std::string& path)
{
    struct stat status {};
    return ::stat(path.c_str(), &status) == 0 ? status.st_mtime : -1;
}

// The longest refresh that a document speaks of; 0 when it does not say, or not as an integer.
int GetLongestRefresh(const Json::Value& document)
{
    const Json::Value* longest = FindMember(document, "max_updated_time");
    // A real number counts as absent, on purpose, although to jsoncpp 3.0 is an int.
    const bool known = longest != nullptr && longest->isInt() && longest->type() != Json::realValue;
    return known ? longest->asInt() : 0;
}

// The text form of a value, for a line in the log. Of one that nests so deep that its making could
// overflow the stack there is none.
std::string TextForLine(const Json::Value& value)
{
    return NestsAtMost(value, 5 * MaxLevels) ? toString(value) : "(nested too deep)";
}

std::size_t HashOf(const std::string& text)
{
    return std::hash<std::string>()(text);
}

bool IsLiving(pid_t pid)
{
    return pid > 0 && CoreLibProcAlive(pid) == 1;
}

// The cache's lock, unlocked before its file is closed. A program that another thread starts at
// that moment inherits the descriptor: if it were only closed here, the program would hold the lock
// for as long as it runs.
class CacheLock {
  public:
    explicit CacheLock(const std::string& name) : lock(name) {}
    CacheLock(const CacheLock&) = delete;
    CacheLock& operator=(const CacheLock&) = delete;
    ~CacheLock();

    bool Lock(int operation) { return isHeld = lock.lock(operation, LockRetries); }

  private:
    FileLock lock;
    bool isHeld = false;
};

CacheLock::~CacheLock()
{
    if (!isHeld) return;
    try {
        (void)lock.lock(LOCK_UN, 0);  // not unlock(), which passes over descriptor 0
    } catch (...) {
        // Out of memory: closing the file has to do.
    }
}

// The limit of both retry loops: one try more than it says, and a single one when it is negative.
std::uint64_t RetriesOf(int limit)
{
    return limit < 0 ? 0 : static_cast<std::uint64_t>(limit) + 1;
}

int ToWholeSeconds(double seconds)
{
    constexpr double Largest = std::numeric_limits<int>::max();
    return static_cast<int>(std::clamp(seconds, -Largest, Largest));
}

}  // namespace

Cache::Cache(const std::string& dir, const std::string& file, long timeoutSeconds,
             bool updatedRequired, int retries)
    : cachedPath(GetCachedPath(dir, file)),
      timeout(timeoutSeconds),
      updatedDataRequired(updatedRequired),
      retryLimit(retries)
{
}

Cache::~Cache() = default;

Json::Value Cache::GetDefaultValue() const
{
    return {};
}

bool Cache::IsNeedUpdate(const Json::Value& /*data*/) const
{
    return false;
}

bool Cache::IsUpdatedDataRequired() const
{
    return updatedDataRequired || !IsValidData(GetCachedData());
}

Json::Value Cache::Read() const
{
    // A copy: the refresh may replace what is in memory, and fail.
    std::time_t modifyTime = -1;
    Json::Value data = LoadedData(modifyTime);
    if (GivesWay(__func__, data, modifyTime)) data = GetCachedData();
    return data;
}

const Json::Value& Cache::View() const
{
    std::time_t modifyTime = -1;
    const Json::Value& data = LoadedData(modifyTime);
    return GivesWay(__func__, data, modifyTime) ? LoadedData(modifyTime) : cachedData;
}

Json::Value Cache::GetCachedData() const
{
    std::time_t modifyTime = -1;
    return LoadedData(modifyTime);
}

bool Cache::Load() const
{
    // Looked at before reading: a write in between is then seen as one by the next read.
    struct stat status {};
    if (::stat(cachedPath.c_str(), &status) != 0) {
        DR_LOG(Debug, "no data is cached in [%s]", cachedPath.c_str());
        return false;
    }
    std::string text;
    Json::Value document;
    if (!ReadRegularFile(cachedPath, text) || !fromString(document, text)) {
        DR_LOG(Debug, "Failed to read data from cache [%s]", cachedPath.c_str());
        return false;
    }
    knownText = {text.size(), HashOf(text), GetLongestRefresh(document)};
    // Without "cached_data" the file counts as loaded and the old data stays, on purpose.
    if (FindMember(document, "cached_data") != nullptr) cachedData.swap(document["cached_data"]);
    loadedModifyTime = status.st_mtime;
    return true;
}

bool Cache::IsTimeout() const
{
    return IsTooOld(GetModifyTime(cachedPath));
}

int Cache::GetMaxUpdateTime() const
{
    std::string text;
    if (!ReadRegularFile(cachedPath, text)) return 0;
    // What this object has loaded or written itself is not parsed again. The text tells, because
    // times do not: after two changes within one step of the clock they are the same.
    if (text.size() == knownText.size && HashOf(text) == knownText.hash) {
        return knownText.longestRefresh;
    }
    Json::Value document;
    return fromString(document, text) ? GetLongestRefresh(document) : 0;
}

int Cache::Remove()
{
    return ::unlink(cachedPath.c_str());
}

bool Cache::Update() const
{
    const bool block = IsUpdatedDataRequired();
    if (IsUpdating()) {
        if (block) WaitForUpdater();
        return true;
    }
    if (block) return Refresh();

    const pid_t child = CoreLibProcForkEx(DetachedFork);
    if (child < 0) {
        DR_LOG(Warn, "Failed to fork(). errno=[%d/%m]", errno);
        return false;
    }
    if (child == 0) RefreshInChild();
    return true;
}

bool Cache::DoUpdate() const
{
    const long begin = std::time(nullptr);
    Json::Value data;
    const auto produce = [&] {
        data = Json::Value();
        return GetUpdatedData(data);
    };
    if (!Retry(RetriesOf(retryLimit), produce, ProducePause).succeeded) {
        DR_LOG(Debug, "Failed to get updated cache [%s] and reach the retry limit[%d]",
               toString(GetInfo()).c_str(), retryLimit);
        return false;
    }
    return UpdateWithData(data, begin, std::time(nullptr));
}

bool Cache::UpdateWithData(const Json::Value& data, long begin, long finish) const
{
    const bool isValid = IsValidData(data);
    Json::Value info = GetInfo();
    // In the document both stand one level down.
    if (!isValid || !IsReadable(data, 1) || !IsReadable(info, 1)) {
        DR_LOG(Debug, "[%s] is not valid to update for cache [%s]", TextForLine(data).c_str(),
               TextForLine(info).c_str());
        return false;
    }
    if (begin < 1 || finish < 1) begin = finish = 0;
    const double took = std::difftime(finish, begin);
    Json::Value document(Json::objectValue);
    document["timeout"] = Json::Int64{timeout};
    document["info"].swap(info);
    document["cached_data"] = data;
    document["begin_time_to_update"] = Json::Int64{begin};
    document["finish_time_to_update"] = Json::Int64{finish};
    document["updated_time"] = took;
    const int longest = std::max(GetMaxUpdateTime(), ToWholeSeconds(took));
    document["max_updated_time"] = longest;

    const std::string text = toString(document);
    struct stat written {};
    const auto write = [&] { return ReplaceFile(cachedPath, text, std::nullopt, &written); };
    // A document that is too long could not be loaded again.
    if (!FitsJsonText(text.size()) || !Retry(RetriesOf(retryLimit), write, WritePause).succeeded) {
        DR_LOG(Debug, "Failed to write cache to file [%s] and reach retry limit[%d]",
               cachedPath.c_str(), retryLimit);
        return false;
    }
    cachedData.swap(document["cached_data"]);
    loadedModifyTime = written.st_mtime;
    knownText = {text.size(), HashOf(text), longest};
    return true;
}

bool Cache::UpdateWithData(const Json::Value& data) const
{
    return UpdateWithData(data, 0, 0);
}

std::string Cache::PidPath() const
{
    return cachedPath + ".pid";
}

std::string Cache::LockName() const
{
    return cachedPath + ".lock";
}

// What is in memory, after a look whether the file has changed, whose modification time goes into
// `modifyTime`.
const Json::Value& Cache::LoadedData(std::time_t& modifyTime) const
{
    modifyTime = GetModifyTime(cachedPath);
    if (modifyTime != -1 && modifyTime == loadedModifyTime) return cachedData;
    if (!Load()) {
        cachedData = GetDefaultValue();
        DR_LOG_AS("GetCachedData", Debug, "Failed to load cache [%s], use default cache data",
                  cachedPath.c_str());
    }
    modifyTime = GetModifyTime(cachedPath);
    return cachedData;
}

bool Cache::IsTooOld(std::time_t modifyTime) const
{
    const std::time_t now = std::time(nullptr);
    return now == -1 || std::difftime(now, modifyTime) > static_cast<double>(timeout);
}

// Whether stale data gives way to what a refresh has left, or is in the making.
bool Cache::GivesWay(const char* function, const Json::Value& data, std::time_t modifyTime) const
{
    if (!IsTooOld(modifyTime) && IsValidData(data) && !IsNeedUpdate(data)) return false;
    if (Update()) return true;
    DR_LOG_AS(function, Debug, "Failed to update cache [%s], use old cache data.",
              toString(GetInfo()).c_str());
    return false;
}

// Whether a living process is marked as updater. The lock is free again when this returns.
bool Cache::IsUpdating() const
{
    CacheLock lock(LockName());
    return !lock.Lock(ProbeLock) || IsLiving(CoreLibReadPidFile(PidPath().c_str()));
}

// Marks this process as the updater. The refresh itself runs without a lock: the pid file is
// enough.
bool Cache::SetUpdating() const
{
    const std::string pidPath = PidPath();
    CacheLock lock(LockName());
    if (!lock.Lock(MarkingLock)) {
        DR_LOG(Debug, "Failed to lock [%s]", FileLock::getLockFilePath(LockName()).c_str());
        return false;
    }
    if (IsLiving(CoreLibReadPidFile(pidPath.c_str()))) {
        DR_LOG(Debug, "there is other process to update cache [%s]", cachedPath.c_str());
        return false;
    }
    if (CoreLibProcPidFileCreate(pidPath.c_str()) != 0) {
        DR_LOG(Debug, "Failed to set cache [%s] updating", cachedPath.c_str());
        return false;
    }
    DR_LOG(Debug, "---> Start to update cache [%s]", cachedPath.c_str());
    return true;
}

// Removes the mark, unless it is by now that of another living process.
void Cache::UnsetUpdating() const
{
    const std::string pidPath = PidPath();
    CacheLock lock(LockName());
    if (!lock.Lock(ProbeLock)) return;  // the pid file stays: the contract says so
    if (IsUpdating()) {
        const pid_t pid = CoreLibReadPidFile(pidPath.c_str());
        if (pid != ::getpid()) {
            DR_LOG(Debug, "Failed to unset updating cache [%s] since different pid[%d]",
                   pidPath.c_str(), pid);
            return;
        }
    }
    DR_LOG(Debug, "<--- Finish to update cache [%s]", cachedPath.c_str());
    ::unlink(pidPath.c_str());
}

// No lock is held during the pauses: it would keep others from marking.
void Cache::WaitForUpdater() const
{
    DR_LOG_AS("Update", Debug, "start to block wait cache [%s] ", cachedPath.c_str());
    do {
        WaitPause();
    } while (IsUpdating() && IsTimeout());
    DR_LOG_AS("Update", Debug, "finish to block wait cache [%s] ", cachedPath.c_str());
}

// The refresh of a caller that waits, and of the child.
bool Cache::Refresh() const
{
    const std::string mark = PidPath();
    if (IsUpdating() || !SetUpdating()) return false;
    // The mark of a living process would make all others wait: it goes also when memory is short.
    const auto unset = [&] {
        try {
            UnsetUpdating();
        } catch (...) {
            ::unlink(mark.c_str());
            throw;
        }
    };
    bool updated = false;
    try {
        updated = DoUpdate();
    } catch (...) {  // a subclass's, too
        unset();
        throw;
    }
    unset();
    return updated;
}

// Nothing of the caller's code runs behind this: no unwinding, no destructors, no exit handlers.
void Cache::RefreshInChild() const
{
    try {
        Refresh();
    } catch (...) {
        // A subclass's; there is nobody left to tell.
    }
    ::_exit(0);
}

}  // namespace OrvaDRCore
