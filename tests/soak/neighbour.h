// Processes of a soak that run this program in another role.
#ifndef ORVADRCORE_TESTS_SOAK_NEIGHBOUR_H
#define ORVADRCORE_TESTS_SOAK_NEIGHBOUR_H

#include <string>

namespace Soak {

// A daemon with other work than the library's. One thread reads the status and prints a line each
// time, another starts programs, others log, format times and copy locales. It ends with its
// standard input. Returns the exit code.
int RunNeighbour(const std::string& database, const std::string& statusDirectory);

// Holds an exclusive lock on a database for LockIsHeld. Returns the exit code.
int HoldLock(const std::string& database);

}  // namespace Soak

#endif
