// The status of all nodes. Getting it may take long, so all handlers of a database share it.
//
//     {"total":2,"enabled":1,"time":1790000000,
//      "volumes":{"/volume1/replica":{"used":bytes,"free":bytes},"/volume9":null},
//      "probes":{"backup-01":"reachable"}}
//
// If several handlers need the first one at the same time, one of them takes it, and the others have it
// milliseconds later. Later handlers read the stored status at once; if that is stale, a child process
// takes a new one in the background.
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
    // Whether the cache's directory exists and this user can open its lock. Check this first: without
    // the lock, Read() waits for ever.
    static bool IsUsable(const std::string& path);

    // The cache file is `path` + ".cached"; `path` must be absolute. A status older than
    // `timeoutSeconds` is stale; with 0, every status is. `registry` must outlive the cache.
    StatusCache(const std::string& path, long timeoutSeconds, Registry& registry);

    Json::Value GetInfo() const override;
    bool IsValidData(const Json::Value& data) const override;
    bool IsNeedUpdate(const Json::Value& data) const override;

    // Also lists the nodes: this runs in the caller's process, before a refresh and before the fork,
    // which is the last moment to use the database. See GetUpdatedData().
    bool IsUpdatedDataRequired() const override;

    // Probes the nodes. Must not use any database, not even a new connection: it may run in a child
    // of a multi-threaded process, where SQLite's mutexes and its list of locked files are in the
    // state that the other threads left at the fork. The child could hang, or read without a lock.
    bool GetUpdatedData(Json::Value& data) const override;

    // Whether the last refresh failed because the nodes could not be listed. The registry has the
    // error.
    bool HasFailedToList() const { return listing_ == Listing::Failed; }

  private:
    enum class Listing { None, Done, Failed };

    std::string path_;
    bool isAlwaysStale_;
    pid_t owner_;
    Registry& registry_;
    mutable Listing listing_ = Listing::None;
    mutable std::vector<Node> listed_;
};

}  // namespace NodeRegistry

#endif
