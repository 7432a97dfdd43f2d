// A remote node, as a row of the nodes table and as JSON.
#ifndef NODE_REGISTRY_NODE_H
#define NODE_REGISTRY_NODE_H

#include <cstddef>
#include <string>
#include <vector>

#include <json/value.h>

#include <orvadrcore/sqlite_value.h>

namespace NodeRegistry {

// The longest texts that a node may have.
constexpr std::size_t MaxIdBytes = 64;
constexpr std::size_t MaxNameBytes = 64;
constexpr std::size_t MaxAddressBytes = 253;  // a host name
constexpr std::size_t MaxVolumeBytes = 4096;  // a path

struct Node : OrvaDRCore::SqliteRecord {
    std::string id;       // a UUID, given when the node is created
    std::string name;     // what people call it; no two nodes share one
    std::string address;  // host name or IP address
    int port = 0;
    std::string volume;  // where replicas lie on the node
    bool enabled = true;

    // The named fields, their texts escaped: fit to be written into a statement.
    OrvaDRCore::SqliteValueList BuildRecord(const std::vector<std::string>& fields) const override;

    // Takes a row. False, nothing changed, when a field is missing or of another kind.
    bool LoadRecord(const OrvaDRCore::SqliteValueList& record) override;

    std::vector<std::string> GetRecordFields() const override;

    Json::Value ToJson() const;
};

// Which node is meant: a column without duplicates, "id" or "name", and its value.
struct NodeKey {
    std::string field;
    std::string text;
};

}  // namespace NodeRegistry

#endif
