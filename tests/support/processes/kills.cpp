#include "support/processes/kills.h"

#include <gtest/gtest.h>
#include <signal.h>

#include <string>

#include "support/fakes/pauses.h"
#include "support/fixtures/scale.h"
#include "support/processes/traced_process.h"

namespace {

// Kills one of the processes before each of its calls. Returns how often.
int KillMember(const Scene& scene, int member)
{
    for (int call = 1;; ++call) {
        SCOPED_TRACE("process " + std::to_string(member) + " is killed before its system call " +
                     std::to_string(call));
        scene.prepare();
        TracedProcess process(scene.body);
        const bool killed = process.KillBefore(member, call);
        EXPECT_EQ(process.ExitCode(), killed && member == 0 ? 128 + SIGKILL : 0);
        const long long slept = CountSlept().microseconds;
        scene.inspect();
        EXPECT_EQ(CountSlept().microseconds, slept) << "something waits for the killed process";
        if (!killed || ::testing::Test::HasFailure()) return call - 1;
    }
}

}  // namespace

void KillEverywhere(const Scene& scene)
{
    int kills = 0;
    int last = 0;
    for (int member = 0; (last = KillMember(scene, member)) > 0; ++member) {
        if (::testing::Test::HasFailure()) return;
        kills += last;
    }
    EXPECT_GT(kills, 0);
    ReportCount("kills", kills);
}
