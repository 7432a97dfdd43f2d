// The API DR.Node: from a request line to its reply.
#ifndef NODE_REGISTRY_HANDLER_H
#define NODE_REGISTRY_HANDLER_H

#include <string>

#include <json/value.h>

#include "registry.h"

namespace NodeRegistry {

class Handler {
  public:
    // `database` is the file that keeps the nodes; a status older than `statusTimeoutSeconds` is
    // taken anew.
    Handler(const std::string& database, long statusTimeoutSeconds);

    // Answers every line, whatever it holds.
    Json::Value Answer(const std::string& line);

  private:
    Json::Value Create(const Json::Value& params);
    Json::Value Get(const Json::Value& params);
    Json::Value Set(const Json::Value& params);
    Json::Value Delete(const Json::Value& params);
    Json::Value List(const Json::Value& params);
    Json::Value Status(const Json::Value& params) const;
    Json::Value Import(const Json::Value& params);
    Json::Value Export(const Json::Value& params);
    Json::Value Restore(const Json::Value& params);

    Json::Value RegistryFailure() const;

    Registry registry;
    std::string fullPath;  // of the database; caches and locks are called after it
    long statusTimeout;
};

}  // namespace NodeRegistry

#endif
