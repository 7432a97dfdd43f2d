// The rights of the test program and of its children.
#ifndef ORVADRCORE_TESTS_RIGHTS_H
#define ORVADRCORE_TESTS_RIGHTS_H

#include <string>

// Makes this process able to open any lock file, as root is. An ordinary user becomes root in a
// user namespace, with a lock directory of its own in place of the machine's. False when the kernel
// does not allow that.
bool BecomeRoot();

// Makes this process an ordinary user, for good. False when that fails.
bool LoseRights();

// Whether this process could mount a file system of `bytes` bytes on a directory, which nobody else
// sees.
bool MountSmallDisk(const std::string& directory, int bytes);

// Whether this process could mount a file system in memory on a directory, which nobody else sees,
// and whose times go on in the kernel's clock ticks.
bool MountCoarseDisk(const std::string& directory);

#endif
