// One run of the soak.
#ifndef ORVADRCORE_TESTS_SOAK_SOAK_H
#define ORVADRCORE_TESTS_SOAK_SOAK_H

#include "plan.h"

namespace Soak {

// Makes the directories and mounts the small disk, visible only to this process and its children.
// Call it before starting a thread. False on failure.
bool Prepare(const Plan& plan);

// Runs the soak and prints the report. Returns whether all promises were kept; then removes all
// files.
bool Run(const Plan& plan);

}  // namespace Soak

#endif
