#include "handler.h"

#include <algorithm>
#include <ctime>
#include <filesystem>
#include <map>
#include <system_error>

#include <orvadrcore/errors.h>
#include <orvadrcore/file.h>
#include <orvadrcore/file_lock.h>
#include <orvadrcore/request.h>

#include "documents.h"
#include "json_line.h"
#include "parameters.h"
#include "reply.h"
#include "status_cache.h"
#include "text.h"

namespace NodeRegistry {

using OrvaDRCore::ERR;
using OrvaDRCore::File;
using OrvaDRCore::FileLock;
using OrvaDRCore::Request;

namespace {

constexpr const char* Api = "DR.Node";
constexpr int ApiVersion = 1;

constexpr const char* ImportVolume = "/volume1/replica";

// How an export or a restore keeps others away, and how often it tries to; a second apart.
constexpr int LockAlone = LOCK_EX | LOCK_NB;
constexpr unsigned int LockRetries = 3;

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

// {"success":true,"data":{"count":count}}
Json::Value DoneWith(std::size_t count)
{
    Json::Value data(Json::objectValue);
    data["count"] = Json::UInt64{count};
    return Success(data);
}

Json::Value BadFile(const std::string& reason)
{
    return Failure(ERR::BAD_PARAMETER, Reason("file", reason));
}

Json::Value NotAlone(int code)
{
    return Failure(code, Reason("lock", "is held by another handler, or may not be opened"));
}

// A missing file would read as an empty one, and a pipe or a device perhaps without end.
bool IsReadable(const std::string& file)
{
    std::error_code ignored;
    return std::filesystem::is_regular_file(file, ignored);
}

// What is there already is overwritten when it is a file, but not the database.
bool IsWritable(const std::string& file, const std::string& database)
{
    std::error_code ignored;
    return !std::filesystem::exists(file, ignored) ||
           (std::filesystem::is_regular_file(file, ignored) &&
            !std::filesystem::equivalent(file, database, ignored));
}

// Links resolved, so that all handlers of a file have one name for it.
std::string ToFullPath(const std::string& path)
{
    std::error_code error;
    const std::filesystem::path full =
        std::filesystem::weakly_canonical(std::filesystem::absolute(path, error), error);
    return error ? path : full.string();
}

// The status of a database, beside it unless a directory is given.
std::string StatusPathOf(const std::string& database, const std::string& directory)
{
    const std::filesystem::path file(database);
    const std::filesystem::path place =
        directory.empty() ? file.parent_path() : std::filesystem::path(ToFullPath(directory));
    return place / (file.filename().string() + ".status");
}

// The lock that keeps other exports and restores away. It is freed by name: closing the file alone
// would leave it to a child of another thread's that was forked meanwhile.
class Exclusion {
  public:
    explicit Exclusion(const std::string& name)
        : lock(name), isHeld(lock.lock(LockAlone, LockRetries))
    {
    }
    Exclusion(const Exclusion&) = delete;
    Exclusion& operator=(const Exclusion&) = delete;
    ~Exclusion()
    {
        if (isHeld) lock.unlock();
    }

    bool IsHeld() const { return isHeld; }

  private:
    FileLock lock;
    bool isHeld;
};

}  // namespace

Handler::Handler(const Settings& settings)
    : registry(settings.database),
      fullPath(ToFullPath(settings.database)),
      statusPath(StatusPathOf(fullPath, settings.statusDirectory)),
      statusTimeout(settings.statusTimeout)
{
}

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
    if (method == "status") return Status(request.getParams());
    if (method == "import") return Import(request.getParams());
    if (method == "export") return Export(request.getParams());
    if (method == "restore") return Restore(request.getParams());
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

Json::Value Handler::Status(const Json::Value& params)
{
    Parameters parameters(params);
    if (!parameters.AreOnly({})) return BadParameter(parameters);
    if (!StatusCache::IsUsable(statusPath)) {
        return Failure(ERR::ERR_NO_PERMISSION,
                       Reason("status", "has no directory or no lock that may be used"));
    }
    const StatusCache cache(statusPath, statusTimeout, registry);
    Json::Value status = cache.Read();
    if (cache.IsValidData(status)) {
        const Json::Int64 age = std::time(nullptr) - status["time"].asInt64();
        status["age"] = std::max(age, Json::Int64{0});
        return Success(status);
    }
    if (cache.HasFailedToList()) return RegistryFailure();
    return Failure(ERR::ERR_NODE_GET, Reason("status", "could not be taken or stored"));
}

// Node by node, as that many create requests: those that are refused keep no other one out.
Json::Value Handler::Import(const Json::Value& params)
{
    Parameters parameters(params);
    std::string file;
    Node common;
    common.volume = ImportVolume;
    if (!parameters.AreOnly({"file", "volume"}) || !parameters.ReadFile(file) ||
        (parameters.Has("volume") && !parameters.ReadFields({"volume"}, common))) {
        return BadParameter(parameters);
    }
    std::map<std::string, std::string> lines;
    if (!IsReadable(file) || File::Read(file, lines) < 0) return BadFile("cannot be read");

    int created = 0;
    Json::Value refused(Json::objectValue);
    for (const auto& [name, endpoint] : lines) {
        Node node;
        std::string reason = "name belongs to another node";
        if (FromLine(name, endpoint, common.volume, node, reason)) {
            if (registry.Create(node)) {
                ++created;
                continue;
            }
            if (registry.GetErrCode() != ERR::ERR_NODE_EXIST) return RegistryFailure();
        }
        refused[ToPrintable(name, MaxNameBytes)] = reason;
    }
    Json::Value data(Json::objectValue);
    data["created"] = created;
    data["refused"] = refused;
    return Success(data);
}

// The lock keeps other exports and restores away, nobody else: the file is written in place, and
// who reads it without the lock may see a part of it.
Json::Value Handler::Export(const Json::Value& params)
{
    Parameters parameters(params);
    std::string file;
    if (!parameters.AreOnly({"file"}) || !parameters.ReadFile(file)) {
        return BadParameter(parameters);
    }
    if (!IsWritable(file, fullPath)) return BadFile("is the database, or no regular file");
    const Exclusion exclusion(fullPath + ".lock");
    if (!exclusion.IsHeld()) return NotAlone(ERR::ERR_NODE_GET);

    std::vector<Node> nodes;
    if (!registry.List("", nodes)) return RegistryFailure();
    if (!File::Write(file, ToDocument(nodes))) {
        return Failure(ERR::ERR_NODE_GET, Reason("file", "cannot be written"));
    }
    return DoneWith(nodes.size());
}

Json::Value Handler::Restore(const Json::Value& params)
{
    Parameters parameters(params);
    std::string file;
    if (!parameters.AreOnly({"file"}) || !parameters.ReadFile(file)) {
        return BadParameter(parameters);
    }
    if (!IsReadable(file)) return BadFile("cannot be read");
    const Exclusion exclusion(fullPath + ".lock");
    if (!exclusion.IsHeld()) return NotAlone(ERR::ERR_NODE_SET);

    Json::Value document;
    if (!File::Read(file, document)) return BadFile("cannot be read, or is no JSON document");
    std::vector<Node> nodes;
    std::string reason;
    if (!FromDocument(document, nodes, reason)) return BadFile(reason);
    if (!registry.Replace(nodes)) return RegistryFailure();
    return DoneWith(nodes.size());
}

Json::Value Handler::RegistryFailure() const
{
    return Failure(registry.GetErrCode(), registry.GetErr());
}

}  // namespace NodeRegistry
