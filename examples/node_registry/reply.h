// Replies in the shape that OrvaDRCore::Response reads.
#ifndef NODE_REGISTRY_REPLY_H
#define NODE_REGISTRY_REPLY_H

#include <string>

#include <json/value.h>

namespace NodeRegistry {

// {"success":true,"data":data}
Json::Value Success(const Json::Value& data);

// {"success":false,"error":{"code":code,"errors":errors}}
Json::Value Failure(int code, const Json::Value& errors);

// The "errors" of a failure outside the database: {"name":what is wrong,"reason":why}.
Json::Value Reason(const std::string& name, const std::string& reason);

}  // namespace NodeRegistry

#endif
