#include "schema.h"

#include <cstdlib>

#include "base/json_helpers.h"

namespace {

bool HasType(const Json::Value& value, const std::string& type)
{
    if (type == "null") return value.isNull();
    if (type == "string") return value.isString();
    if (type == "integer") return value.isIntegral() && value.type() != Json::realValue;
    if (type == "number") return value.isNumeric();
    if (type == "array") return value.isArray();
    if (type == "object") return value.isObject();
    std::abort();  // not used by the schema
}

bool HasOneOfTypes(const Json::Value& value, const Json::Value& types)
{
    if (types.isString()) return HasType(value, types.asString());
    for (const Json::Value& type : types) {
        if (HasType(value, type.asString())) return true;
    }
    return false;
}

bool IsListed(const Json::Value& value, const Json::Value& list)
{
    for (const Json::Value& listed : list) {
        if (value == listed) return true;
    }
    return false;
}

std::string FindWrongMember(const Json::Value& value, const Json::Value& rule,
                            const Json::Value& schema, const std::string& place)
{
    for (const Json::Value& name : rule["required"]) {
        if (!value.isMember(name.asString())) return place + ": lacks " + name.asString();
    }
    for (const std::string& name : value.getMemberNames()) {
        std::string memberPlace = place;
        memberPlace.append("/").append(name);
        if (rule["properties"].isMember(name)) {
            std::string wrong =
                FindMismatch(value[name], rule["properties"][name], schema, memberPlace);
            if (!wrong.empty()) return wrong;
        } else if (rule.isMember("additionalProperties")) {
            return memberPlace + ": is not in the schema";
        }
    }
    return {};
}

}  // namespace

std::string FindMismatch(const Json::Value& value, const Json::Value& rule,
                         const Json::Value& schema, const std::string& place)
{
    if (rule.isMember("$ref")) {
        const std::string name = rule["$ref"].asString().substr(sizeof("#/$defs/") - 1);
        return FindMismatch(value, schema["$defs"][name], schema, place);
    }
    if (rule.isMember("anyOf")) {
        std::string wrong;
        for (const Json::Value& choice : rule["anyOf"]) {
            wrong = FindMismatch(value, choice, schema, place);
            if (wrong.empty()) return {};
        }
        return wrong;
    }
    if (rule.isMember("type") && !HasOneOfTypes(value, rule["type"])) {
        return place + ": is " + OrvaDRCore::toString(value);
    }
    if (rule.isMember("enum") && !IsListed(value, rule["enum"])) {
        return place + ": is " + OrvaDRCore::toString(value);
    }
    if (value.isObject()) return FindWrongMember(value, rule, schema, place);
    for (Json::ArrayIndex index = 0; value.isArray() && index < value.size(); ++index) {
        std::string wrong =
            FindMismatch(value[index], rule["items"], schema, place + "/" + std::to_string(index));
        if (!wrong.empty()) return wrong;
    }
    return {};
}

const Json::Value& OrvadrSchema()
{
    static const Json::Value schema = [] {
        Json::Value value;
        if (!OrvaDRCore::fromFile(value, ORVADR_SOURCE_DIR "/docs/orvadr.schema.json")) {
            std::abort();
        }
        return value;
    }();
    return schema;
}
