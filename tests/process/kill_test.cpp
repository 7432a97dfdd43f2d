// An updater may be killed at any point: the next reader can use the cache.
#include <gmock/gmock.h>
#include <signal.h>
#include <sys/file.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include <orvadrcore/file_lock.h>

#include "support/fakes/pauses.h"
#include "support/fixtures/process_test.h"
#include "support/fixtures/scale.h"
#include "support/processes/await.h"
#include "support/processes/child_process.h"
#include "support/processes/kills.h"
#include "support/processes/reap.h"
#include "support/processes/traced_process.h"

namespace {

using OrvaDRCore::FileLock;
using ::testing::AnyOf;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::IsSubsetOf;
using ::testing::Matcher;
using ::testing::MatchesRegex;

constexpr int Old = 1;
constexpr int New = 2;
constexpr int Later = 3;

class KillTest : public ProcessTest {
  protected:
    using Action = std::function<void()>;

    // Kills one refresh after the other, each at another start or end of a system call, and calls
    // `inspect` after each.
    void KillRefreshes(const Action& prepare, const Action& inspect);

    // The cache file holds the old document (or none) or the new one. The next reader replaces it
    // with a later one without waiting, and leaves no other file behind.
    void ExpectRecovery(int old);

    // A process that starts to produce data, reports it, and never finishes.
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
        ReapAll();  // a program that the updater had started
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

// Kills the caller, the intermediate process and the child that refreshes.
TEST_F(KillTest, TheNextReaderRefreshesAfterAnyProcessOfABackgroundRefreshIsKilled)
{
    if (!HasLocks()) return;
    const auto read = [this] {
        // The new data if the child is faster than its parent.
        const int number = NumberOf(MakeCache(Mode::Background, Gives(New)).Read());
        if (number != Old && number != New) throw std::runtime_error("no document");
    };
    KillEverywhere({[this] { WriteStale(Old); }, read, [this] { ExpectRecovery(Old); }});
}

TEST_F(KillTest, LeftoversOfKilledRefreshesDoNotPileUp)
{
    if (!HasLocks()) return;
    const auto makeStale = [this] {
        if (NumberInFile() == NoDocument) WriteStale(Old);
        MakeStale();
    };
    // At most one temporary file for the cache file and one for the pid file.
    const std::string temporary = R"(\.orvadr-tmp[0-9a-f]{8}\.[0-9]+\.[0-9]+\.0)";
    KillRefreshes(makeStale, [&] {
        EXPECT_THAT(Files(), IsSubsetOf<Matcher<std::string>>(
                                 {"x.cached", MatchesRegex("x\\.cached" + temporary),
                                  "x.cached.pid", MatchesRegex("x\\.cached\\.pid" + temporary)}));
    });
    ExpectRecovery(Old);
}

TEST_F(KillTest, ALaterWriterRemovesTheTemporaryFileOfAKilledOne)
{
    const auto write = [this] {
        MakeCache(Mode::Background, nullptr).UpdateWithData(DocumentOf(New));
    };
    // Temporary files that are not empty.
    const auto countWritten = [this] {
        const std::set<std::string> files = Files();
        return std::count_if(files.begin(), files.end(), [this](const std::string& name) {
            return name != "x.cached" && std::filesystem::file_size(dir.File(name)) > 0;
        });
    };
    {
        TracedProcess writer(write);
        while (countWritten() < 1) ASSERT_TRUE(writer.Step());
        TracedProcess killed(write);
        while (countWritten() < 2) ASSERT_TRUE(killed.Step());
        killed.Kill();
        while (writer.Step()) {
        }
        EXPECT_EQ(writer.ExitCode(), 0);
    }
    EXPECT_EQ(Files().size(), 2U);
    write();
    EXPECT_EQ(NumberInFile(), New);
    EXPECT_THAT(Files(), ElementsAre("x.cached"));
}

TEST_F(KillTest, WritersKilledAtAnyMomentLeaveOnlyWholeDocuments)
{
    constexpr int Writers = 4;
    const int kills = Scaled(100, 2000);
    const auto start = [this](int number) {
        return std::make_unique<ChildProcess>([this, number](ChildProcess::Link& /*link*/) {
            const DocumentCache cache = MakeCache(Mode::Background, nullptr);
            for (int next = number; cache.UpdateWithData(DocumentOf(next)); next += 7) {
            }
        });
    };
    WriteStale(Old);
    std::vector<std::unique_ptr<ChildProcess>> writers;
    writers.reserve(Writers);
    for (int writer = 0; writer < Writers; ++writer) writers.push_back(start(writer));
    for (int kill = 0; kill < kills && !HasFailure(); ++kill) {
        for (int reading = 0; reading <= kill % 5; ++reading) EXPECT_NE(NumberInFile(), NoDocument);
        auto& victim = writers[static_cast<std::size_t>(kill % Writers)];
        victim->Kill(SIGKILL);
        EXPECT_EQ(victim->Join(), 128 + SIGKILL);
        victim = start(kill);
    }
    writers.clear();
    EXPECT_TRUE(MakeCache(Mode::Background, nullptr).UpdateWithData(DocumentOf(New)));
    EXPECT_EQ(NumberInFile(), New);
    EXPECT_THAT(Files(), ElementsAre("x.cached"));
    ReportCount("kills", kills);
}

TEST_F(KillTest, AnUpdaterThatIsAZombieCountsAsDead)
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

TEST_F(KillTest, AnUpdaterWhoseProcessIdWasReusedCountsAsDead)
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

TEST_F(KillTest, TheNextReaderRefreshesAfterABackgroundUpdaterWasKilled)
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

    // The new data if the child is faster than its parent.
    EXPECT_THAT(NumberOf(MakeCache(Mode::Background, Gives(New)).Read()), AnyOf(Old, New));
    ReapAll();
    EXPECT_EQ(NumberInFile(), New);
    EXPECT_THAT(Files(), ElementsAre("x.cached"));
}

}  // namespace
