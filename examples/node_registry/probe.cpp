#include "probe.h"

#include <netdb.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <cerrno>
#include <memory>

namespace NodeRegistry {

namespace {

struct FreeAddress {
    void operator()(addrinfo* address) const { ::freeaddrinfo(address); }
};
using Address = std::unique_ptr<addrinfo, FreeAddress>;

// Null for what is no numeric address. Nothing is looked up, not even "localhost".
Address ToAddress(const std::string& address, int port)
{
    addrinfo hints{};
    hints.ai_flags = AI_NUMERICHOST | AI_NUMERICSERV;
    hints.ai_socktype = SOCK_STREAM;
    const std::string host = address == "localhost" ? "127.0.0.1" : address;
    addrinfo* found = nullptr;
    if (::getaddrinfo(host.c_str(), std::to_string(port).c_str(), &hints, &found) != 0) return {};
    return Address(found);
}

// Whether a connection that is being made comes about in time.
bool IsMade(int fd)
{
    pollfd waiting{fd, POLLOUT, 0};
    if (::poll(&waiting, 1, ProbeTimeoutMSec) != 1) return false;
    int error = 0;
    socklen_t size = sizeof error;
    return ::getsockopt(fd, SOL_SOCKET, SO_ERROR, &error, &size) == 0 && error == 0;
}

bool Accepts(const addrinfo& address)
{
    const int fd = ::socket(address.ai_family, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0);
    if (fd < 0) return false;
    const bool isConnected = ::connect(fd, address.ai_addr, address.ai_addrlen) == 0 ||
                             (errno == EINPROGRESS && IsMade(fd));
    ::close(fd);
    return isConnected;
}

}  // namespace

Json::Value ProbeAddress(const std::string& address, int port)
{
    const Address target = ToAddress(address, port);
    if (target == nullptr) return {};
    return Accepts(*target) ? "reachable" : "unreachable";
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
