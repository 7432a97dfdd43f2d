#include "support/fakes/process_faults.h"

#include <unistd.h>

#include <cstdlib>

#include "support/fakes/real_function.h"

namespace {

ProcessFaults* current = nullptr;

}  // namespace

ProcessFaults::ProcessFaults()
{
    if (current != nullptr) std::abort();
    current = this;
}

ProcessFaults::~ProcessFaults()
{
    current = nullptr;
}

pid_t RealFork()
{
    return RealFunction<decltype(::fork)>("fork")();
}

extern "C" pid_t fork() noexcept
{
    return current != nullptr && current->fork ? current->fork() : RealFork();
}

extern "C" std::time_t time(std::time_t* out) noexcept
{
    if (current == nullptr || !current->time) {
        return RealFunction<decltype(::time)>("time")(out);
    }
    const std::time_t now = current->time();
    if (out != nullptr) *out = now;
    return now;
}
