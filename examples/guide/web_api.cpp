// A web-API handler with one method, and a caller that reads its replies.
#include <cstdlib>
#include <iostream>
#include <string>

#include <json/value.h>
#include <json/writer.h>

#include <orvadrcore/errors.h>
#include <orvadrcore/request.h>
#include <orvadrcore/response.h>

using OrvaDRCore::ERR;
using OrvaDRCore::Request;
using OrvaDRCore::Response;

namespace {

std::string ToLine(const Json::Value& value)
{
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    return Json::writeString(builder, value);
}

// [handler]
Json::Value GetNode(const Json::Value& params)
{
    if (!params["name"].isString()) {
        return Response::Failure(ERR::BAD_PARAMETER, "name must be a text");
    }
    if (params["name"] != "backup-01") return Response::Failure(ERR::ERR_NODE_NOT_EXIST);
    Json::Value node;
    node["name"] = params["name"];
    node["port"] = 5001;
    return Response::Success(node);
}

// From the line of a request to the line of its reply.
std::string Answer(const std::string& line)
{
    Request request;
    Json::Value reply;
    if (!Request::FromText(line, request) || !request.isValid()) {
        reply = Response::Failure(ERR::BAD_PARAMETER, "api, method, version?");
    } else if (request.toStr() == "DR.Node/get/1") {
        reply = GetNode(request.getParams());
    } else {
        reply = Response::Failure(ERR::ERR_NO_SUCH_API, request.toStr());
    }
    return Response(reply).toLine();
}
// [/handler]

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
        if (errors.isString()) std::cout << ": " << errors.asString();
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
    Tell(Answer(ToLine(request.toJson())));

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
        std::cout << text << "\n  <- " << Answer(text) << '\n';
    }

    for (const char* text : {
             R"({"success":true,"data":{"name":"backup-01"}})",
             R"({"success":true,"data":["backup-01"]})",
             R"({"success":false,"error":{"code":401,"errors":"name must be a text"}})",
             R"({"success":false,"error":{"code":507}})",
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
