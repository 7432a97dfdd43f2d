#include "parameters.h"

#include <algorithm>

#include <orvadrcore/utils.h>

#include "filter.h"
#include "reply.h"
#include "text.h"

namespace NodeRegistry {

using OrvaDRCore::Container;
using OrvaDRCore::Validator;

namespace {

constexpr std::size_t MaxFileBytes = 4095;  // the system's limit for a path

bool TakeText(const Json::Value& value, std::size_t maxBytes, std::string& ret_text)
{
    if (!value.isString() || !IsPlainText(value.asString(), maxBytes)) return false;
    ret_text = value.asString();
    return true;
}

bool TakeId(const Json::Value& value, Node& node)
{
    return TakeText(value, MaxIdBytes, node.id);
}

bool TakeName(const Json::Value& value, Node& node)
{
    return TakeText(value, MaxNameBytes, node.name);
}

bool TakeAddress(const Json::Value& value, Node& node)
{
    return TakeText(value, MaxAddressBytes, node.address) &&
           node.address.find(' ') == std::string::npos;
}

bool TakePort(const Json::Value& value, Node& node)
{
    if (!value.isInt() || value.asInt() < 1 || value.asInt() > 65535) return false;
    node.port = value.asInt();
    return true;
}

bool TakeVolume(const Json::Value& value, Node& node)
{
    return TakeText(value, MaxVolumeBytes, node.volume) && Validator::IsVolPath(node.volume);
}

bool TakeEnabled(const Json::Value& value, Node& node)
{
    if (!value.isBool()) return false;
    node.enabled = value.asBool();
    return true;
}

// The rule for a field.
struct Rule {
    const char* field;
    bool (*take)(const Json::Value& value, Node& node);
    const char* words;
};

constexpr Rule Rules[] = {
    {"id", TakeId, "must be a text of 1 to 64 bytes without control characters"},
    {"name", TakeName, "must be a text of 1 to 64 bytes without control characters"},
    {"address", TakeAddress,
     "must be a text of 1 to 253 bytes without blanks and control characters"},
    {"port", TakePort, "must be an integer from 1 to 65535"},
    {"volume", TakeVolume,
     "must be a path that begins with /volume, of at most 4096 bytes without control characters"},
    {"enabled", TakeEnabled, "must be true or false"},
};

}  // namespace

bool Parameters::Has(const std::string& name) const
{
    return params_.isMember(name);
}

bool Parameters::AreOnly(const std::vector<std::string>& names)
{
    for (const std::string& member : params_.getMemberNames()) {
        if (std::find(names.begin(), names.end(), member) == names.end()) {
            return Refuse("parameters", names.empty() ? "none can be given"
                                                      : "only these can be given: " +
                                                            Container::ToString(names, ", "));
        }
    }
    return true;
}

bool Parameters::ReadKey(NodeKey& ret_key)
{
    if (!Has("id") && !Has("name")) return Refuse("id", "is missing; an id or a name is needed");
    const std::string field = Has("id") ? "id" : "name";
    Node node;
    if (!ReadField(field, node)) return false;
    ret_key = {field, field == "id" ? node.id : node.name};
    return true;
}

bool Parameters::ReadFields(const std::vector<std::string>& names, Node& node)
{
    return std::all_of(names.begin(), names.end(),
                       [&](const std::string& name) { return ReadField(name, node); });
}

bool Parameters::ReadField(const std::string& name, Node& node)
{
    if (!Has(name)) return Refuse(name, "is missing");
    const auto* rule = std::find_if(std::begin(Rules), std::end(Rules),
                                    [&](const Rule& each) { return each.field == name; });
    return rule->take(params_[name], node) || Refuse(name, rule->words);
}

bool Parameters::ReadFile(std::string& ret_path)
{
    if (!Has("file")) return Refuse("file", "is missing");
    return TakeText(params_["file"], MaxFileBytes, ret_path) ||
           Refuse("file", "must be a path of at most 4095 bytes without control characters");
}

bool Parameters::ReadFilter(std::string& ret_condition)
{
    if (!Has("filter") || ToCondition(params_["filter"], ret_condition)) return true;
    return Refuse("filter",
                  "must be an object with one of and, or, ids, not_ids, enabled, not_enabled, "
                  "holding at most 32 filters in all");
}

bool Parameters::Refuse(const std::string& name, const std::string& reason)
{
    err_ = Reason(name, reason);
    return false;
}

}  // namespace NodeRegistry
