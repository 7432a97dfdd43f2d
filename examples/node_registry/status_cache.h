// The status of all nodes, shared by all handlers of one database: taking it may last long.
//
//     {"total":2,"enabled":1,"time":1790000000,
//      "volumes":{"/volume1/replica":{"used":bytes,"free":bytes},"/volume9":null},
//      "probes":{"backup-01":"reachable"}}
//
// Of two handlers that need one at the same time one takes it. Later ones get the last one at once,
// and when it is old a child takes a new one meanwhile.
#ifndef NODE_REGISTRY_STATUS_CACHE_H
#define NODE_REGISTRY_STATUS_CACHE_H

#include <string>

#include <json/value.h>

#include <orvadrcore/cache.h>

namespace NodeRegistry {

class StatusCache : public OrvaDRCore::Cache {
  public:
    // Whether the cache of a database has its directory and a lock that this user can open. To be
    // asked first: without the lock, Read() waits without end.
    static bool IsUsable(const std::string& database);

    // `path` is the database's, in full, and the cache file `path` + ".status.cached". A status
    // older than `timeoutSeconds` is old; with 0 each one is, however new.
    StatusCache(const std::string& path, long timeoutSeconds);

    Json::Value GetInfo() const override;
    bool GetUpdatedData(Json::Value& data) const override;
    bool IsValidData(const Json::Value& data) const override;
    bool IsNeedUpdate(const Json::Value& data) const override;

    // Why this process could not take a status; 0 and null when it did not try, or could.
    int GetErrCode() const { return errCode; }
    const Json::Value& GetErr() const { return err; }

  private:
    std::string database;
    bool isAlwaysOld;
    mutable int errCode = 0;
    mutable Json::Value err;
};

}  // namespace NodeRegistry

#endif
