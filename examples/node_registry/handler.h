// The API DR.Node: from a request line to its reply.
#ifndef NODE_REGISTRY_HANDLER_H
#define NODE_REGISTRY_HANDLER_H

#include <string>

#include <json/value.h>

#include "registry.h"
#include "settings.h"

namespace NodeRegistry {

// A handler is used by one thread at a time; each thread of a service has its own.
class Handler {
  public:
    explicit Handler(const Settings& settings);

    // Answers every line, whatever it holds.
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

    Registry registry;
    std::string fullPath;    // of the database; the lock of exports is called after it
    std::string statusPath;  // of the status, without what the cache adds
    long statusTimeout;
};

}  // namespace NodeRegistry

#endif
