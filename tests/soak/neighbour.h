// The other processes of a soak that are this program itself.
#ifndef ORVADRCORE_TESTS_SOAK_NEIGHBOUR_H
#define ORVADRCORE_TESTS_SOAK_NEIGHBOUR_H

#include <string>

namespace Soak {

// A daemon that does what daemons do beside the library. One thread reads the status as a handler does,
// and prints a line each time; another one starts programs; others log, format times and copy
// locales. Ends with its standard input. The exit code.
int RunNeighbour(const std::string& database, const std::string& statusDirectory);

// Holds an exclusive lock on a database for LockIsHeld. The exit code.
int HoldLock(const std::string& database);

}  // namespace Soak

#endif
