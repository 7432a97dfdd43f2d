#include "status_cache.h"

#include <ctime>
#include <filesystem>
#include <system_error>
#include <vector>

#include <orvadrcore/file_lock.h>

#include "probe.h"
#include "registry.h"

namespace NodeRegistry {

using OrvaDRCore::FileLock;

namespace {

// A registry retries by itself.
constexpr int SingleTry = -1;

// Others hold the lock alone for moments only; a second apart.
constexpr unsigned int LockRetries = 3;

std::string DirectoryOf(const std::string& database)
{
    return std::filesystem::path(database).parent_path();
}

std::string NameOf(const std::string& database)
{
    return std::filesystem::path(database).filename().string() + ".status";
}

// As the cache calls its lock.
std::string LockNameOf(const std::string& database)
{
    return DirectoryOf(database) + "/" + NameOf(database) + ".cached.lock";
}

}  // namespace

bool StatusCache::IsUsable(const std::string& database)
{
    std::error_code ignored;
    if (!std::filesystem::is_directory(DirectoryOf(database), ignored)) return false;
    // The first opening may make the file. An ordinary user could not open it again, which the
    // cache does all the time, so it is the second one that counts.
    FileLock maker(LockNameOf(database));
    FileLock lock(LockNameOf(database));
    return maker.openLockedFile() && lock.lock(LOCK_SH | LOCK_NB, LockRetries);
}

StatusCache::StatusCache(const std::string& path, long timeoutSeconds)
    : Cache(DirectoryOf(path), NameOf(path), timeoutSeconds, false, SingleTry),
      database(path),
      isAlwaysOld(timeoutSeconds == 0)
{
}

Json::Value StatusCache::GetInfo() const
{
    return "status of the nodes in " + database;
}

// May run in a child, where the caller's connection must not be used: it opens its own, and closes
// it before the slow part. The nodes are probed one after the other: those that are silent cost
// ProbeTimeoutMSec each.
bool StatusCache::GetUpdatedData(Json::Value& data) const
{
    const std::time_t begin = std::time(nullptr);
    std::vector<Node> nodes;
    {
        Registry registry(database);
        if (!registry.List("", nodes)) {
            errCode = registry.GetErrCode();
            err = registry.GetErr();
            return false;
        }
    }
    Json::Value volumes(Json::objectValue);
    Json::Value probes(Json::objectValue);
    for (const Node& node : nodes) {
        if (!volumes.isMember(node.volume)) volumes[node.volume] = MeasureVolume(node.volume);
        if (node.enabled) probes[node.name] = ProbeAddress(node.address, node.port);
    }
    data["time"] = Json::Int64{begin};
    data["total"] = static_cast<Json::UInt>(nodes.size());
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
