#include "handler.h"

#include <algorithm>
#include <chrono>
#include <ctime>
#include <filesystem>
#include <map>
#include <system_error>

#include <orvadrcore/errors.h>
#include <orvadrcore/file.h>
#include <orvadrcore/file_lock.h>
#include <orvadrcore/request.h>
#include <orvadrcore/response.h>

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
using OrvaDRCore::Response;

namespace {

constexpr const char* Api = "DR.Node";
constexpr int ApiVersion = 1;

constexpr const char* ImportVolume = "/volume1/replica";

// How an export or restore takes its lock. Attempts are a second apart.
constexpr int LockAlone = LOCK_EX | LOCK_NB;
constexpr unsigned int LockRetries = 3;

// How long a request waits for the first status.
constexpr std::chrono::seconds StatusPatience{60};

Json::Value BadRequest(const std::string& reason)
{
    return Response::Failure(ERR::BAD_PARAMETER, Reason("request", reason));
}

Json::Value BadParameter(const Parameters& parameters)
{
    return Response::Failure(ERR::BAD_PARAMETER, parameters.GetErr());
}

Json::Value NoSuchApi(const std::string& what)
{
    return Response::Failure(ERR::ERR_NO_SUCH_API, Reason(what, "is unknown"));
}

// {"success":true,"data":{"id":id}}
Json::Value DoneWith(const std::string& id)
{
    Json::Value data(Json::objectValue);
    data["id"] = id;
    return Response::Success(data);
}

// {"success":true,"data":{"count":count}}
Json::Value DoneWith(std::size_t count)
{
    Json::Value data(Json::objectValue);
    data["count"] = Json::UInt64{count};
    return Response::Success(data);
}

Json::Value BadFile(const std::string& reason)
{
    return Response::Failure(ERR::BAD_PARAMETER, Reason("file", reason));
}

Json::Value NotAlone(int code)
{
    return Response::Failure(code,
                             Reason("lock", "is held by another handler, or may not be opened"));
}

// A missing file would count as empty, and a pipe or device might never end.
bool IsReadable(const std::string& file)
{
    std::error_code ignored;
    return std::filesystem::is_regular_file(file, ignored);
}

// An existing file is overwritten, unless it is the database.
bool IsWritable(const std::string& file, const std::string& database)
{
    std::error_code ignored;
    return !std::filesystem::exists(file, ignored) ||
           (std::filesystem::is_regular_file(file, ignored) &&
            !std::filesystem::equivalent(file, database, ignored));
}

// Resolves links, so that all handlers of a file use the same name.
std::string ToFullPath(const std::string& path)
{
    std::error_code error;
    const std::filesystem::path full =
        std::filesystem::weakly_canonical(std::filesystem::absolute(path, error), error);
    return error ? path : full.string();
}

// Where the status of a database is stored: next to it, or in `directory` if that is given.
std::string StatusPathOf(const std::string& database, const std::string& directory)
{
    const std::filesystem::path file(database);
    const std::filesystem::path place =
        directory.empty() ? file.parent_path() : std::filesystem::path(ToFullPath(directory));
    return place / (file.filename().string() + ".status");
}

// Excludes other exports and restores. The destructor calls unlock(), because closing the file is not
// enough: a child that another thread has just forked has the file open, too.
class Exclusion {
  public:
    explicit Exclusion(const std::string& name)
        : lock_(name), isHeld_(lock_.lock(LockAlone, LockRetries))
    {
    }
    Exclusion(const Exclusion&) = delete;
    Exclusion& operator=(const Exclusion&) = delete;
    ~Exclusion()
    {
        if (isHeld_) lock_.unlock();
    }

    bool IsHeld() const { return isHeld_; }

  private:
    FileLock lock_;
    bool isHeld_;
};

}  // namespace

Handler::Handler(const Settings& settings)
    : registry_(settings.database),
      fullPath_(ToFullPath(settings.database)),
      statusPath_(StatusPathOf(fullPath_, settings.statusDirectory)),
      statusTimeout_(settings.statusTimeout)
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
    if (!registry_.Create(node)) return RegistryFailure();
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
    if (!registry_.Find(key, node)) return RegistryFailure();
    return Response::Success(node.ToJson());
}

