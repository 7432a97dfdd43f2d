// Time in which a wait for a lock is over after a few attempts instead of hundreds, and which a busy
// machine does not change.
#ifndef ORVADRCORE_TESTS_SHAPES_FAST_CLOCK_H
#define ORVADRCORE_TESTS_SHAPES_FAST_CLOCK_H

namespace Shapes {

// Advances std::chrono::steady_clock, which stands still otherwise.
void AdvanceClock(int milliseconds);

}  // namespace Shapes

#endif
