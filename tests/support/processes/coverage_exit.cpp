// For coverage builds: replaces _exit, so that processes which end with it write their figures,
// too. Traced processes do not: a test counts their system calls, and one that is killed while
// writing spoils the figures. No allocation fails while they are written.
#include <sys/syscall.h>
#include <unistd.h>

#include <cstdlib>

#include "support/fakes/allocation_faults.h"

// Only the fault tests have it.
[[gnu::weak]] void AskBeforeAllocating(bool (*fails)());

extern "C" void __gcov_dump();  // NOLINT(bugprone-reserved-identifier)

extern "C" void _exit(int status)
{
    if (&AskBeforeAllocating != nullptr) AskBeforeAllocating(nullptr);
    if (std::getenv("ORVADR_TRACED") == nullptr) __gcov_dump();  // NOLINT(concurrency-mt-unsafe)
    while (true) ::syscall(SYS_exit_group, status);
}
