#include "documents.h"

#include <charconv>
#include <set>

#include "parameters.h"

namespace NodeRegistry {

namespace {

constexpr int DocumentVersion = 1;

// {"name":"port","reason":"is missing"} as one text.
std::string ToText(const Json::Value& reason)
{
    return reason["name"].asString() + " " + reason["reason"].asString();
}

// A number if the whole text is one; otherwise the text, which is refused as a port later.
Json::Value ToPort(const std::string& text)
{
    int port = 0;
    const char* end = text.data() + text.size();
    const auto [rest, error] = std::from_chars(text.data(), end, port);
    return error == std::errc() && rest == end ? Json::Value(port) : Json::Value(text);
}

// Whether the node's id and name differ from all before it.
bool IsNew(const Node& node, std::set<std::string>& ids, std::set<std::string>& names)
{
    return ids.insert(node.id).second && names.insert(node.name).second;
}

bool FromJson(const Json::Value& json, Node& node, std::string& ret_reason)
{
    if (!json.isObject()) {
        ret_reason = "is no object";
        return false;
    }
    const std::vector<std::string> fields = Node().GetRecordFields();
    Parameters parameters(json);
    if (parameters.AreOnly(fields) && parameters.ReadFields(fields, node)) return true;
    ret_reason = ToText(parameters.GetErr());
    return false;
}

}  // namespace

bool FromLine(const std::string& name, const std::string& endpoint, const std::string& volume,
              Node& ret_node, std::string& ret_reason)
{
    const std::size_t colon = endpoint.rfind(':');
    std::string address = endpoint.substr(0, colon);
    if (address.size() >= 2 && address.front() == '[' && address.back() == ']') {
        address = address.substr(1, address.size() - 2);
    } else if (address.find(':') != std::string::npos) {
        ret_reason = "address must be in brackets when it has colons";
        return false;
    }
    Json::Value json(Json::objectValue);
    json["name"] = name;
    json["address"] = address;
    if (colon != std::string::npos) json["port"] = ToPort(endpoint.substr(colon + 1));
    json["volume"] = volume;

    Parameters parameters(json);
    Node node;
    if (!parameters.ReadFields({"name", "address", "port", "volume"}, node)) {
        ret_reason = ToText(parameters.GetErr());
        return false;
    }
    ret_node = node;
    return true;
}

Json::Value ToDocument(const std::vector<Node>& nodes)
{
    Json::Value document(Json::objectValue);
    document["version"] = DocumentVersion;
    document["nodes"] = Json::Value(Json::arrayValue);
    for (const Node& node : nodes) document["nodes"].append(node.ToJson());
    return document;
}

bool FromDocument(const Json::Value& document, std::vector<Node>& ret_nodes,
                  std::string& ret_reason)
{
    if (!document.isObject() || document["version"] != DocumentVersion ||
        !document["nodes"].isArray()) {
        ret_reason = "holds no document of nodes in version 1";
        return false;
    }
    std::vector<Node> nodes;
    std::set<std::string> ids;
    std::set<std::string> names;
    for (const Json::Value& json : document["nodes"]) {
        Node node;
        std::string reason = "has the id or the name of another one";
        if (!FromJson(json, node, reason) || !IsNew(node, ids, names)) {
            ret_reason =
                "holds a bad node, number " + std::to_string(nodes.size() + 1) + ": " + reason;
            return false;
        }
        nodes.push_back(node);
    }
    ret_nodes.swap(nodes);
    return true;
}

}  // namespace NodeRegistry
