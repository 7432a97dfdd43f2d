#include "pretty.h"

#include <orvadrcore/errors.h>
#include <orvadrcore/request.h>
#include <orvadrcore/response.h>

#include "json_line.h"
#include "text.h"

namespace NodeRegistry {

using OrvaDRCore::ERR;
using OrvaDRCore::Request;
using OrvaDRCore::Response;

namespace {

constexpr std::size_t MaxBytes = 160;

std::string DescribeNodes(const Json::Value& nodes)
{
    std::string text = "  <- {\"data\":{\"nodes\":[";
    const char* separator = "\n       ";
    for (const Json::Value& node : nodes) {
        text += separator + ToLine(node);
        separator = ",\n       ";
    }
    return text + "]},\"success\":true}";
}

}  // namespace

std::string DescribeRequest(const std::string& line)
{
    Json::Value object;
    if (!ParseLine(line, object)) return ToPrintable("(no request) " + line, MaxBytes);
    const Request request(object);
    const Json::Value& params = request.getParams();
    return ToPrintable(request.toStr() + (params.empty() ? "" : " " + ToLine(params)), MaxBytes);
}

std::string DescribeReply(const Json::Value& reply)
{
    const Response response(reply);
    if (!response.isSuccess()) {
        return "  <- " + ToLine(reply) + " (" + ERR::ToString(response.getErrCode()) + ")";
    }
    if (response.hasDataField("nodes")) return DescribeNodes(response.getDataField("nodes"));
    return "  <- " + ToLine(reply);
}

}  // namespace NodeRegistry
