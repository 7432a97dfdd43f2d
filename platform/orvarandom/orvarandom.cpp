#include <orvarandom/orvarandom.h>

#include <sys/random.h>

#include <cstdint>

#include "base/errno.h"

namespace ORVA::RANDOM {

namespace {

// 64 bits from the kernel. It always gives this few at once, but early after boot it waits for
// randomness, and a signal may interrupt the wait.
std::uint64_t KernelBits()
{
    std::uint64_t bits = 0;
    OrvaDRCore::RetryOnEintr([&] { return ::getrandom(&bits, sizeof bits, 0); });
    return bits;
}

}  // namespace

unsigned int ORVARandom::urandom(unsigned int min, unsigned int max)
{
    if (max <= min) return min;
    const std::uint64_t range = std::uint64_t{max} - min + 1;
    // Numbers beyond the last whole multiple of the range would favour small results.
    const std::uint64_t limit = UINT64_MAX - UINT64_MAX % range;
    std::uint64_t bits = KernelBits();
    while (bits >= limit) bits = KernelBits();
    return static_cast<unsigned int>(min + bits % range);
}

}  // namespace ORVA::RANDOM
