// Random numbers that depend on a seed alone, on every machine.
#ifndef ORVADRCORE_TESTS_SHAPES_RANDOM_H
#define ORVADRCORE_TESTS_SHAPES_RANDOM_H

#include <cstddef>
#include <cstdint>
#include <iterator>

namespace Shapes {

class Random {
  public:
    explicit Random(std::uint64_t seed) : state_(seed) {}

    // SplitMix64: each state is passed through a mixing function.
    std::uint64_t Next()
    {
        state_ += 0x9e3779b97f4a7c15U;
        std::uint64_t mixed = state_;
        mixed = (mixed ^ (mixed >> 30U)) * 0xbf58476d1ce4e5b9U;
        mixed = (mixed ^ (mixed >> 27U)) * 0x94d049bb133111ebU;
        return mixed ^ (mixed >> 31U);
    }

    std::size_t Below(std::size_t bound) { return static_cast<std::size_t>(Next() % bound); }
    bool OneIn(std::size_t count) { return Below(count) == 0; }

    template <class Choices>
    const auto& Of(const Choices& choices)
    {
        return *(std::begin(choices) + static_cast<std::ptrdiff_t>(Below(std::size(choices))));
    }

  private:
    std::uint64_t state_;
};

}  // namespace Shapes

#endif
