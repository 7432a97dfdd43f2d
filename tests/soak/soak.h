// One run.
#ifndef ORVADRCORE_TESTS_SOAK_SOAK_H
#define ORVADRCORE_TESTS_SOAK_SOAK_H

#include "plan.h"

namespace Soak {

// Makes the directories, and mounts the small disk, which nobody else sees. Before any thread. False
// when that cannot be done.
bool Prepare(const Plan& plan);

// Runs the soak, and prints its report. Whether all promises were kept; if so, nothing is left.
bool Run(const Plan& plan);

}  // namespace Soak

#endif
