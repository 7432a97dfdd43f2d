#include "support/fakes/pauses.h"

#include <unistd.h>

#include <cstdlib>
#include <ctime>
#include <utility>

namespace {

constexpr unsigned int ShortestOwnPause = 100'001;

constexpr std::size_t EnoughRoom = 64;  // for most tests: recording a pause allocates nothing

Pauses* current = nullptr;
Slept slept{};

}  // namespace

extern "C" int usleep(useconds_t microseconds)
{
    if (current != nullptr) {
        current->Note(microseconds);
        return 0;
    }
    slept.microseconds += microseconds;
    if (microseconds >= ShortestOwnPause) ++slept.pauses;
    const timespec time{microseconds / 1'000'000,
                        static_cast<long>(microseconds % 1'000'000) * 1000};
    return ::nanosleep(&time, nullptr);
}

Pauses::Pauses()
{
    if (current != nullptr) std::abort();
    taken_.reserve(EnoughRoom);
    current = this;
}

Pauses::~Pauses()
{
    current = nullptr;
}

void Pauses::Note(unsigned int microseconds)
{
    if (microseconds < ShortestOwnPause) {
        if (!onWait_) return;
        waits_.push_back(microseconds);
        onWait_(waits_.size());
        return;
    }
    taken_.push_back(microseconds);
    if (onPause_) onPause_(taken_.size());
}

void Pauses::OnWait(std::function<void(std::size_t)> action)
{
    onWait_ = std::move(action);
}

Slept CountSlept()
{
    return slept;
}
