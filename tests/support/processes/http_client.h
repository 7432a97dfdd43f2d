// A small HTTP client for services on 127.0.0.1. A connection carries one request, which may be
// sent in parts and may be malformed.
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
    int status = 0;  // 0 without a complete reply
    std::string head;
    std::string body;
};

class HttpConnection {
  public:
    // Connects. A call that takes longer than `patience` counts as the end of the connection.
    explicit HttpConnection(int port, std::chrono::seconds patience = std::chrono::seconds(60));
    HttpConnection(const HttpConnection&) = delete;
    HttpConnection& operator=(const HttpConnection&) = delete;
    ~HttpConnection();

    bool IsOpen() const { return fd_ >= 0; }

    // Sends a part of a request. Receive() notices when the server has closed the connection.
    void Send(const std::string& part) const;

    // The next bytes of the reply, as many as have arrived.
    std::string ReceiveSome() const;

    // The whole reply: everything until the connection ends.
    HttpReply Receive() const;

  private:
    int fd_;
};

std::string HttpRequest(const std::string& method, const std::string& path,
                        const std::string& body);

HttpReply Post(int port, const std::string& path, const std::string& body,
               std::chrono::seconds patience = std::chrono::seconds(60));

#endif
