// The registry behind HTTP. One thread accepts connections, others serve them.
//
//     Server server(options);
//     if (!server.Bind()) return EXIT_FAILURE;
//     std::thread accepting([&] { server.Run(); });
//     ...
//     server.Stop();
//     accepting.join();
//
// A connection carries one request, because httplib keeps a thread for each open connection: a few
// idle clients would occupy all threads. It also means that bytes after a refused body are never read
// as another request.
#ifndef NODE_SERVICE_SERVER_H
#define NODE_SERVICE_SERVER_H

#include <atomic>

#include <httplib.h>

#include "options.h"

namespace NodeService {

class Server {
  public:
    explicit Server(const Options& options);

    // Binds the address; from now on connections are queued. On failure false, with errno or, if
    // that says nothing, 0.
    bool Bind();

    // The port, which the system has chosen if the options say 0. Call after Bind().
    int GetPort() const { return port_; }

    // Accepts connections until Stop(), and returns when all requests are answered. False if
    // accepting connections failed.
    bool Run();

    // Ends Run(), even if it has not started yet. Call once, from another thread.
    void Stop();

  private:
    using Request = httplib::Request;
    using Response = httplib::Response;

    httplib::Server::HandlerResponse Route(const Request& request, Response& response) const;
    void Answer(const httplib::ContentReader& content, Response& response) const;

    const Options options_;
    httplib::Server http_;
    int listener_ = -1;
    int port_ = 0;
    std::atomic<bool> hasEnded_{false};
};

}  // namespace NodeService

#endif
