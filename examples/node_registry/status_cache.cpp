#include "status_cache.h"

#include <unistd.h>

#include <ctime>
#include <filesystem>
#include <system_error>

#include <orvadrcore/file_lock.h>

#include "child_process.h"
#include "probe.h"

namespace NodeRegistry {

using OrvaDRCore::FileLock;

namespace {

constexpr int SingleAttempt = -1;  // the registry itself retries

// Attempts are a second apart. Others hold the lock exclusively only for moments.
constexpr unsigned int LockRetries = 3;

std::string DirectoryOf(const std::string& path)
{
    return std::filesystem::path(path).parent_path();
}

std::string NameOf(const std::string& path)
{
    return std::filesystem::path(path).filename();
}

}  // namespace

bool StatusCache::IsUsable(const std::string& path)
{
    std::error_code ignored;
    if (!std::filesystem::is_directory(DirectoryOf(path), ignored)) return false;
    // Two objects, because the cache opens its lock file repeatedly: an ordinary user can create the
    // file, but not open it a second time.
    const std::string name = path + ".cached.lock";
    FileLock maker(name);
    FileLock lock(name);
    if (!maker.openLockedFile() || !lock.lock(LOCK_SH | LOCK_NB, LockRetries)) return false;
    lock.unlock();  // closing is not enough: a child that was just forked has the file open
    return true;
}

StatusCache::StatusCache(const std::string& path, long timeoutSeconds, Registry& registry)
    : Cache(DirectoryOf(path), NameOf(path), timeoutSeconds, false, SingleAttempt),
      path_(path),
      isAlwaysStale_(timeoutSeconds == 0),
      owner_(::getpid()),
      registry_(registry)
{
}

Json::Value StatusCache::GetInfo() const
{
    return "node status " + path_;
}

bool StatusCache::IsUpdatedDataRequired() const
{
    listing_ = registry_.List("", listed_) ? Listing::Done : Listing::Failed;
    return Cache::IsUpdatedDataRequired();
}

// Probes one node after the other. Each silent node takes ProbeTimeoutMSec.
bool StatusCache::GetUpdatedData(Json::Value& data) const
{
    if (::getpid() != owner_) LeaveServer();
    if (listing_ != Listing::Done) return false;
    const std::time_t begin = std::time(nullptr);
    Json::Value volumes(Json::objectValue);
    Json::Value probes(Json::objectValue);
    for (const Node& node : listed_) {
        if (!volumes.isMember(node.volume)) volumes[node.volume] = MeasureVolume(node.volume);
        if (node.enabled) probes[node.name] = ProbeAddress(node.address, node.port);
    }
    data["time"] = Json::Int64{begin};
    data["total"] = static_cast<Json::UInt>(listed_.size());
    data["enabled"] = probes.size();
    data["volumes"] = volumes;
    data["probes"] = probes;
    return true;
}

bool StatusCache::IsValidData(const Json::Value& data) const
{
    return data.isObject() && data["time"].isInt64() && data["total"].isUInt() &&
           data["enabled"].isUInt() && data["volumes"].isObject() && data["probes"].isObject();
}

bool StatusCache::IsNeedUpdate(const Json::Value& /*data*/) const
{
    return isAlwaysStale_;
}

}  // namespace NodeRegistry
