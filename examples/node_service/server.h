// The registry behind HTTP. One thread accepts connections, others serve them.
//
//     Server server(options);
//     if (!server.Bind()) return EXIT_FAILURE;
//     std::thread accepting([&] { server.Run(); });
//     ...
//     server.Stop();
//     accepting.join();
//
// A connection carries one request: httplib keeps a thread for each open connection, so that a few
// idle clients would keep all threads from the others. That also makes whatever follows a refused
// body harmless: it is never read as another request.
#ifndef NODE_SERVICE_SERVER_H
#define NODE_SERVICE_SERVER_H

#include <atomic>

#include <httplib.h>

#include "options.h"

namespace NodeService {

class Server {
  public:
    explicit Server(const Options& options);

    // Takes the address, from which on connections are queued. False when it cannot be had, with
    // errno where that says why, otherwise 0.
    bool Bind();

    // The port, which the system has chosen when 0 was asked for. After Bind().
    int GetPort() const { return port; }

    // Accepts connections until Stop(), and returns when all requests are answered. False when
    // accepting failed before.
    bool Run();

    // Ends Run(), whether it has begun or not. From another thread, once.
    void Stop();

  private:
    using Request = httplib::Request;
    using Response = httplib::Response;

    httplib::Server::HandlerResponse Route(const Request& request, Response& response) const;
    void Answer(const httplib::ContentReader& content, Response& response) const;

    const Options options;
    httplib::Server http;
    int listener = -1;
    int port = 0;
    std::atomic<bool> hasEnded{false};
};

}  // namespace NodeService

#endif
