#include "probe.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <cerrno>

namespace NodeRegistry {

namespace {

// A socket address of either family.
struct Endpoint {
    sockaddr_storage address{};
    socklen_t size = 0;
};

// Converts a numeric address or "localhost". Not by getaddrinfo(), which takes locks: this may run in
// a forked child.
bool ToEndpoint(const std::string& address, int port, Endpoint& endpoint)
{
    const std::string host = address == "localhost" ? "127.0.0.1" : address;
    const in_port_t networkPort = htons(static_cast<in_port_t>(port));
    auto* ipv4 = reinterpret_cast<sockaddr_in*>(&endpoint.address);
    if (::inet_pton(AF_INET, host.c_str(), &ipv4->sin_addr) == 1) {
        ipv4->sin_family = AF_INET;
        ipv4->sin_port = networkPort;
        endpoint.size = sizeof *ipv4;
        return true;
    }
    auto* ipv6 = reinterpret_cast<sockaddr_in6*>(&endpoint.address);
    if (::inet_pton(AF_INET6, host.c_str(), &ipv6->sin6_addr) == 1) {
        ipv6->sin6_family = AF_INET6;
        ipv6->sin6_port = networkPort;
        endpoint.size = sizeof *ipv6;
        return true;
    }
    return false;
}

// Waits for a connection that is in progress; false if it fails or takes too long.
bool IsMade(int fd)
{
    pollfd waiting{fd, POLLOUT, 0};
    if (::poll(&waiting, 1, ProbeTimeoutMSec) != 1) return false;
    int error = 0;
    socklen_t size = sizeof error;
    return ::getsockopt(fd, SOL_SOCKET, SO_ERROR, &error, &size) == 0 && error == 0;
}

bool Accepts(const Endpoint& endpoint)
{
    const auto* address = reinterpret_cast<const sockaddr*>(&endpoint.address);
    const int fd = ::socket(address->sa_family, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0);
    if (fd < 0) return false;
    const bool isConnected =
        ::connect(fd, address, endpoint.size) == 0 || (errno == EINPROGRESS && IsMade(fd));
    ::close(fd);
    return isConnected;
}

}  // namespace

Json::Value ProbeAddress(const std::string& address, int port)
{
    Endpoint endpoint;
    if (!ToEndpoint(address, port, endpoint)) return {};
    return Accepts(endpoint) ? "reachable" : "unreachable";
}

Json::Value MeasureVolume(const std::string& path)
{
    struct statvfs status {};
    if (::statvfs(path.c_str(), &status) != 0) return {};
    Json::Value space(Json::objectValue);
    space["used"] = Json::UInt64{(status.f_blocks - status.f_bfree) * status.f_frsize};
    space["free"] = Json::UInt64{status.f_bavail * status.f_frsize};
    return space;
}

}  // namespace NodeRegistry
