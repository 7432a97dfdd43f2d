// The API DR.Node: takes a request line, returns the reply.
#ifndef NODE_REGISTRY_HANDLER_H
#define NODE_REGISTRY_HANDLER_H

#include <string>

#include <json/value.h>

#include "registry.h"
#include "settings.h"

namespace NodeRegistry {

// Not thread-safe: each thread of a service has its own handler.
class Handler {
  public:
    explicit Handler(const Settings& settings);

    // Every line gets a reply, whatever it contains.
    Json::Value Answer(const std::string& line);

  private:
    Json::Value Create(const Json::Value& params);
    Json::Value Get(const Json::Value& params);
    Json::Value Set(const Json::Value& params);
    Json::Value Delete(const Json::Value& params);
    Json::Value List(const Json::Value& params);
    Json::Value Status(const Json::Value& params);
    Json::Value Import(const Json::Value& params);
    Json::Value Export(const Json::Value& params);
    Json::Value Restore(const Json::Value& params);

    Json::Value RegistryFailure() const;

    Registry registry_;
    std::string fullPath_;    // of the database; exports are locked under a name made from it
    std::string statusPath_;  // of the status, without the suffix that the cache adds
    long statusTimeout_;
};

}  // namespace NodeRegistry

#endif
