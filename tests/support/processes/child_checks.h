// Checks that need a process of their own. EXPECT, ASSERT and ExpectLines count in it as they do in
// the test.
#ifndef ORVADRCORE_TESTS_CHILD_CHECKS_H
#define ORVADRCORE_TESTS_CHILD_CHECKS_H

#include <functional>

#include "support/fixtures/temp_dir.h"

// In a process in which anything may be closed, limited or ignored; SIGPIPE is ignored already.
void CheckInChild(const std::function<void()>& checks);

// In a process without root's rights, whoever runs the tests. `dir` is its user's.
void CheckAsOrdinaryUser(const TempDir& dir, const std::function<void()>& checks);

// Runs `write` in a process that is killed at the first byte that it writes to a file.
void DieWriting(const std::function<void()>& write);

#endif
