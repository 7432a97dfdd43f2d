// The threads of the service, and the connections that wait for a thread.
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

// Serves connections in the order of arrival. If too many wait, no more are accepted. The others wait
// in the kernel, where they use none of the descriptors that the database needs, too.
class ConnectionQueue : public httplib::TaskQueue {
  public:
    ConnectionQueue(std::size_t threadCount, std::size_t mostWaiting);

    // Called by the accepting thread; blocks it while the queue is full.
    void enqueue(std::function<void()> serve) override;

    // Waits until all connections are served and all threads have ended.
    void shutdown() override;

  private:
    void Work();

    const std::size_t mostWaiting_;
    std::mutex mutex_;  // guards waiting_ and isEnding_
    std::condition_variable changed_;
    std::list<std::function<void()>> waiting_;
    bool isEnding_ = false;
    std::vector<std::thread> threads_;
};

}  // namespace NodeService

#endif
