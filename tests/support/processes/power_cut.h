// What a power cut can do to a directory. The system calls of a process are recorded, and from the
// record follows what the disk can hold when the power fails after any of them:
//
// - Until a file is synced, its content, its size and its permission bits may reach the disk in any
//   order, or not at all: the file can be short, cut between two blocks or within one, or have zeros
//   instead of a block or of everything from a block on.
// - Until the directory is synced, names that were made, replaced or removed may reach the disk in
//   any order, or not at all. A renamed file can be there under both names or under neither, but a
//   replaced name always leads to one of the two files.
//
//     const Record record = RecordChanges(dir, [&] { toFile(value, path); });
//     for (const Directory& state : StatesAfterCut(before, record)) ...
#ifndef ORVADRCORE_TESTS_POWER_CUT_H
#define ORVADRCORE_TESTS_POWER_CUT_H

#include <set>

#include "support/processes/recorded_changes.h"

// All that the disk can hold after a power cut: after the last change, or after any of them.
std::set<Directory> StatesAfterCut(const Directory& before, const Record& record);
std::set<Directory> StatesAfterAnyCut(const Directory& before, const Record& record);

#endif
