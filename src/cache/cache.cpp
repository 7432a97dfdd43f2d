#include <orvadrcore/cache.h>

#include <orvacore/orvacore.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <ctime>
#include <string>
#include <utility>

#include <orvadrcore/file.h>
#include <orvadrcore/file_lock.h>
#include <orvadrcore/utils.h>

#include "base/json_helpers.h"
#include "base/log.h"
#include "base/scope_guard.h"
#include "cache/attempts.h"
#include "cache/cache_file.h"
#include "cache/freshness.h"
#include "cache/updater_mark.h"
#include "common/deadline.h"

namespace OrvaDRCore {

namespace {

constexpr const char* DefaultPath = "/tmp/default_dr_cache";
constexpr int CacheDirMode = 0755;
constexpr int DetachedFork = 0x40;  // a number, because the appliance's header need not name it

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

// A value as text for a log line. Converting one that nests too deep could overflow the stack.
std::string TextForLine(const Json::Value& value)
{
    return NestsAtMost(value, 5 * MaxLevels) ? toString(value) : "(nested too deep)";
}

}  // namespace

// The state, and the steps that only Cache calls.
struct Cache::Impl {
    Impl(const std::string& path, std::int64_t timeoutSeconds, bool updatedRequired, int retries,
         const std::string& lockDir)
        : file(path),
          mark(path, lockDir),
          timeout(timeoutSeconds),
          updatedDataRequired(updatedRequired),
          retryLimit(retries)
    {
    }

    CacheFile file;
    UpdaterMark mark;
    std::int64_t timeout;
    bool updatedDataRequired;
    int retryLimit;

    const Json::Value& LoadedData(const Cache& cache, std::time_t& modifyTime);
    bool RefreshIfStale(const Cache& cache, const char* function, const Json::Value& data,
                        std::time_t modifyTime) const;
    bool Refresh(const Cache& cache) const;
    void Unmark(const Cache& cache) const noexcept;
    [[noreturn]] void RefreshInChild(const Cache& cache) const;

