// Time in which a wait for a lock is over after a few attempts instead of hundreds.
#ifndef ORVADRCORE_TESTS_SHAPES_FAST_CLOCK_H
#define ORVADRCORE_TESTS_SHAPES_FAST_CLOCK_H

namespace Shapes {

// From now on std::chrono::steady_clock is later by this.
void AdvanceClock(int milliseconds);

}  // namespace Shapes

#endif
