// An updater that is killed, wherever it stands, leaves a cache that the next reader can use.
#include <gmock/gmock.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <functional>
#include <stdexcept>
#include <string>
#include <system_error>

#include <orvadrcore/file_lock.h>

#include "support/await.h"
#include "support/child_process.h"
#include "support/kills.h"
#include "support/pauses.h"
#include "support/process_test.h"
#include "support/scale.h"
#include "support/traced_process.h"

namespace {

using OrvaDRCore::FileLock;
using ::testing::AnyOf;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::IsSubsetOf;

constexpr int Old = 1;
constexpr int New = 2;
constexpr int Later = 3;

// Waits for the end of a child, which stays a zombie.
void AwaitZombie(pid_t pid)
{
    siginfo_t info{};
    ASSERT_EQ(::waitid(P_PID, static_cast<id_t>(pid), &info, WEXITED | WNOWAIT), 0);
}

class KillTest : public ProcessTest {
  protected:
    using Action = std::function<void()>;

    // Lets `inspect` see what is left of a refresh that was killed, for one refresh after the
    // other, each killed at another of the beginnings and ends of its system calls.
    void KillRefreshes(const Action& prepare, const Action& inspect);

    // The cache file holds the old document (or none) or the new one, and the next reader makes it
    // a later one, waits for nobody and leaves nothing else behind.
    void ExpectRecovery(int old);

    // A process that never ends to produce; it tells when it has begun to.
    ChildProcess StartEndlessUpdater()
    {
        return ChildProcess([this](ChildProcess::Link& link) {
            const auto produce = [&link](Json::Value& /*data*/) {
                link.Tell();
                return link.Await();
            };
            MakeCache(Mode::Blocking, produce).Read();
        });
    }

