// A request from any JSON, the first input line, with parameters added from the second.
#include <orvadrcore/request.h>

#include "base/json_helpers.h"
#include "support/fuzz.h"

using OrvaDRCore::Request;

namespace {

// The document, or the text itself if it is not JSON.
Json::Value Parse(const std::string& text)
{
    Json::Value value(text);
    OrvaDRCore::fromString(value, text);
    return value;
}

// Removes and returns a member of the given kind; null without one.
Json::Value Take(Json::Value& object, const char* key, bool (Json::Value::*isRight)() const)
{
    Json::Value member;
    if (object.isObject() && object.isMember(key) && (object[key].*isRight)()) {
        object.removeMember(key, &member);
    }
    return member;
}

void CheckParts(const Request& request, const Json::Value& document)
{
    Json::Value params = document;
    const Json::Value api = Take(params, "api", &Json::Value::isString);
    const Json::Value method = Take(params, "method", &Json::Value::isString);
    const Json::Value version = Take(params, "version", &Json::Value::isInt);
    Expect(request.getAPI() == api.asString(), "the API is the document's");
    Expect(request.getMethod() == method.asString(), "the method is the document's");
    Expect(request.getVersion() == (version.isNull() ? -1 : version.asInt()),
           "the version is the document's");
    Expect(request.getParams() == params, "the parameters are the rest");
    Expect(request.getTimeout() == 300 && !request.isEncryptRequired() &&
               request.getUploadFile().name.empty() && request.getUploadFile().path.empty(),
           "all else is not taken from JSON");
}

void CheckWhole(const Request& request)
{
    Expect(request.isValid() == (!request.getAPI().empty() && !request.getMethod().empty() &&
                                 request.getVersion() > 0),
           "a request is valid when it has all three parts");
    Expect(request.toStr() == request.getAPI() + "/" + request.getMethod() + "/" +
                                  std::to_string(request.getVersion()),
           "the text names the three parts");
    const Json::Value json = request.toJson();
    const Request again(json);
    Expect(again.toJson() == json && again.toStr() == request.toStr(), "the JSON form comes back");
}

void CheckAdding(Request request, const Json::Value& added)
{
    const Json::Value before = request.getParams();
    const bool takes = before.isNull() || before.isObject();
    Expect(request.addParam(added) == takes, "objects and null take parameters");
    if (!takes) Expect(request.getParams() == before, "a refusal changes nothing");

    Json::Value expected = before;
    for (auto member = added.begin(); takes && member != added.end(); ++member) {
        const std::string key = added.isArray() ? std::to_string(member.index()) : member.name();
        if (Request::isValidKey(key)) expected[key] = *member;
        Expect(request.addParam(key, *member) == Request::isValidKey(key),
               "all keys but the reserved ones are taken");
    }
    Expect(request.getParams() == expected, "the parameters are those before and the added ones");

    request.addParam(request.getParams());
    Expect(request.getParams() == expected, "parameters added to themselves stay what they are");
    request.addParam("self", request.getParams());
    CheckWhole(request);
    request.setRequest(request.getParams());
    CheckWhole(request);
    const Json::ValueType type = request.getParams().type();
    request.clear();
    Expect(!request.isValid() && request.getParams().empty(), "a cleared request is empty");
    const bool keepsType = type == Json::objectValue || type == Json::arrayValue;
    Expect(request.getParams().type() == (keepsType ? type : Json::nullValue),
           "cleared parameters keep their type");
}

void CheckText(const std::string& text)
{
    Json::Value document;
    const bool isObject = OrvaDRCore::fromString(document, text) && document.isObject();
    Request request("api", 1, "method", Json::Value("old"));
    request.setEncryptRequired(true);
    Expect(Request::FromText(text, request) == isObject, "a text is one JSON object");
    if (isObject) {
        CheckParts(request, document);
    } else {
        Expect(request.toStr() == "api/method/1" && request.getParams() == "old" &&
                   request.isEncryptRequired(),
               "a refusal changes nothing");
    }
}

}  // namespace

void Fuzz(const std::string& input)
{
    const std::size_t end = std::min(input.find('\n'), input.size());
    const Json::Value document = Parse(input.substr(0, end));
    const Request request(document);
    CheckParts(request, document);
    CheckWhole(request);
    CheckAdding(request, Parse(input.substr(end)));
    CheckText(input.substr(0, end));
    CheckText(input);
}
