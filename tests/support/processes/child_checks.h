// Checks that need a process of their own. When an EXPECT, ASSERT or ExpectLines fails in it, the
// test fails.
#ifndef ORVADRCORE_TESTS_CHILD_CHECKS_H
#define ORVADRCORE_TESTS_CHILD_CHECKS_H

#include <functional>

#include "support/fixtures/temp_dir.h"

// Runs checks in a child process, which may close, limit or ignore anything. SIGPIPE is ignored
// already.
void CheckInChild(const std::function<void()>& checks);

// The same in a process without root's rights, which owns `dir`, even if root runs the tests.
void CheckAsOrdinaryUser(const TempDir& dir, const std::function<void()>& checks);

// Runs `write` in a process that dies at the first byte that it writes to a file.
void DieWriting(const std::function<void()>& write);

#endif
