// Several processes that start working at the same moment.
#ifndef ORVADRCORE_TESTS_CROWD_H
#define ORVADRCORE_TESTS_CROWD_H

#include <unistd.h>

#include <algorithm>
#include <functional>
#include <memory>
#include <vector>

#include "support/processes/child_process.h"

class Crowd {
    static constexpr unsigned int DeadlineSeconds = 600;  // for long runs

  public:
    // Forks the processes. Each will run `body` with its number, from 0.
    Crowd(int size, const std::function<void(int)>& body)
    {
        children_.reserve(static_cast<std::size_t>(size));
        for (int i = 0; i < size; ++i) {
            children_.push_back(
                std::make_unique<ChildProcess>([&body, i](ChildProcess::Link& link) {
                    link.Tell();
                    if (!link.Await()) return;
                    ::alarm(DeadlineSeconds);
                    body(i);
                }));
        }
    }

    // Lets all of them start. False when one has not come up.
    bool Start() const
    {
        const bool ready = std::all_of(children_.begin(), children_.end(),
                                       [](const auto& child) { return child->Await(); });
        for (const auto& child : children_) child->Tell();
        return ready;
    }

    // Waits until all have ended. False when one has failed.
    bool Join() const
    {
        int failed = 0;
        for (const auto& child : children_) failed += child->Join() != 0 ? 1 : 0;
        return failed == 0;
    }

  private:
    std::vector<std::unique_ptr<ChildProcess>> children_;
};

#endif
