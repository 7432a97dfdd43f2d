#include <orvadrcore/request.h>

#include <utility>

#include "base/json_helpers.h"

namespace OrvaDRCore {

namespace {

constexpr const char* ApiKey = "api";
constexpr const char* MethodKey = "method";
constexpr const char* VersionKey = "version";

// Moves a text out of an object's member; any other member stays.
void TakeText(Json::Value& object, const char* key, std::string& text)
{
    const Json::Value* member = FindMember(object, key);
    if (member == nullptr || !member->isString()) return;
    text = member->asString();
    object.removeMember(key);
}

}  // namespace

Request::Request(const std::string& apiName, int apiVersion, const std::string& methodName,
                 const Json::Value& parameters)
    : version(apiVersion), api(apiName), method(methodName), params(parameters)
{
}

Request::Request(const Json::Value& request)
{
    setRequest(request);
}

Request::~Request() = default;

void Request::setRequest(const Json::Value& request)
{
    params = request;
    TakeText(params, ApiKey, api);
    TakeText(params, MethodKey, method);
    const Json::Value* member = FindMember(params, VersionKey);
    if (member != nullptr && member->isInt()) {
        version = member->asInt();
        params.removeMember(VersionKey);
    }
}

void Request::clear()
{
    version = -1;
    timeout = 300;
    api.clear();
    method.clear();
    uploadFile = UploadFileDescription();
    Clear(params);
    // encryptRequired stays as it was, on purpose.
}

void Request::setVersion(int apiVersion)
{
    version = apiVersion;
}

void Request::setMethod(const std::string& methodName)
{
    method = methodName;
}

void Request::setAPI(const std::string& apiName)
{
    api = apiName;
}

void Request::setTimeout(int limit)
{
    timeout = limit;
}

void Request::setUploadFile(const UploadFileDescription& file)
{
    uploadFile = file;
}

bool Request::setEncryptRequired(bool required)
{
    encryptRequired = required;
    return true;
}

bool Request::isValidKey(const std::string& key)
{
    return key != ApiKey && key != MethodKey && key != VersionKey;
}

bool Request::takesParams() const
{
    return params.isNull() || params.isObject();
}

bool Request::addParam(const std::string& key, const Json::Value& value)
{
    if (!isValidKey(key) || !FitsJsonName(key.size()) || !takesParams()) return false;
    Json::Value copy(value);  // made first: the value may be a part of the parameters
    params[key] = std::move(copy);
    return true;
}

bool Request::addParam(const Json::Value& object)
{
    if (!takesParams()) return false;
    // A copy: the object may be a part of the parameters.
    const Json::Value members(object);  // NOLINT(performance-unnecessary-copy-initialization)
    bool allTaken = true;
    for (auto member = members.begin(); member != members.end(); ++member) {
        const Json::Value key = member.key();
        if (!key.isConvertibleTo(Json::stringValue)) {
            allTaken = false;  // GCOVR_EXCL_LINE: jsoncpp gives names and numbers, which are texts
        } else if (isValidKey(key.asString())) {
            params[key.asString()] = *member;
        }
    }
    return allTaken;
}

bool Request::isValid() const
{
    return !api.empty() && !method.empty() && version > 0;
}

Json::Value Request::toJson() const
{
    Json::Value json = takesParams() ? params : Json::Value(Json::objectValue);
    json[ApiKey] = ToJsonText(api);
    json[MethodKey] = ToJsonText(method);
    json[VersionKey] = version;
    return json;
}

std::string Request::toStr() const
{
    return api + "/" + method + "/" + std::to_string(version);
}

}  // namespace OrvaDRCore
