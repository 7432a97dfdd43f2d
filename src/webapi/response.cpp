#include <orvadrcore/response.h>

#include "base/json_helpers.h"

namespace OrvaDRCore {

Response::Response(const Response& other) : resp_(other.resp_) {}

Response::Response(const std::string& text)
{
    setResp(text);
}

Response::Response(const char* text)
{
    setResp(text);
}

Response::Response(const Json::Value& reply) : resp_(reply) {}

Response::~Response() = default;

bool Response::setResp(const std::string& text)
{
    resp_ = Json::Value();  // text that does not parse leaves no reply, not the old one
    return fromString(resp_, text);
}

bool Response::setResp(const char* text)
{
    return setResp(std::string(text != nullptr ? text : ""));
}

void Response::setResp(const Json::Value& reply)
{
    resp_ = reply;
}

void Response::clear()
{
    Clear(resp_);
}

Json::Value Response::Success(const Json::Value& data)
{
    Json::Value reply(Json::objectValue);
    reply["success"] = true;
    if (!data.isNull()) reply["data"] = data;
    return reply;
}

Json::Value Response::Failure(int code, const Json::Value& errors)
{
    Json::Value reply(Json::objectValue);
    reply["success"] = false;
    reply["error"]["code"] = code;
    if (!errors.isNull()) reply["error"]["errors"] = errors;
    return reply;
}

std::string Response::toLine() const
{
    return toString(resp_);
}

bool Response::isValid() const
{
    return hasField("success");
}

bool Response::isSuccess() const
{
    return AsBool(getField("success"));
}

int Response::getErrCode() const
{
    const Json::Value* code = findErrorField("code");
    return code != nullptr && code->isInt() ? code->asInt() : -1;
}

Json::Value Response::getErrMsg() const
{
    const Json::Value* errors = findErrorField("errors");
    return errors != nullptr ? *errors : Json::Value();
}

Json::Value Response::getErr() const
{
    return getField("error");
}

bool Response::hasData() const
{
    return findData() != nullptr;
}

const Json::Value& Response::getData() const
{
    const Json::Value* data = findData();
    return data != nullptr ? *data : emptyValue_;
}

bool Response::hasDataField(const char* key) const
{
    return findDataField(key) != nullptr;
}

const Json::Value& Response::getDataField(const char* key) const
{
    const Json::Value* field = findDataField(key);
    return field != nullptr ? *field : emptyValue_;
}

std::string Response::getDataFieldtoStr(const char* key) const
{
    const Json::Value& field = getDataField(key);
    return field.isString() ? field.asString() : std::string();
}

bool Response::isPollFinish() const
{
    return AsBool(getDataField("finish"));
}

bool Response::isPollSuccess() const
{
    return AsBool(getDataField("success"));
}

std::string Response::getTaskId() const
{
    return AsString(getDataField("task_id"));
}

bool Response::hasField(const char* key) const
{
    return FindMember(resp_, key) != nullptr;
}

const Json::Value& Response::getField(const char* key) const
{
    const Json::Value* field = FindMember(resp_, key);
    return field != nullptr ? *field : emptyValue_;
}

bool Response::hasAdditional() const
{
    return hasDataField("additional");
}

const Json::Value& Response::getAdditional() const
{
    return getDataField("additional");
}

const Json::Value* Response::findData() const
{
    return isSuccess() ? FindMember(resp_, "data") : nullptr;
}

const Json::Value* Response::findDataField(const char* key) const
{
    const Json::Value* data = findData();
    return data != nullptr ? FindMember(*data, key) : nullptr;
}

const Json::Value* Response::findErrorField(const char* key) const
{
    return isValid() ? FindMember(getField("error"), key) : nullptr;
}

}  // namespace OrvaDRCore
