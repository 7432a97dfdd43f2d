#include "support/processes/child_checks.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <sys/resource.h>
#include <unistd.h>

#include <cstdio>
#include <stdexcept>

#include "support/processes/child_process.h"
#include "support/processes/rights.h"

void CheckInChild(const std::function<void()>& checks)
{
    (void)std::fflush(stdout);
    ChildProcess child([&](ChildProcess::Link& /*link*/) {
        checks();
        (void)std::fflush(stdout);  // or the messages would be lost with the process
        if (::testing::Test::HasFailure()) throw std::runtime_error("a check failed");
    });
    EXPECT_EQ(child.Join(), 0);
}

void CheckAsOrdinaryUser(const TempDir& dir, const std::function<void()>& checks)
{
    const bool isRoot = ::geteuid() == 0;
    if (isRoot) {
        ASSERT_EQ(::chown(dir.Path().c_str(), Nobody, Nobody), 0);
    }
    CheckInChild([&] {
        if (isRoot && !LoseRights()) throw std::runtime_error("root's rights cannot be dropped");
        checks();
    });
}

void DieWriting(const std::function<void()>& write)
{
    ChildProcess writer([&](ChildProcess::Link& /*link*/) {
        const rlimit none{0, 0};
        ::setrlimit(RLIMIT_CORE, &none);
        ::setrlimit(RLIMIT_FSIZE, &none);
        write();
    });
    EXPECT_EQ(writer.Join(), 128 + SIGXFSZ);
}
