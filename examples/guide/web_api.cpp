// A web-API handler with one method, and a caller that reads its replies.
#include <cstdlib>
#include <iostream>
#include <memory>
#include <string>

#include <json/reader.h>
#include <json/value.h>
#include <json/writer.h>

#include <orvadrcore/errors.h>
#include <orvadrcore/request.h>
#include <orvadrcore/response.h>

using OrvaDRCore::ERR;
using OrvaDRCore::Request;
using OrvaDRCore::Response;

namespace {

// [parse]
// One whole JSON document; null if the text is anything else.
Json::Value Parse(const std::string& text)
{
    if (text.find('\0') != std::string::npos) return {};  // where jsoncpp would stop reading
    Json::CharReaderBuilder builder;
    Json::CharReaderBuilder::strictMode(&builder.settings_);
    builder["failIfExtra"] = true;
    const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    Json::Value value;
    try {
        const char* end = text.data() + text.size();
        if (reader->parse(text.data(), end, &value, nullptr)) return value;
    } catch (const Json::Exception&) {  // nested too deep
    }
    return {};
}
// [/parse]

// [replies]
Json::Value Success(const Json::Value& data)
{
    Json::Value reply;
    reply["success"] = true;
    reply["data"] = data;
    return reply;
}

Json::Value Failure(int code, const std::string& reason)
{
    Json::Value reply;
    reply["success"] = false;
    reply["error"]["code"] = code;
    reply["error"]["errors"]["reason"] = reason;
    return reply;
}
// [/replies]

// [handler]
Json::Value GetNode(const Json::Value& params)
{
    if (!params["name"].isString()) return Failure(ERR::BAD_PARAMETER, "name must be a text");
    if (params["name"] != "backup-01") return Failure(ERR::ERR_NODE_NOT_EXIST, "no such node");
    Json::Value node;
    node["name"] = params["name"];
    node["port"] = 5001;
    return Success(node);
}

Json::Value Answer(const std::string& text)
{
    const Request request(Parse(text));
    if (!request.isValid()) return Failure(ERR::BAD_PARAMETER, "api, method, version?");
    if (request.toStr() == "DR.Node/get/1") return GetNode(request.getParams());
    return Failure(ERR::ERR_NO_SUCH_API, request.toStr());
}
// [/handler]

std::string ToLine(const Json::Value& value)
{
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    return Json::writeString(builder, value);
}

// [caller]
// Prints a node's reply. Never trust text from another machine.
void Tell(const std::string& text)
{
    const Response response(text);
    if (!response.isValid()) {
        std::cout << "no reply at all\n";
    } else if (!response.isSuccess()) {
        const Json::Value errors = response.getErrMsg();
        std::cout << ERR::ToString(response.getErrCode());
        if (errors.isObject() && errors["reason"].isString()) {
            std::cout << ": " << errors["reason"].asString();
        }
        std::cout << '\n';
    } else if (!response.getDataField("name").isString()) {
        std::cout << "no name\n";
    } else {
        std::cout << "name: " << response.getDataFieldtoStr("name") << '\n';
    }
}
// [/caller]

}  // namespace

int main()
{
    // [request]
    Request request("DR.Node", 1, "get", Json::Value());
    request.addParam("name", "backup-01");
    std::cout << request.toStr() << ' ' << ToLine(request.toJson()) << '\n';
    // [/request]
    Tell(ToLine(Answer(ToLine(request.toJson()))));

    for (const char* text : {
             R"({"api":"DR.Node","method":"get","version":1,"name":"backup-01"})",
             R"({"api":"DR.Node","method":"get","version":1,"name":"backup-02"})",
             R"({"api":"DR.Node","method":"get","version":1,"name":7})",
             R"({"api":"DR.Node","method":"get","version":2,"name":"backup-01"})",
             R"({"api":"DR.Node","method":"get","version":"1","name":"backup-01"})",
             R"({"api":"DR.Node","method":"get"})",
             R"(["DR.Node","get",1])",
             R"({"api":"DR.Node")",
         }) {
        std::cout << text << "\n  <- " << ToLine(Answer(text)) << '\n';
    }

    for (const char* text : {
             R"({"success":true,"data":{"name":"backup-01"}})",
             R"({"success":true,"data":["backup-01"]})",
             R"({"success":false,"error":{"code":507,"errors":{"reason":"no such node"}}})",
             R"({"success":"yes","error":{"code":"507"}})",
             R"(<html>502 Bad Gateway</html>)",
         }) {
        std::cout << text << "\n  -> ";
        Tell(text);
    }

    // [task]
    const Response poll(R"({"success":true,"data":{"task_id":17,"finish":true,"success":false}})");
    std::cout << "task " << poll.getTaskId() << (poll.isPollFinish() ? " has ended" : " runs")
              << (poll.isPollSuccess() ? ", done\n" : ", not done\n");
    // [/task]
    return EXIT_SUCCESS;
}
