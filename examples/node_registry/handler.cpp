#include "handler.h"

#include <orvadrcore/errors.h>
#include <orvadrcore/request.h>

#include "json_line.h"
#include "parameters.h"
#include "reply.h"

namespace NodeRegistry {

using OrvaDRCore::ERR;
using OrvaDRCore::Request;

namespace {

constexpr const char* Api = "DR.Node";
constexpr int ApiVersion = 1;

Json::Value BadRequest(const std::string& reason)
{
    return Failure(ERR::BAD_PARAMETER, Reason("request", reason));
}

Json::Value BadParameter(const Parameters& parameters)
{
    return Failure(ERR::BAD_PARAMETER, parameters.GetErr());
}

Json::Value NoSuchApi(const std::string& what)
{
    return Failure(ERR::ERR_NO_SUCH_API, Reason(what, "is unknown"));
}

// {"success":true,"data":{"id":id}}
Json::Value DoneWith(const std::string& id)
{
    Json::Value data(Json::objectValue);
    data["id"] = id;
    return Success(data);
}

}  // namespace

Json::Value Handler::Answer(const std::string& line)
{
    Json::Value object;
    if (!ParseLine(line, object)) return BadRequest("must be one JSON object on one line");
    const Request request(object);
    if (!request.isValid()) return BadRequest("must have an api, a method and a version above 0");
    if (request.getAPI() != Api) return NoSuchApi("api");
    if (request.getVersion() != ApiVersion) return NoSuchApi("version");

    const std::string& method = request.getMethod();
    if (method == "create") return Create(request.getParams());
    if (method == "get") return Get(request.getParams());
    if (method == "set") return Set(request.getParams());
    if (method == "delete") return Delete(request.getParams());
    if (method == "list") return List(request.getParams());
    return NoSuchApi("method");
}

Json::Value Handler::Create(const Json::Value& params)
{
    Parameters parameters(params);
    std::vector<std::string> fields = {"name", "address", "port", "volume"};
    if (parameters.Has("enabled")) fields.emplace_back("enabled");
    Node node;
    if (!parameters.AreOnly({"name", "address", "port", "volume", "enabled"}) ||
        !parameters.ReadFields(fields, node)) {
        return BadParameter(parameters);
    }
    if (!registry.Create(node)) return RegistryFailure();
    return DoneWith(node.id);
}

Json::Value Handler::Get(const Json::Value& params)
{
    Parameters parameters(params);
    NodeKey key;
    if (!parameters.ReadKey(key) || !parameters.AreOnly({key.field})) {
        return BadParameter(parameters);
    }
    Node node;
    if (!registry.Find(key, node)) return RegistryFailure();
    return Success(node.ToJson());
}

// With an id a name is the new name; without one it says which node is meant.
Json::Value Handler::Set(const Json::Value& params)
{
    Parameters parameters(params);
    NodeKey key;
    if (!parameters.ReadKey(key)) return BadParameter(parameters);

    std::vector<std::string> changed;
    for (const char* field : {"name", "address", "port", "volume", "enabled"}) {
        if (field != key.field && parameters.Has(field)) changed.emplace_back(field);
    }
    Node changes;
    if (!parameters.AreOnly({"id", "name", "address", "port", "volume", "enabled"}) ||
        !parameters.ReadFields(changed, changes)) {
        return BadParameter(parameters);
    }
    if (changed.empty()) {
        parameters.Refuse("parameters", "nothing is given that could be changed");
        return BadParameter(parameters);
    }

    // Whether a statement changed a row is not told, so the node is looked for first. One that
    // another handler removes in between is as if it had been removed right after this request.
    Node node;
    if (!registry.Find(key, node)) return RegistryFailure();
    changes.id = node.id;
    if (!registry.Change(changes, changed)) return RegistryFailure();
    return DoneWith(node.id);
}

// The node is looked for first, as in Set(). Of two handlers that remove it at the same time both
// may answer that they did.
Json::Value Handler::Delete(const Json::Value& params)
{
    Parameters parameters(params);
    NodeKey key;
    if (!parameters.ReadKey(key) || !parameters.AreOnly({key.field})) {
        return BadParameter(parameters);
    }
    Node node;
    if (!registry.Find(key, node) || !registry.Remove(node.id)) return RegistryFailure();
    return DoneWith(node.id);
}

Json::Value Handler::List(const Json::Value& params)
{
    Parameters parameters(params);
    std::string condition;
    if (!parameters.AreOnly({"filter"}) || !parameters.ReadFilter(condition)) {
        return BadParameter(parameters);
    }
    std::vector<Node> nodes;
    if (!registry.List(condition, nodes)) return RegistryFailure();

    Json::Value data(Json::objectValue);
    data["nodes"] = Json::Value(Json::arrayValue);
    for (const Node& node : nodes) data["nodes"].append(node.ToJson());
    return Success(data);
}

Json::Value Handler::RegistryFailure() const
{
    return Failure(registry.GetErrCode(), registry.GetErr());
}

}  // namespace NodeRegistry
