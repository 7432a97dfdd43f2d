#include <orvadrcore/request.h>
#include <orvadrcore/response.h>

#include <memory>

#include "show.h"

namespace {

using OrvaDRCore::Request;
using OrvaDRCore::Response;

void ShowRequest(const Request& request)
{
    Show{"request", request.isValid(), request.toStr(), request.toJson()};
    Show{"  parts",
         request.getAPI(),
         request.getMethod(),
         request.getVersion(),
         request.getTimeout(),
         request.isEncryptRequired(),
         request.getUploadFile().name,
         request.getUploadFile().path,
         request.getParams()};
}

template <class Class>
void ShowRequests()
{
    ShowRequest(Class());
    Class request("DR.Node", 2, "get", Json::Value());
    Json::Value members;
    members["b"] = 2;
    Show{"added", request.addParam("a", 1), request.addParam(members), request.addParam("api", 1)};
    ShowRequest(request);
    ShowRequest(Class(request.toJson()));
    request.setAPI("DR.Set");
    request.setMethod("set");
    request.setVersion(3);
    request.setTimeout(60);
    request.setUploadFile({"name", "/path"});
    Show{"encrypt", request.setEncryptRequired(true)};
    const Class copy(request);
    request.clear();
    ShowRequest(request);
    ShowRequest(copy);
    request.setRequest(members);
    Show{"read", Request::FromText(R"({"api":"a","version":1,"method":"m"})", request),
         Request::FromText("[]", request), Request::isValidKey("api")};
    ShowRequest(request);
}

void ShowResponse(const Response& response)
{
    Show{"response", response.toLine(), response.isValid(), response.isSuccess()};
    Show{"  error", response.getErrCode(), response.getErrMsg(), response.getErr()};
    Show{"  data",
         response.hasData(),
         response.getData(),
         response.hasDataField("id"),
         response.getDataField("id"),
         response.getDataFieldtoStr("id")};
    Show{"  task", response.isPollFinish(), response.isPollSuccess(), response.getTaskId()};
    Show{"  others",
         response.hasField("more"),
         response.getField("more"),
         response.hasAdditional(),
         response.getAdditional(),
         response.getResp()};
}

template <class Class>
void ShowResponses()
{
    ShowResponse(Class());
    ShowResponse(Class("not JSON"));
    const std::string text = R"({"success":true,"more":1,"data":{"id":"n1","finish":true,)"
                             R"("success":true,"task_id":"t1","additional":[2]}})";
    Class response(text);
    ShowResponse(response);
    const Class copy(response);
    response.clear();
    ShowResponse(response);
    ShowResponse(copy);
    ShowResponse(Class(Response::Success()));
    ShowResponse(Class(Response::Success("data")));
    ShowResponse(Class(Response::Failure(404)));
    ShowResponse(Class(Response::Failure(507, "errors")));
    Show{"set", response.setResp(text), response.setResp("{}"), response.setResp("{")};
    response.setResp(Json::Value(1));
    ShowResponse(response);
}

}  // namespace

void CallWebApi()
{
    ShowRequests<Request>();
    ShowRequests<Derived<Request>>();
    const std::unique_ptr<Request> request = std::make_unique<Derived<Request>>();
    ShowResponses<Response>();
    ShowResponses<Derived<Response>>();
    const std::unique_ptr<Response> response = std::make_unique<Derived<Response>>();
    Show{"owned", request->isValid(), response->isValid()};
}