// With an id, "name" is the new name; without one, it says which node is meant.
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

    // Change() does not say whether the node exists, so find it first. If another handler removes it
    // in between, that counts as removed right after this request.
    Node node;
    if (!registry_.Find(key, node)) return RegistryFailure();
    changes.id = node.id;
    if (!registry_.Change(changes, changed)) return RegistryFailure();
    return DoneWith(node.id);
}

// Finds the node first, as in Set(). If two handlers remove it at the same time, both may report
// success.
Json::Value Handler::Delete(const Json::Value& params)
{
    Parameters parameters(params);
    NodeKey key;
    if (!parameters.ReadKey(key) || !parameters.AreOnly({key.field})) {
        return BadParameter(parameters);
    }
    Node node;
    if (!registry_.Find(key, node) || !registry_.Remove(node.id)) return RegistryFailure();
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
    if (!registry_.List(condition, nodes)) return RegistryFailure();

    Json::Value data(Json::objectValue);
    data["nodes"] = Json::Value(Json::arrayValue);
    for (const Node& node : nodes) data["nodes"].append(node.ToJson());
    return Response::Success(data);
}

Json::Value Handler::Status(const Json::Value& params)
{
    Parameters parameters(params);
    if (!parameters.AreOnly({})) return BadParameter(parameters);
    if (!StatusCache::IsUsable(statusPath_)) {
        return Response::Failure(ERR::ERR_NO_PERMISSION,
                                 Reason("status", "has no directory or no lock that may be used"));
    }
    const StatusCache cache(statusPath_, statusTimeout_, registry_);
    Json::Value status = cache.GetCachedData();
    if (cache.IsValidData(status)) {
        status = cache.Read();  // at once; a child refreshes it if it is stale
    } else {
        cache.ReadWithin(StatusPatience, status);  // one request takes it, the others wait
    }
    if (cache.IsValidData(status)) {
        const Json::Int64 age = std::time(nullptr) - status["time"].asInt64();
        status["age"] = std::max(age, Json::Int64{0});
        return Response::Success(status);
    }
    if (cache.HasFailedToList()) return RegistryFailure();
    return Response::Failure(ERR::ERR_NODE_GET, Reason("status", "could not be taken or stored"));
}

// Creates the nodes one by one, like that many create requests. A refused node does not affect the
// others.
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
            if (registry_.Create(node)) {
                ++created;
                continue;
            }
            if (registry_.GetErrCode() != ERR::ERR_NODE_EXIST) return RegistryFailure();
        }
        refused[ToPrintable(name, MaxNameBytes)] = reason;
    }
    Json::Value data(Json::objectValue);
    data["created"] = created;
    data["refused"] = refused;
    return Response::Success(data);
}

// The lock only excludes other exports and restores. Other readers see the old file or the new one.
Json::Value Handler::Export(const Json::Value& params)
{
    Parameters parameters(params);
    std::string file;
    if (!parameters.AreOnly({"file"}) || !parameters.ReadFile(file)) {
        return BadParameter(parameters);
    }
    if (!IsWritable(file, fullPath_)) return BadFile("is the database, or no regular file");
    const Exclusion exclusion(fullPath_ + ".lock");
    if (!exclusion.IsHeld()) return NotAlone(ERR::ERR_NODE_GET);

    std::vector<Node> nodes;
    if (!registry_.List("", nodes)) return RegistryFailure();
    if (!File::Replace(file, ToDocument(nodes))) {
        return Response::Failure(ERR::ERR_NODE_GET, Reason("file", "cannot be written"));
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
    const Exclusion exclusion(fullPath_ + ".lock");
    if (!exclusion.IsHeld()) return NotAlone(ERR::ERR_NODE_SET);

    Json::Value document;
    if (!File::Read(file, document)) return BadFile("cannot be read, or is no JSON document");
    std::vector<Node> nodes;
    std::string reason;
    if (!FromDocument(document, nodes, reason)) return BadFile(reason);
    if (!registry_.Replace(nodes)) return RegistryFailure();
    return DoneWith(nodes.size());
}

Json::Value Handler::RegistryFailure() const
{
    return Response::Failure(registry_.GetErrCode(), registry_.GetErr());
}

}  // namespace NodeRegistry
