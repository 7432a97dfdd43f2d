// Requests and replies for people, for the option --pretty.
//
//     DR.Node/get/1 {"name":"backup-02"}
//       <- {"error":{"code":507,"errors":{...}},"success":false} (ERR_NODE_NOT_EXIST)
#ifndef NODE_REGISTRY_PRETTY_H
#define NODE_REGISTRY_PRETTY_H

#include <string>

#include <json/value.h>

namespace NodeRegistry {

// The request and its parameters, or the line itself when it is no request; shortened when long.
std::string DescribeRequest(const std::string& line);

// The reply, with the name of its error; the nodes of a list one on each line.
std::string DescribeReply(const Json::Value& reply);

}  // namespace NodeRegistry

#endif
