#include "support/processes/http_client.h"

#include <netinet/in.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <unistd.h>

#include <array>
#include <cstdint>
#include <cstdlib>

#include "base/errno.h"

using OrvaDRCore::RetryOnEintr;

namespace {

// A connected socket whose calls time out; -1 without a connection.
int Connect(int port, std::chrono::seconds patience)
{
    const int fd = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const timeval limit{patience.count(), 0};
    ::setsockopt(fd, SOL_SOCKET, SO_RCVTIMEO, &limit, sizeof limit);
    ::setsockopt(fd, SOL_SOCKET, SO_SNDTIMEO, &limit, sizeof limit);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<std::uint16_t>(port));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    if (::connect(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0) return fd;
    ::close(fd);
    return -1;
}

// The number that follows a header's name; -1 without the header.
long NumberAfter(const std::string& head, const std::string& name)
{
    const std::size_t at = head.find(name);
    return at == std::string::npos ? -1 : std::strtol(head.c_str() + at + name.size(), nullptr, 10);
}

}  // namespace

HttpConnection::HttpConnection(int port, std::chrono::seconds patience)
    : fd_(Connect(port, patience))
{
}

HttpConnection::~HttpConnection()
{
    if (fd_ >= 0) ::close(fd_);
}

void HttpConnection::Send(const std::string& part) const
{
    std::size_t sent = 0;
    while (sent < part.size()) {
        const ssize_t count = RetryOnEintr(
            [&] { return ::send(fd_, part.data() + sent, part.size() - sent, MSG_NOSIGNAL); });
        if (count <= 0) return;
        sent += static_cast<std::size_t>(count);
    }
}

std::string HttpConnection::ReceiveSome() const
{
    std::array<char, 16384> buffer{};
    const ssize_t count =
        RetryOnEintr([&] { return ::recv(fd_, buffer.data(), buffer.size(), 0); });
    return {buffer.data(), count > 0 ? static_cast<std::size_t>(count) : 0};
}

HttpReply HttpConnection::Receive() const
{
    std::string text;
    for (std::string part = ReceiveSome(); !part.empty(); part = ReceiveSome()) text += part;
    const std::size_t end = text.find("\r\n\r\n");
    if (text.compare(0, 9, "HTTP/1.1 ") != 0 || end == std::string::npos) return {};
    HttpReply reply{std::atoi(text.c_str() + 9), text.substr(0, end + 2), text.substr(end + 4)};
    const long length = NumberAfter(reply.head, "\r\nContent-Length: ");
    return length == static_cast<long>(reply.body.size()) ? reply : HttpReply{};
}

std::string HttpRequest(const std::string& method, const std::string& path, const std::string& body)
{
    return method + " " + path +
           " HTTP/1.1\r\nHost: 127.0.0.1\r\nContent-Length: " + std::to_string(body.size()) +
           "\r\n\r\n" + body;
}

HttpReply Post(int port, const std::string& path, const std::string& body,
               std::chrono::seconds patience)
{
    const HttpConnection connection(port, patience);
    if (!connection.IsOpen()) return {};
    connection.Send(HttpRequest("POST", path, body));
    return connection.Receive();
}
