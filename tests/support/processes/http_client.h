// A small HTTP client for the services that tests start: each connection to 127.0.0.1 carries one
// request, in any parts and however broken.
//
//     EXPECT_EQ(Post(port, "/webapi", "{}").status, 200);
//
//     HttpConnection slow(port);
//     slow.Send("POST /webapi HTTP/1.1\r\n");
//     ...
//     const HttpReply reply = slow.Receive();
#ifndef ORVADRCORE_TESTS_HTTP_CLIENT_H
#define ORVADRCORE_TESTS_HTTP_CLIENT_H

#include <chrono>
#include <string>

struct HttpReply {
    int status = 0;  // 0 when no whole reply came
    std::string head;
    std::string body;
};

class HttpConnection {
  public:
    // Connects. What cannot be done in time counts as a connection that has ended.
    explicit HttpConnection(int port, std::chrono::seconds patience = std::chrono::seconds(60));
    HttpConnection(const HttpConnection&) = delete;
    HttpConnection& operator=(const HttpConnection&) = delete;
    ~HttpConnection();

    bool IsOpen() const { return fd >= 0; }

    // Sends a part of a request. A server that has gone is noticed by Receive().
    void Send(const std::string& part) const;

    // What comes next, as far as it has come.
    std::string ReceiveSome() const;

    // The whole reply, which ends with the connection.
    HttpReply Receive() const;

  private:
    int fd;
};

// A request of a method with a body.
std::string HttpRequest(const std::string& method, const std::string& path,
                        const std::string& body);

HttpReply Post(int port, const std::string& path, const std::string& body,
               std::chrono::seconds patience = std::chrono::seconds(60));

#endif
