// What /proc says about a process, read without the code under test.
#ifndef ORVADRCORE_TESTS_STAT_FIELD_H
#define ORVADRCORE_TESTS_STAT_FIELD_H

#include <sys/types.h>

#include <sstream>
#include <string>

#include "support/fixtures/test_files.h"

// A field of /proc/PID/stat by its number: 3 is the state, 22 the start time in clock ticks since
// boot. The name in brackets before the third field may hold anything.
inline std::string StatField(pid_t pid, int number)
{
    const std::string status = ReadFile("/proc/" + std::to_string(pid) + "/stat");
    std::istringstream fields(status.substr(status.rfind(')') + 1));
    std::string field;
    for (int each = 3; each <= number; ++each) fields >> field;
    return field;
}

#endif
