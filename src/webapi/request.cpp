#include <orvadrcore/request.h>

#include <utility>

#include "base/json_helpers.h"

namespace OrvaDRCore {

namespace {

constexpr const char* ApiKey = "api";
constexpr const char* MethodKey = "method";
constexpr const char* VersionKey = "version";

// Moves a string member out of `object` into `text`. A member of another type stays.
void TakeText(Json::Value& object, const char* key, std::string& text)
{
    const Json::Value* member = FindMember(object, key);
    if (member == nullptr || !member->isString()) return;
    text = member->asString();
    object.removeMember(key);
}

}  // namespace

Request::Request(const std::string& api, int version, const std::string& method,
                 const Json::Value& params)
    : version_(version), api_(api), method_(method), params_(params)
{
}

Request::Request(const Json::Value& request)
{
    setRequest(request);
}

Request::~Request() = default;

bool Request::FromText(const std::string& text, Request& request)
{
    Json::Value document;
    if (!fromString(document, text) || !document.isObject()) return false;
    Request read;
    read.params_.swap(document);
    read.takeReservedKeys();
    // From here on nothing can fail.
    request.clear();
    request.encryptRequired_ = false;
    request.version_ = read.version_;
    request.api_.swap(read.api_);
    request.method_.swap(read.method_);
    request.params_.swap(read.params_);
    return true;
}

void Request::setRequest(const Json::Value& request)
{
    params_ = request;
    takeReservedKeys();
}

// Moves the three parts out of the parameters.
void Request::takeReservedKeys()
{
    TakeText(params_, ApiKey, api_);
    TakeText(params_, MethodKey, method_);
    const Json::Value* member = FindMember(params_, VersionKey);
    if (member != nullptr && member->isInt()) {
        version_ = member->asInt();
        params_.removeMember(VersionKey);
    }
}

void Request::clear()
{
    version_ = -1;
    timeout_ = 300;
    api_.clear();
    method_.clear();
    uploadFile_ = UploadFileDescription();
    Clear(params_);
    // encryptRequired_ stays: the contract says so.
}

void Request::setVersion(int version)
{
    version_ = version;
}

void Request::setMethod(const std::string& method)
{
    method_ = method;
}

void Request::setAPI(const std::string& api)
{
    api_ = api;
}

void Request::setTimeout(int timeout)
{
    timeout_ = timeout;
}

void Request::setUploadFile(const UploadFileDescription& file)
{
    uploadFile_ = file;
}

bool Request::setEncryptRequired(bool required)
{
    encryptRequired_ = required;
    return true;
}

bool Request::isValidKey(const std::string& key)
{
    return key != ApiKey && key != MethodKey && key != VersionKey;
}

bool Request::takesParams() const
{
    return params_.isNull() || params_.isObject();
}

bool Request::addParam(const std::string& key, const Json::Value& value)
{
    if (!isValidKey(key) || !FitsJsonName(key.size()) || !takesParams()) return false;
    Json::Value copy(value);  // first, because the value may be part of the parameters
    params_[key] = std::move(copy);
    return true;
}

bool Request::addParam(const Json::Value& object)
{
    if (!takesParams()) return false;
    // A copy, because the object may be part of the parameters.
    const Json::Value members(object);  // NOLINT(performance-unnecessary-copy-initialization)
    bool allTaken = true;
    for (auto member = members.begin(); member != members.end(); ++member) {
        const Json::Value key = member.key();
        if (!key.isConvertibleTo(Json::stringValue)) {
            allTaken = false;  // GCOVR_EXCL_LINE: a key is a name or a number, which convert
        } else if (isValidKey(key.asString())) {
            params_[key.asString()] = *member;
        }
    }
    return allTaken;
}

bool Request::isValid() const
{
    return !api_.empty() && !method_.empty() && version_ > 0;
}

Json::Value Request::toJson() const
{
    Json::Value json = takesParams() ? params_ : Json::Value(Json::objectValue);
    json[ApiKey] = ToJsonText(api_);
    json[MethodKey] = ToJsonText(method_);
    json[VersionKey] = version_;
    return json;
}

std::string Request::toStr() const
{
    return api_ + "/" + method_ + "/" + std::to_string(version_);
}

}  // namespace OrvaDRCore
