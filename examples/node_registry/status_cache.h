// The status of all nodes, shared by all handlers of one database: taking it may last long.
//
//     {"total":2,"enabled":1,"time":1790000000,
//      "volumes":{"/volume1/replica":{"used":bytes,"free":bytes},"/volume9":null},
//      "probes":{"backup-01":"reachable"}}
//
// Of several handlers that need one at the same time, one takes it. Later ones get the last one at
// once; when it is old, a child takes a new one meanwhile.
#ifndef NODE_REGISTRY_STATUS_CACHE_H
#define NODE_REGISTRY_STATUS_CACHE_H

#include <sys/types.h>

#include <string>
#include <vector>

#include <json/value.h>

#include <orvadrcore/cache.h>

#include "registry.h"

namespace NodeRegistry {

class StatusCache : public OrvaDRCore::Cache {
  public:
    // Whether the cache has its directory and a lock that this user can open. To be asked first:
    // without the lock, Read() waits without end.
    static bool IsUsable(const std::string& path);

    // The cache file is `path` + ".cached", in full. A status older than `timeoutSeconds` is old;
    // with 0 each one is, however new. The nodes come out of `nodes`, which must outlive the cache.
    StatusCache(const std::string& path, long timeoutSeconds, Registry& nodes);

    Json::Value GetInfo() const override;
    bool IsValidData(const Json::Value& data) const override;
    bool IsNeedUpdate(const Json::Value& data) const override;

    // Lists the nodes, too. The caller is asked this before a refresh and before the fork for one:
    // the last moment at which its database may be used. See GetUpdatedData().
    bool IsUpdatedDataRequired() const override;

    // Probes the nodes. Uses no database, not even one that it opens itself: it may run in a child
    // of a process with threads, where SQLite's mutexes and its notes about locked files are as the
    // other threads had them at the fork. The child would wait for ever, or read unlocked.
    bool GetUpdatedData(Json::Value& data) const override;

    // Whether the last refresh failed because the nodes could not be listed; the registry says why.
    bool HasFailedToList() const { return listing == Listing::Failed; }

  private:
    enum class Listing { None, Done, Failed };

    std::string path;
    bool isAlwaysOld;
    pid_t owner;
    Registry& registry;
    mutable Listing listing = Listing::None;
    mutable std::vector<Node> listed;
};

}  // namespace NodeRegistry

#endif