    bool Produce(const Cache& cache, Json::Value& data, const Pause& pause) const;
    bool Store(const Cache& cache, const Json::Value& data, std::int64_t begin, std::int64_t finish,
               const Pause& pause);
    bool RefreshWithin(const Cache& cache, const Deadline& deadline, bool isMarked,
                       Json::Value& data);
};

Cache::Cache(const std::string& dir, const std::string& file, std::int64_t timeoutSeconds,
             bool updatedRequired, int retries)
    : Cache(dir, file, timeoutSeconds, updatedRequired, retries, "")
{
}

Cache::Cache(const std::string& dir, const std::string& file, std::int64_t timeoutSeconds,
             bool updatedRequired, int retries, const std::string& lockDir)
    : impl_(std::make_unique<Impl>(GetCachedPath(dir, file), timeoutSeconds, updatedRequired,
                                   retries, lockDir))
{
}

Cache::Cache(const Cache& other) : impl_(std::make_unique<Impl>(*other.impl_)) {}

Cache& Cache::operator=(const Cache& other)
{
    *impl_ = *other.impl_;
    return *this;
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
    return impl_->updatedDataRequired || !IsValidData(GetCachedData());
}

Json::Value Cache::Read() const
{
    // A copy, because a refresh that fails may have replaced what is in memory.
    std::time_t modifyTime = -1;
    Json::Value data = impl_->LoadedData(*this, modifyTime);
    if (impl_->RefreshIfStale(*this, __func__, data, modifyTime)) data = GetCachedData();
    return data;
}

const Json::Value& Cache::View() const
{
    std::time_t modifyTime = -1;
    const Json::Value& data = impl_->LoadedData(*this, modifyTime);
    const bool isRefreshed = impl_->RefreshIfStale(*this, __func__, data, modifyTime);
    return isRefreshed ? impl_->LoadedData(*this, modifyTime) : impl_->file.GetData();
}

CacheState Cache::ReadWithin(std::chrono::milliseconds patience, Json::Value& data) const
{
    const Deadline deadline(patience);
    FreshnessWatch watch(*this, impl_->file, impl_->timeout);
    const auto isFresh = [&] { return watch.Look() == CacheState::Fresh; };
    const UpdaterMark::Claim claim = impl_->mark.ClaimWithin(deadline, isFresh);
    const bool isMarked = claim == UpdaterMark::Claim::Marked;
    if (isMarked || claim == UpdaterMark::Claim::Unmarked) {
        if (impl_->RefreshWithin(*this, deadline, isMarked, data)) return CacheState::Fresh;
    }
    const CacheState state = watch.Look();
    data = state == CacheState::None ? GetDefaultValue() : impl_->file.GetData();
    return state;
}

const std::string& Cache::GetPath() const
{
    return impl_->file.GetPath();
}

Json::Value Cache::GetCachedData() const
{
    std::time_t modifyTime = -1;
    return impl_->LoadedData(*this, modifyTime);
}

bool Cache::Load() const
{
    switch (impl_->file.Load()) {
        case CacheFile::LoadResult::Loaded: return true;
        case CacheFile::LoadResult::Missing:
            DR_LOG(Debug, "no data is cached in [%s]", impl_->file.GetPath().c_str());
            break;
        case CacheFile::LoadResult::Unreadable:
            DR_LOG(Debug, "Failed to read data from cache [%s]", impl_->file.GetPath().c_str());
            break;
    }
    return false;
}

bool Cache::IsTimeout() const
{
    return IsTooOld(impl_->file.GetModifyTime(), impl_->timeout);
}

int Cache::GetMaxUpdateTime() const
{
    return impl_->file.GetLongestRefresh();
}

int Cache::Remove()
{
    return ::unlink(impl_->file.GetPath().c_str());
}

bool Cache::Update() const
{
    const bool mustWait = IsUpdatedDataRequired();
    if (IsUpdating()) {
        if (!mustWait) return true;
        const char* const path = impl_->file.GetPath().c_str();
        DR_LOG(Debug, "start to block wait cache [%s] ", path);
        impl_->mark.WaitForUpdater([this] { return IsTimeout(); });
        DR_LOG(Debug, "finish to block wait cache [%s] ", path);
        return true;
    }
    if (mustWait) return impl_->Refresh(*this);

    const pid_t child = CoreLibProcForkEx(DetachedFork);
    if (child < 0) {
        DR_LOG(Warn, "Failed to fork(). errno=[%d/%m]", errno);
        return false;
    }
    if (child == 0) impl_->RefreshInChild(*this);
    return true;
}

bool Cache::DoUpdate() const
{
    const std::int64_t begin = std::time(nullptr);
    Json::Value data;
    return impl_->Produce(*this, data, PauseBeforeProducing) &&
           UpdateWithData(data, begin, std::time(nullptr));
}

bool Cache::UpdateWithData(const Json::Value& data, std::int64_t begin, std::int64_t finish) const
{
    return impl_->Store(*this, data, begin, finish, PauseBeforeWriting);
}

bool Cache::UpdateWithData(const Json::Value& data) const
{
    return UpdateWithData(data, 0, 0);
}

bool Cache::IsUpdating() const
{
    return impl_->mark.IsUpdating();
}

// Marks this process as the updater.
bool Cache::SetUpdating() const
{
    const UpdaterMark& mark = impl_->mark;
    const char* const path = impl_->file.GetPath().c_str();
    MarkLock lock(mark);
    if (!lock.LockExclusive()) {
        DR_LOG(Debug, "Failed to lock [%s]", mark.GetLockPath().c_str());
        return false;
    }
    if (mark.IsOfLivingProcess()) {
        DR_LOG(Debug, "there is other process to update cache [%s]", path);
        return false;
    }
    if (!mark.Set()) {
        DR_LOG(Debug, "Failed to set cache [%s] updating", path);
        return false;
    }
    DR_LOG(Debug, "---> Start to update cache [%s]", path);
    return true;
}

// Removes the mark, unless it is another living process's by now.
void Cache::UnsetUpdating() const
{
    const UpdaterMark& mark = impl_->mark;
    MarkLock lock(mark);
    if (!lock.LockShared()) return;  // the pid file stays: the contract says so
    if (IsUpdating()) {
        const pid_t pid = mark.Read();
        if (pid != ::getpid()) {
            DR_LOG(Debug, "Failed to unset updating cache [%s] since different pid[%d]",
                   mark.GetPidPath().c_str(), pid);
            return;
        }
    }
    DR_LOG(Debug, "<--- Finish to update cache [%s]", impl_->file.GetPath().c_str());
    mark.Remove();
}

// The data in memory, loaded again if the file has changed. `modifyTime` becomes the file's.
const Json::Value& Cache::Impl::LoadedData(const Cache& cache, std::time_t& modifyTime)
{
    modifyTime = file.GetModifyTime();
    if (file.IsLoaded(modifyTime)) return file.GetData();
    if (!cache.Load()) {
        file.SetData(cache.GetDefaultValue());
        DR_LOG_AS("GetCachedData", Debug, "Failed to load cache [%s], use default cache data",
                  file.GetPath().c_str());
    }
    modifyTime = file.GetModifyTime();
    return file.GetData();
}

// Returns whether the data may have changed: a refresh was made, started or waited for.
bool Cache::Impl::RefreshIfStale(const Cache& cache, const char* function, const Json::Value& data,
                                 std::time_t modifyTime) const
{
    if (IsFresh(cache, data, modifyTime, timeout)) return false;
    if (cache.Update()) return true;
    DR_LOG_AS(function, Debug, "Failed to update cache [%s], use old cache data.",
              toString(cache.GetInfo()).c_str());
    return false;
}

// Runs in a caller that must have fresh data, or in the child.
bool Cache::Impl::Refresh(const Cache& cache) const
{
    if (cache.IsUpdating() || !cache.SetUpdating()) return false;
    const ScopeGuard unmark([&] { Unmark(cache); });  // the subclass may throw
    return cache.DoUpdate();
}

bool Cache::Impl::Produce(const Cache& cache, Json::Value& data, const Pause& pause) const
{
    const auto produce = [&] {
        data = Json::Value();
        return cache.GetUpdatedData(data);
    };
    if (RetryAttempts(retryLimit, produce, pause)) return true;
    DR_LOG_AS("DoUpdate", Debug, "Failed to get updated cache [%s] and reach the retry limit[%d]",
              toString(cache.GetInfo()).c_str(), retryLimit);
    return false;
}

bool Cache::Impl::Store(const Cache& cache, const Json::Value& data, std::int64_t begin,
                        std::int64_t finish, const Pause& pause)
{
    constexpr const char* Function = "UpdateWithData";
    const bool isValid = cache.IsValidData(data);
    Json::Value info = cache.GetInfo();
    if (!isValid || !IsStorable(data) || !IsStorable(info)) {
        DR_LOG_AS(Function, Debug, "[%s] is not valid to update for cache [%s]",
                  TextForLine(data).c_str(), TextForLine(info).c_str());
        return false;
    }
    Json::Value copy = data;  // g++ 11 would leak `info` if copying failed within the braces
    CacheDocument document =
        file.Compose({timeout, std::move(info), std::move(copy), begin, finish});
    const auto write = [&] { return file.Write(document); };
    // A document that is too long could not be loaded again.
    if (FitsJsonText(document.text.size()) && RetryAttempts(retryLimit, write, pause)) return true;
    DR_LOG_AS(Function, Debug, "Failed to write cache to file [%s] and reach retry limit[%d]",
              file.GetPath().c_str(), retryLimit);
    return false;
}

// The refresh of ReadWithin(), whose caller gets the data even if it cannot be stored.
bool Cache::Impl::RefreshWithin(const Cache& cache, const Deadline& deadline, bool isMarked,
                                Json::Value& data)
{
    constexpr const char* Function = "ReadWithin";
    const char* const path = file.GetPath().c_str();
    if (isMarked) DR_LOG_AS(Function, Debug, "---> Start to update cache [%s]", path);
    const ScopeGuard unmark([&] {
        if (!isMarked) return;
        mark.EndClaim();
        DR_LOG_AS(Function, Debug, "<--- Finish to update cache [%s]", path);
    });
    const Pause pause = PauseUntil(deadline);
    (void)cache.IsUpdatedDataRequired();  // where a subclass prepares a refresh
    const std::int64_t begin = std::time(nullptr);
    Json::Value fresh;
    if (!Produce(cache, fresh, pause)) return false;
    if (!Store(cache, fresh, begin, std::time(nullptr), pause)) {
        if (!cache.IsValidData(fresh)) return false;
        DR_LOG_AS(Function, Warn, "Failed to store cache [%s], use fresh data all the same", path);
    } else if (!isMarked) {
        DR_LOG_AS(Function, Warn, "Failed to lock cache [%s], refreshed it all the same", path);
    }
    data = std::move(fresh);
    return true;
}

// Removes the mark even if an allocation fails. Otherwise all others would wait for this process as
// long as it lives.
void Cache::Impl::Unmark(const Cache& cache) const noexcept
{
    try {
        cache.UnsetUpdating();
    } catch (...) {
        mark.Remove();
    }
}

// Nothing of the caller's code runs after this: no unwinding, no destructors, no exit handlers.
void Cache::Impl::RefreshInChild(const Cache& cache) const
{
    try {
        Refresh(cache);
    } catch (...) {
        // From the subclass. Nobody is left to tell.
    }
    ::_exit(0);
}

}  // namespace OrvaDRCore
