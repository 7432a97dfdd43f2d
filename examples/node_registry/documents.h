// Nodes in files: the lines of an import, and the document of an export.
//
//     backup-01 = 192.168.10.21:5001
//     lab       = [2001:db8::17]:6690
//
//     {"version":1,"nodes":[{"id":...,"name":...,"address":...,"port":...,"volume":...,
//                            "enabled":...},...]}
#ifndef NODE_REGISTRY_DOCUMENTS_H
#define NODE_REGISTRY_DOCUMENTS_H

#include <string>
#include <vector>

#include <json/value.h>

#include "node.h"

namespace NodeRegistry {

// Reads the node of one line; `endpoint` is the part after "=". A node that a create request would
// refuse is refused here, too: false, and `ret_reason` names the field and the error.
bool FromLine(const std::string& name, const std::string& endpoint, const std::string& volume,
              Node& ret_node, std::string& ret_reason);

Json::Value ToDocument(const std::vector<Node>& nodes);

// Reads such a document. False, with the reason in `ret_reason` and `ret_nodes` unchanged, if it is
// anything else, has a bad node, or has two nodes with the same id or name.
bool FromDocument(const Json::Value& document, std::vector<Node>& ret_nodes,
                  std::string& ret_reason);

}  // namespace NodeRegistry

#endif
