#include "reply.h"

namespace NodeRegistry {

Json::Value Success(const Json::Value& data)
{
    Json::Value reply(Json::objectValue);
    reply["success"] = true;
    reply["data"] = data;
    return reply;
}

Json::Value Failure(int code, const Json::Value& errors)
{
    Json::Value reply(Json::objectValue);
    reply["success"] = false;
    reply["error"]["code"] = code;
    reply["error"]["errors"] = errors;
    return reply;
}

Json::Value Reason(const std::string& name, const std::string& reason)
{
    Json::Value errors(Json::objectValue);
    errors["name"] = name;
    errors["reason"] = reason;
    return errors;
}

}  // namespace NodeRegistry
