// A reply from any text: every getter returns what the JSON says.
#include <orvadrcore/response.h>

#include "base/json_helpers.h"
#include "support/fuzz.h"

using OrvaDRCore::Response;

namespace {

// A member of an object; null without one.
const Json::Value* Member(const Json::Value* object, const std::string& key)
{
    const bool isThere = object != nullptr && object->isObject() && object->isMember(key);
    return isThere ? &(*object)[key] : nullptr;
}

Json::Value ValueOf(const Json::Value* member)
{
    return member != nullptr ? *member : Json::Value();
}

bool IsTrue(const Json::Value* value)
{
    if (value == nullptr) return false;
    return value->isBool() ? value->asBool() : value->isNumeric() && value->asDouble() != 0;
}

std::string TextOf(const Json::Value& value)
{
    const bool hasText = !value.isArray() && !value.isObject();
    return hasText ? value.asString() : std::string();
}

void CheckErrors(const Response& response, const Json::Value& reply)
{
    const Json::Value* error = Member(&reply, "error");
    const Json::Value* readable = response.isValid() ? error : nullptr;
    const Json::Value* code = Member(readable, "code");
    Expect(response.getErrCode() == (code != nullptr && code->isInt() ? code->asInt() : -1),
           "the code is that of the error");
    Expect(response.getErrMsg() == ValueOf(Member(readable, "errors")), "the errors are its, too");
    Expect(response.getErr() == ValueOf(error), "the error is the reply's");
}

void CheckData(const Response& response, const Json::Value* data)
{
    Expect(response.hasData() == (data != nullptr) && response.getData() == ValueOf(data),
           "only a success has data");
    Expect(response.hasAdditional() == (Member(data, "additional") != nullptr) &&
               response.getAdditional() == ValueOf(Member(data, "additional")),
           "what is additional stands in the data");
    Expect(response.isPollFinish() == IsTrue(Member(data, "finish")), "the data tells of the end");
    Expect(response.isPollSuccess() == IsTrue(Member(data, "success")), "and of its success");
    Expect(response.getTaskId() == TextOf(ValueOf(Member(data, "task_id"))), "and of the task");
}

void CheckKey(const Response& response, const std::string& name, const Json::Value& reply,
              const Json::Value* data)
{
    const char* key = name.c_str();
    const Json::Value* field = Member(&reply, key);
    Expect(response.hasField(key) == (field != nullptr) && response.getField(key) == ValueOf(field),
           "a field is the reply's");
    const Json::Value* member = Member(data, key);
    Expect(response.hasDataField(key) == (member != nullptr) &&
               response.getDataField(key) == ValueOf(member),
           "a field of the data is the data's");
    const bool isText = member != nullptr && member->isString();
    Expect(response.getDataFieldtoStr(key) == (isText ? member->asString() : ""),
           "a text of the data is the data's");
}

void Check(const Response& response, const Json::Value& reply)
{
    Expect(response.getResp() == reply, "the reply is what was given");
    const Json::Value* success = Member(&reply, "success");
    Expect(response.isValid() == (success != nullptr), "a reply tells of success");
    Expect(response.isSuccess() == IsTrue(success), "success is what it tells");
    const Json::Value* data = IsTrue(success) ? Member(&reply, "data") : nullptr;
    CheckErrors(response, reply);
    CheckData(response, data);
    for (const Json::Value* object : {&reply, data}) {
        if (object == nullptr || !object->isObject()) continue;
        for (const std::string& name : object->getMemberNames()) {
            CheckKey(response, name, reply, data);
        }
    }
    CheckKey(response, "", reply, data);
    Expect(!response.hasField(nullptr) && !response.hasDataField(nullptr), "null is no key");
}

}  // namespace

void Fuzz(const std::string& input)
{
    Json::Value reply;
    const bool parses = OrvaDRCore::fromString(reply, input);
    Check(Response(reply), reply);

    Response response(R"({"success": true, "data": {"finish": true}})");
    Expect(response.setResp(input) == parses, "a reply is one JSON document");
    Check(response, reply);
    Check(Response(input), reply);
    Expect(Response(response.toLine()).getResp() == reply, "its line is read back");
    const Response success(Response::Success(reply));
    Expect(success.isSuccess() && success.getData() == reply, "a success has its data");
    const Response failure(Response::Failure(507, reply));
    Expect(failure.getErrCode() == 507 && failure.getErrMsg() == reply, "a failure has its errors");
    response.clear();
    Expect(response.getResp().empty() && !response.isValid(), "a cleared reply is none");
}
