// The API DR.Node: from a request line to its reply.
#ifndef NODE_REGISTRY_HANDLER_H
#define NODE_REGISTRY_HANDLER_H

#include <string>

#include <json/value.h>

#include "registry.h"

namespace NodeRegistry {

class Handler {
  public:
    // `database` is the file that keeps the nodes.
    explicit Handler(const std::string& database) : registry(database) {}

    // Answers every line, whatever it holds.
    Json::Value Answer(const std::string& line);

  private:
    Json::Value Create(const Json::Value& params);
    Json::Value Get(const Json::Value& params);
    Json::Value Set(const Json::Value& params);
    Json::Value Delete(const Json::Value& params);
    Json::Value List(const Json::Value& params);

    Json::Value RegistryFailure() const;

    Registry registry;
};

}  // namespace NodeRegistry

#endif
