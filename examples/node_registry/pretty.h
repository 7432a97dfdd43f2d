// Requests and replies in a form for people: the option --pretty.
//
//     DR.Node/get/1 {"name":"backup-02"}
//       <- {"error":{"code":507,"errors":{...}},"success":false} (ERR_NODE_NOT_EXIST)
#ifndef NODE_REGISTRY_PRETTY_H
#define NODE_REGISTRY_PRETTY_H

#include <string>

#include <json/value.h>

namespace NodeRegistry {

// The request and its parameters, or the line itself if it is not a request. Cut if too long.
std::string DescribeRequest(const std::string& line);

// The reply with the name of its error code. A list has one node per line.
std::string DescribeReply(const Json::Value& reply);

}  // namespace NodeRegistry

#endif