  private:
    void Refresh() { MakeCache(Mode::Blocking, Gives(New)).Read(); }
    int CountStops();
};

int KillTest::CountStops()
{
    TracedProcess updater([this] { Refresh(); });
    int stops = 0;
    while (updater.Step()) ++stops;
    EXPECT_EQ(updater.ExitCode(), 0);
    EXPECT_EQ(NumberInFile(), New);
    return stops;
}

void KillTest::KillRefreshes(const Action& prepare, const Action& inspect)
{
    constexpr int UsualKills = 40;
    prepare();
    const int stops = CountStops();
    const int kills = std::min(stops, Scaled(UsualKills, stops));
    for (int kill = 0; kill < kills && !HasFailure(); ++kill) {
        const int last = 1 + kill * stops / kills;
        SCOPED_TRACE("killed at stop " + std::to_string(last) + " of " + std::to_string(stops));
        prepare();
        TracedProcess updater([this] { Refresh(); });
        for (int stop = 0; stop < last; ++stop) updater.Step();
        updater.Kill();
        AwaitDescendants();  // a program that it had started
        inspect();
    }
    ReportCount("kills", kills);
}

void KillTest::ExpectRecovery(int old)
{
    const int found = NumberInFile();
    EXPECT_THAT(found, AnyOf(old, New));
    if (found != NoDocument) MakeStale();
    EXPECT_TRUE(FileLock(LockName()).tryLock(LOCK_EX | LOCK_NB));
    const Pauses pauses;
    EXPECT_EQ(NumberOf(MakeCache(Mode::Blocking, Gives(Later)).Read()), Later);
    EXPECT_THAT(pauses.Taken(), IsEmpty());
    EXPECT_EQ(NumberInFile(), Later);
    EXPECT_THAT(Files(), ElementsAre("x.cached"));
}

TEST_F(KillTest, ARefreshKilledAnywhereLeavesTheOldDocumentOrTheNewOne)
{
    if (!HasLocks()) return;
    KillRefreshes([this] { WriteStale(Old); }, [this] { ExpectRecovery(Old); });
}

TEST_F(KillTest, AFirstRefreshKilledAnywhereLeavesNoDocumentOrTheNewOne)
{
    if (!HasLocks()) return;
    const auto removeAll = [this] {
        MakeCache(Mode::Blocking, nullptr).Remove();
        RemoveLocks();
    };
    KillRefreshes(removeAll, [this] { ExpectRecovery(NoDocument); });
}

// The caller, the child that refreshes and the one between them, each in its turn.
TEST_F(KillTest, ABackgroundRefreshOfWhichAnyProcessIsKilledIsFollowedByAnother)
{
    if (!HasLocks()) return;
    const auto read = [this] {
        // The old data, or the new where the child is quicker than its parent.
        const int number = NumberOf(MakeCache(Mode::Background, Gives(New)).Read());
        if (number != Old && number != New) throw std::runtime_error("no document");
    };
    KillEverywhere({[this] { WriteStale(Old); }, read, [this] { ExpectRecovery(Old); }});
}

TEST_F(KillTest, WhatKilledRefreshesLeaveBehindDoesNotPileUp)
{
    if (!HasLocks()) return;
    const auto makeStale = [this] {
        if (NumberInFile() == NoDocument) WriteStale(Old);
        MakeStale();
    };
    KillRefreshes(makeStale, [this] {
        EXPECT_THAT(Files(), IsSubsetOf({"x.cached", "x.cached.orvadr-tmp0", "x.cached.pid",
                                         "x.cached.pid.orvadr-tmp0"}));
    });
    ExpectRecovery(Old);
}

TEST_F(KillTest, WhatAKilledWriterLeftBesideAnotherIsRemovedByALaterOne)
{
    const auto write = [this] {
        MakeCache(Mode::Background, nullptr).UpdateWithData(DocumentOf(New));
    };
    const auto stepUntilWritten = [this](TracedProcess& writer, const std::string& suffix) {
        std::error_code isMissing;
        const std::string path = CacheFile() + suffix;
        while (std::filesystem::file_size(path, isMissing) == 0 || isMissing) {
            if (!writer.Step()) FAIL() << "nothing is written to " << path;
        }
    };
    {
        TracedProcess writer(write);
        stepUntilWritten(writer, ".orvadr-tmp0");
        TracedProcess killed(write);
        stepUntilWritten(killed, ".orvadr-tmp1");
        killed.Kill();
        while (writer.Step()) {
        }
        EXPECT_EQ(writer.ExitCode(), 0);
    }
    write();
    EXPECT_EQ(NumberInFile(), New);
    EXPECT_THAT(Files(), ElementsAre("x.cached"));
}

TEST_F(KillTest, AnUpdaterThatNobodyWaitedForCountsAsDead)
{
    if (!HasLocks()) return;
    WriteStale(Old);
    ChildProcess updater = StartEndlessUpdater();
    ASSERT_TRUE(updater.Await());
    updater.Kill(SIGKILL);
    AwaitZombie(updater.Pid());
    EXPECT_THAT(Files(), ElementsAre("x.cached", "x.cached.pid"));
    ExpectRecovery(Old);
}

TEST_F(KillTest, AnUpdaterWhoseIdBelongsToALaterProcessCountsAsDead)
{
    if (!HasLocks()) return;
    WriteStale(Old);
    ChildProcess updater = StartEndlessUpdater();
    ASSERT_TRUE(updater.Await());
    const Reading reading = ReadElsewhere(Mode::Background, Gives(New));
    EXPECT_EQ(reading.number, Old);
    EXPECT_FALSE(reading.startedProcesses);

    pid_t pid = 0;
    unsigned long long start = 0;
    std::ifstream(PidFile()) >> pid >> start;
    EXPECT_EQ(pid, updater.Pid());
    std::ofstream(PidFile()) << pid << "\n" << start + 1 << "\n";
    ExpectRecovery(Old);
}

TEST_F(KillTest, AKilledBackgroundUpdaterIsFollowedByAnother)
{
    if (!HasLocks()) return;
    WriteStale(Old);
    const auto never = [](Json::Value& /*data*/) {
        ::alarm(60);
        return ::pause() == 0;
    };
    EXPECT_EQ(NumberOf(MakeCache(Mode::Background, never).Read()), Old);
    ASSERT_TRUE(AwaitUntil([this] { return Productions() == 1; }));
    pid_t updater = 0;
    std::ifstream(PidFile()) >> updater;
    ASSERT_GT(updater, 0);
    ::kill(updater, SIGKILL);
    AwaitZombie(updater);

    // The old data, or the new where the child is quicker than its parent.
    EXPECT_THAT(NumberOf(MakeCache(Mode::Background, Gives(New)).Read()), AnyOf(Old, New));
    AwaitDescendants();
    EXPECT_EQ(NumberInFile(), New);
    EXPECT_THAT(Files(), ElementsAre("x.cached"));
}

}  // namespace
