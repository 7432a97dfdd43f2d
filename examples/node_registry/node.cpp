#include "node.h"

namespace NodeRegistry {

using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;

SqliteValueList Node::BuildRecord(const std::vector<std::string>& fields) const
{
    SqliteValueList all;
    all.AddValue("id", SqliteValue::Text(id));
    all.AddValue("name", SqliteValue::Text(name));
    all.AddValue("address", SqliteValue::Text(address));
    all.AddValue("port", port);
    all.AddValue("volume", SqliteValue::Text(volume));
    all.AddValue("enabled", enabled);

    SqliteValueList record;
    for (const std::string& field : fields) record.AddValue(field, all.GetValue(field));
    return record;
}

bool Node::LoadRecord(const SqliteValueList& record)
{
    Node node;
    if (!record.GetValue("id", node.id) || !record.GetValue("name", node.name) ||
        !record.GetValue("address", node.address) || !record.GetValue("port", node.port) ||
        !record.GetValue("volume", node.volume) || !record.GetValue("enabled", node.enabled)) {
        return false;
    }
    *this = node;
    return true;
}

std::vector<std::string> Node::GetRecordFields() const
{
    return {"id", "name", "address", "port", "volume", "enabled"};
}

Json::Value Node::ToJson() const
{
    Json::Value json(Json::objectValue);
    json["id"] = id;
    json["name"] = name;
    json["address"] = address;
    json["port"] = port;
    json["volume"] = volume;
    json["enabled"] = enabled;
    return json;
}

}  // namespace NodeRegistry
