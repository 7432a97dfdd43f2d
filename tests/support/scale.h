// How often a test repeats what it does. Usually a few times; as often as it takes to trust the
// result with ORVADR_TEST_SCALE=long in the environment; with a number there, so many times the
// usual.
#ifndef ORVADRCORE_TESTS_SCALE_H
#define ORVADRCORE_TESTS_SCALE_H

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>

inline int Scaled(int usual, int full)
{
    const char* scale = std::getenv("ORVADR_TEST_SCALE");  // NOLINT(concurrency-mt-unsafe)
    if (scale == nullptr) return usual;
    if (std::strcmp(scale, "long") == 0) return full;
    return usual * std::max(1, static_cast<int>(std::strtol(scale, nullptr, 10)));
}

// Says how often it was, in the output and in the report.
inline void ReportCount(const char* what, int count)
{
    std::printf("[  COUNT   ] %d %s\n", count, what);
    ::testing::Test::RecordProperty(what, count);
}

#endif
