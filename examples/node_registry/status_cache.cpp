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

// A registry retries by itself.
constexpr int SingleTry = -1;

// Others hold the lock exclusively for moments only; a second apart.
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
    // The cache opens its lock file again and again. An ordinary user can make the file, but not
    // open it a second time.
    const std::string name = path + ".cached.lock";
    FileLock maker(name);
    FileLock lock(name);
    if (!maker.openLockedFile() || !lock.lock(LOCK_SH | LOCK_NB, LockRetries)) return false;
    lock.unlock();  // closing is not enough: a child that was just forked has the file open, too
    return true;
}

StatusCache::StatusCache(const std::string& file, long timeoutSeconds, Registry& nodes)
    : Cache(DirectoryOf(file), NameOf(file), timeoutSeconds, false, SingleTry),
      path(file),
      isAlwaysOld(timeoutSeconds == 0),
      owner(::getpid()),
      registry(nodes)
{
}

Json::Value StatusCache::GetInfo() const
{
    return "node status " + path;
}

bool StatusCache::IsUpdatedDataRequired() const
{
    listing = registry.List("", listed) ? Listing::Done : Listing::Failed;
    return Cache::IsUpdatedDataRequired();
}

// The nodes are probed one after the other: those that are silent cost ProbeTimeoutMSec each.
bool StatusCache::GetUpdatedData(Json::Value& data) const
{
    if (::getpid() != owner) LeaveServer();
    if (listing != Listing::Done) return false;
    const std::time_t begin = std::time(nullptr);
    Json::Value volumes(Json::objectValue);
    Json::Value probes(Json::objectValue);
    for (const Node& node : listed) {
        if (!volumes.isMember(node.volume)) volumes[node.volume] = MeasureVolume(node.volume);
        if (node.enabled) probes[node.name] = ProbeAddress(node.address, node.port);
    }
    data["time"] = Json::Int64{begin};
    data["total"] = static_cast<Json::UInt>(listed.size());
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
    return isAlwaysOld;
}

}  // namespace NodeRegistry
