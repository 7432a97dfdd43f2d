#include "connection_queue.h"

#include <utility>

namespace NodeService {

ConnectionQueue::ConnectionQueue(std::size_t threadCount, std::size_t mostWaiting)
    : mostWaiting_(mostWaiting)
{
    while (threads_.size() < threadCount) threads_.emplace_back([this] { Work(); });
}

void ConnectionQueue::enqueue(std::function<void()> serve)
{
    std::unique_lock<std::mutex> lock(mutex_);
    changed_.wait(lock, [this] { return waiting_.size() < mostWaiting_; });
    waiting_.push_back(std::move(serve));
    changed_.notify_all();
}

void ConnectionQueue::shutdown()
{
    {
        const std::lock_guard<std::mutex> lock(mutex_);
        isEnding_ = true;
    }
    changed_.notify_all();
    for (std::thread& thread : threads_) thread.join();
}

void ConnectionQueue::Work()
{
    std::unique_lock<std::mutex> lock(mutex_);
    while (true) {
        changed_.wait(lock, [this] { return !waiting_.empty() || isEnding_; });
        if (waiting_.empty()) return;
        const std::function<void()> serve = std::move(waiting_.front());
        waiting_.pop_front();
        lock.unlock();
        changed_.notify_all();
        serve();
        lock.lock();
    }
}

}  // namespace NodeService
