#include "reply.h"

namespace NodeRegistry {

Json::Value Reason(const std::string& name, const std::string& reason)
{
    Json::Value errors(Json::objectValue);
    errors["name"] = name;
    errors["reason"] = reason;
    return errors;
}

}  // namespace NodeRegistry
