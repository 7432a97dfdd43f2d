#include "connection_queue.h"

#include <utility>

namespace NodeService {

ConnectionQueue::ConnectionQueue(std::size_t threadCount, std::size_t most) : mostWaiting(most)
{
    while (threads.size() < threadCount) threads.emplace_back([this] { Work(); });
}

void ConnectionQueue::enqueue(std::function<void()> serve)
{
    std::unique_lock<std::mutex> lock(mutex);
    changed.wait(lock, [this] { return waiting.size() < mostWaiting; });
    waiting.push_back(std::move(serve));
    changed.notify_all();
}

void ConnectionQueue::shutdown()
{
    {
        const std::lock_guard<std::mutex> lock(mutex);
        isEnding = true;
    }
    changed.notify_all();
    for (std::thread& thread : threads) thread.join();
}

void ConnectionQueue::Work()
{
    std::unique_lock<std::mutex> lock(mutex);
    while (true) {
        changed.wait(lock, [this] { return !waiting.empty() || isEnding; });
        if (waiting.empty()) return;
        const std::function<void()> serve = std::move(waiting.front());
        waiting.pop_front();
        lock.unlock();
        changed.notify_all();
        serve();
        lock.lock();
    }
}

}  // namespace NodeService
