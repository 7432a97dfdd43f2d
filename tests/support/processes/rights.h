// Changes the rights of this process and its children.
#ifndef ORVADRCORE_TESTS_RIGHTS_H
#define ORVADRCORE_TESTS_RIGHTS_H

#include <sys/types.h>

#include <string>

// The ordinary user, and its group.
constexpr uid_t Nobody = 65534;

// Lets this process open any lock file, as root can. An ordinary user becomes root in a user
// namespace with its own lock directory. False when the kernel does not allow that.
bool BecomeRoot();

// Takes root's capabilities from this process and the programs that it starts, without a way back: it has
// the rights of the user that it is. False when that fails.
bool LoseCapabilities();

// Makes this process an ordinary user, without a way back. False when that fails.
bool LoseRights();

// Mounts a file system of `bytes` bytes on a directory, visible to this process and its children
// only. False when that fails.
bool MountSmallDisk(const std::string& directory, int bytes);

// The same with a file system in memory whose times advance in the kernel's clock ticks.
bool MountCoarseDisk(const std::string& directory);

#endif
