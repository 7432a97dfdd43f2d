// A remote node, as a row of the nodes table and as JSON.
#ifndef NODE_REGISTRY_NODE_H
#define NODE_REGISTRY_NODE_H

#include <cstddef>
#include <string>
#include <vector>

#include <json/value.h>

#include <orvadrcore/sqlite_value.h>

namespace NodeRegistry {

// The longest texts of a node.
constexpr std::size_t MaxIdBytes = 64;
constexpr std::size_t MaxNameBytes = 64;
constexpr std::size_t MaxAddressBytes = 253;  // a host name
constexpr std::size_t MaxVolumeBytes = 4096;  // a path

struct Node : OrvaDRCore::SqliteRecord {
    std::string id;       // a UUID, assigned by Registry::Create()
    std::string name;     // for people; unique
    std::string address;  // host name or IP address
    int port = 0;
    std::string volume;  // where the node stores replicas
    bool enabled = true;

    // The named fields.
    OrvaDRCore::SqliteValueList BuildRecord(const std::vector<std::string>& fields) const override;

    // Reads a row. False, with nothing changed, if a field is missing or has another type.
    bool LoadRecord(const OrvaDRCore::SqliteValueList& record) override;

    std::vector<std::string> GetRecordFields() const override;

    Json::Value ToJson() const;
};

// Identifies a node by a unique column, "id" or "name".
struct NodeKey {
    std::string field;
    std::string text;
};

}  // namespace NodeRegistry

#endif
