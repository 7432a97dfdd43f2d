// A script: a database, settings, and operations on it. All of it depends on the seed alone.
#ifndef ORVADRCORE_TESTS_SHAPES_SCRIPT_H
#define ORVADRCORE_TESTS_SHAPES_SCRIPT_H

#include <cstdint>
#include <string>
#include <vector>

#include "schemas.h"
#include "side.h"
#include "sqlite/sqlite_shortcuts.h"

namespace Shapes {

struct Script {
    std::uint64_t seed;
    Schema schema;
    RetryLimits limits;
    OrvaDRCore::Shortcuts shortcuts;  // of the side that is tested
    std::vector<Operation> operations;
};

Script MakeScript(std::uint64_t seed);

// What a script begins with, in a line for people.
std::string Describe(const Script& script);

}  // namespace Shapes

#endif
