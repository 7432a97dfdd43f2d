#include "server.h"

#include <sys/socket.h>
#include <syslog.h>

#include <cerrno>
#include <chrono>
#include <string>
#include <thread>

#include <json/value.h>

#include <orvadrcore/errors.h>
#include <orvadrcore/response.h>

#include "connection_queue.h"
#include "node_registry/handler.h"
#include "node_registry/json_line.h"
#include "node_registry/reply.h"
#include "node_registry/text.h"

namespace NodeService {

using httplib::ContentReader;
using NodeRegistry::Handler;
using NodeRegistry::Settings;
using NodeRegistry::ToPrintable;
using OrvaDRCore::ERR;
using HandlerResponse = httplib::Server::HandlerResponse;

namespace {

constexpr const char* Path = "/webapi";

// The largest request. A larger one is read and dropped up to MaxReadBytes, because a client that is
// still sending when the connection is closed may never see the reply.
constexpr std::size_t MaxBodyBytes = 1'048'576;
constexpr std::size_t MaxReadBytes = 8 * MaxBodyBytes;

// How long a client may take to start its request, and between two parts of the request or reply.
constexpr std::time_t BeginSeconds = 2;
constexpr std::time_t PartSeconds = 5;

constexpr std::size_t MostWaiting = 256;  // connections
constexpr std::size_t MaxLoggedBytes = 80;

constexpr int Ok = 200;
constexpr int NotFound = 404;
constexpr int NoMethod = 405;
constexpr int TooLarge = 413;
constexpr int NoForms = 415;
constexpr int Failed = 500;

void SetReply(httplib::Response& response, int status, const Json::Value& reply)
{
    response.status = status;
    response.set_content(NodeRegistry::ToLine(reply) + "\n", "application/json");
}

void Refuse(httplib::Response& response, int status, const char* name, const char* reason)
{
    const bool isUnknown = status == NotFound || status == NoMethod;
    const int code = isUnknown ? ERR::ERR_NO_SUCH_API : ERR::BAD_PARAMETER;
    SetReply(response, status,
             OrvaDRCore::Response::Failure(code, NodeRegistry::Reason(name, reason)));
}

void RefuseTooLarge(httplib::Response& response)
{
    Refuse(response, TooLarge, "request", "must have at most 1048576 bytes");
}

// Checked before the body is read. If the client sends no size, Answer() counts.
bool IsTooLarge(const httplib::Request& request, std::size_t limit)
{
    return request.get_header_value<uint64_t>("Content-Length") > limit;
}

// The calling thread's handler, with its own database connection. It lives as long as the thread.
Handler& OwnHandler(const Settings& settings)
{
    thread_local Handler handler(settings);
    return handler;
}

// Replies to requests that httplib itself refuses.
void ExplainError(const httplib::Request& /*request*/, httplib::Response& response)
{
    if (response.body.empty()) {
        Refuse(response, response.status, "request", "is no HTTP request that is understood");
    }
}

void ExplainException(const httplib::Request& /*request*/, httplib::Response& response,
                      const std::exception_ptr& /*exception*/)
{
    SetReply(response, Failed,
             OrvaDRCore::Response::Failure(ERR::ERR_ALLOCATE_MEMORY,
                                           NodeRegistry::Reason("request", "ran out of memory")));
}

void Log(const httplib::Request& request, const httplib::Response& response)
{
    ::syslog(LOG_INFO, "%s %s %s %d", request.remote_addr.c_str(),
             ToPrintable(request.method, MaxLoggedBytes).c_str(),
             ToPrintable(request.path, MaxLoggedBytes).c_str(), response.status);
}

}  // namespace

Server::Server(const Options& options) : options_(options)
{
    http_.set_keep_alive_max_count(1);
    http_.set_keep_alive_timeout(BeginSeconds);
    http_.set_read_timeout(PartSeconds);
    http_.set_write_timeout(PartSeconds);
    http_.set_tcp_nodelay(true);
    // By default httplib shares the port: two services would each get some of the connections.
    http_.set_socket_options([this](int socket) {
        const int yes = 1;
        ::setsockopt(socket, SOL_SOCKET, SO_REUSEADDR, &yes, sizeof yes);
        listener_ = socket;
    });
    http_.new_task_queue = [this] {
        return new ConnectionQueue(static_cast<std::size_t>(options_.threads), MostWaiting);
    };
    http_.set_pre_routing_handler(
        [this](const Request& request, Response& response) { return Route(request, response); });
    http_.Post(Path, [this](const Request& /*request*/, Response& response,
                            const ContentReader& content) { Answer(content, response); });
    http_.set_expect_100_continue_handler([](const Request& request, Response& response) {
        if (!IsTooLarge(request, MaxBodyBytes)) return 100;
        RefuseTooLarge(response);
        return response.status;
    });
    http_.set_error_handler(ExplainError);
    http_.set_exception_handler(ExplainException);
    http_.set_logger(Log);
}

bool Server::Bind()
{
    const Address& address = options_.address;
    errno = 0;
    if (address.port == 0) {
        port_ = http_.bind_to_any_port(address.host);
        if (port_ < 0) return false;
    } else {
        if (!http_.bind_to_port(address.host, address.port)) return false;
        port_ = address.port;
    }
    // httplib listens with a queue of five. Many clients at once would overflow it, and try again only
    // after a second.
    return ::listen(listener_, SOMAXCONN) == 0;
}

bool Server::Run()
{
    const bool wasStopped = http_.listen_after_bind();
    hasEnded_ = true;
    return wasStopped;
}

// Waits, because httplib ignores a stop before it runs.
void Server::Stop()
{
    while (!http_.is_running() && !hasEnded_) {
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    http_.stop();
}

// Answers requests that are not for the registry, without reading their body.
HandlerResponse Server::Route(const Request& request, Response& response) const
{
    if (request.path != Path) {
        Refuse(response, NotFound, "path", "is unknown");
    } else if (request.method != "POST") {
        response.set_header("Allow", "POST");
        Refuse(response, NoMethod, "method", "must be POST");
    } else if (request.is_multipart_form_data()) {
        Refuse(response, NoForms, "request", "must be one JSON object, no form with files");
    } else if (IsTooLarge(request, MaxReadBytes)) {
        RefuseTooLarge(response);
    } else {
        return HandlerResponse::Unhandled;
    }
    return HandlerResponse::Handled;
}

void Server::Answer(const ContentReader& content, Response& response) const
{
    std::string body;
    std::size_t size = 0;
    const bool isWhole = content([&](const char* part, std::size_t partSize) {
        size += partSize;
        if (size <= MaxBodyBytes) body.append(part, partSize);
        return size <= MaxReadBytes;
    });
    if (size > MaxBodyBytes) return RefuseTooLarge(response);
    if (!isWhole) return;  // the client has gone or sent nonsense; httplib has set the status
    SetReply(response, Ok, OwnHandler(options_.settings).Answer(body));
}

}  // namespace NodeService
