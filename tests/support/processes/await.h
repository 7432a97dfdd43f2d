// Waiting for what another process does.
#ifndef ORVADRCORE_TESTS_AWAIT_H
#define ORVADRCORE_TESTS_AWAIT_H

#include <chrono>
#include <thread>

// Waits until `condition` holds. False after a minute, far longer than any test has to wait.
template <class Condition>
bool AwaitUntil(Condition condition)
{
    constexpr std::chrono::seconds Deadline(60);
    constexpr std::chrono::milliseconds Step(1);
    const auto end = std::chrono::steady_clock::now() + Deadline;
    while (!condition()) {
        if (std::chrono::steady_clock::now() > end) return false;
        std::this_thread::sleep_for(Step);
    }
    return true;
}

#endif
