// A caller of the library that is compiled twice: with 32-bit and with 64-bit sizes of files and times. On
// 64-bit machines both are the same.
#ifndef ORVADRCORE_TESTS_CALLER_H
#define ORVADRCORE_TESTS_CALLER_H

#include <cstddef>
#include <string>
#include <vector>

struct Caller {
    std::size_t sizeOfTime;
    std::size_t sizeOfOffset;

    // The size and alignment of each public class, and of derived ones: "SqliteDB 8 8".
    std::vector<std::string> (*layouts)();

    // What operations of each header return and leave in a directory.
    std::vector<std::string> (*results)(const std::string& dir);
};

extern const Caller UsualCaller;
extern const Caller WideCaller;

#endif
