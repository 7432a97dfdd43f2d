// The threads of the service, and the connections that wait for one of them.
#ifndef NODE_SERVICE_CONNECTION_QUEUE_H
#define NODE_SERVICE_CONNECTION_QUEUE_H

#include <condition_variable>
#include <cstddef>
#include <functional>
#include <list>
#include <mutex>
#include <thread>
#include <vector>

#include <httplib.h>

namespace NodeService {

// Serves connections in the order in which they came. When too many wait, no more are accepted: those
// wait in the kernel, and cost the service no descriptor, which its database needs as well.
class ConnectionQueue : public httplib::TaskQueue {
  public:
    ConnectionQueue(std::size_t threadCount, std::size_t mostWaiting);

    // Called by the thread that accepts connections, and holds it up while the queue is full.
    void enqueue(std::function<void()> serve) override;

    // Returns when all connections are served and the threads have ended.
    void shutdown() override;

  private:
    void Work();

    const std::size_t mostWaiting;
    std::mutex mutex;  // guards `waiting` and `isEnding`
    std::condition_variable changed;
    std::list<std::function<void()>> waiting;
    bool isEnding = false;
    std::vector<std::thread> threads;
};

}  // namespace NodeService

#endif
