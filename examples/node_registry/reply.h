// What replies say of failures.
#ifndef NODE_REGISTRY_REPLY_H
#define NODE_REGISTRY_REPLY_H

#include <string>

#include <json/value.h>

namespace NodeRegistry {

// The "errors" of a failure outside the database: {"name":what is wrong,"reason":why}.
Json::Value Reason(const std::string& name, const std::string& reason);

}  // namespace NodeRegistry

#endif
