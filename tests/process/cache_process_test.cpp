// Many processes that read one cache.
#include <gmock/gmock.h>
#include <malloc.h>
#include <poll.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include <orvadrcore/file_lock.h>

#include "support/fakes/pauses.h"
#include "support/fixtures/process_test.h"
#include "support/fixtures/scale.h"
#include "support/processes/await.h"
#include "support/processes/child_process.h"
#include "support/processes/crowd.h"
#include "support/processes/reap.h"
#include "support/processes/rights.h"
#include "support/processes/shared_memory.h"

namespace {

using OrvaDRCore::FileLock;
using ::testing::AnyOf;
using ::testing::Each;
using ::testing::ElementsAre;

constexpr int Old = 1;
constexpr int New = 2;

// Calls `action` before each pause of the library, which then sleeps as usual.
class ObservedPauses {
  public:
    explicit ObservedPauses(const std::function<void()>& action)
    {
        pauses_.OnPause([this, action](std::size_t /*count*/) {
            action();
            std::this_thread::sleep_for(std::chrono::microseconds(pauses_.Taken().back()));
        });
    }

  private:
    Pauses pauses_;
};

// ------------------------------------------------------------------------------ many at once

// A barrier for all processes that are forked while this object lives, and for their children. A
// process arrives with Arrive() or when it ends.
class Barrier {
  public:
    Barrier()
    {
        if (::pipe2(ends_.data(), O_CLOEXEC) < 0) std::abort();
    }
    Barrier(const Barrier&) = delete;
    Barrier& operator=(const Barrier&) = delete;
    ~Barrier()
    {
        Arrive();
        ::close(ends_[0]);
    }

    void Arrive()
    {
        if (ends_[1] >= 0) ::close(ends_[1]);
        ends_[1] = -1;
    }

    // Arrives and waits until all others have arrived. False after the deadline.
    bool AwaitOthers()
    {
        constexpr int DeadlineMSec = 60'000;
        Arrive();
        pollfd waiting{ends_[0], POLLIN, 0};
        return ::poll(&waiting, 1, DeadlineMSec) > 0;
    }

  private:
    std::array<int, 2> ends_{};  // a pipe; processes that have not arrived hold its write end
};

class ManyReadersTest : public ProcessTest {
  protected:
    static constexpr int Readers = 32;

    // Called while data is produced. False makes the production fail.
    using Action = std::function<bool(Barrier&)>;

    // One round: all readers read at the same moment, each in its own mode. A reader arrives at the
    // barrier when it has its data or waits for it.
    void ReadAtOnce(int number, const std::function<Mode(int)>& modeOf,
                    const Action& whileProducing);

    // The productions of the last round, and the documents that readers got which waited or did
    // not.
    int RoundProductions() const { return Productions() - productionsBefore_; }
    std::vector<int> NumbersRead(bool waited) const;

  private:
    struct Reader {
        std::atomic<int> number;  // of the document that it got
        std::atomic<bool> waited;
    };
    struct Round {
        std::array<Reader, Readers> readers;
        std::atomic<int> producing;
        std::atomic<int> overlaps;
    };

    void ReadInRound(Mode mode, Reader& reader, const Producer& produce, Barrier& barrier);

    SharedMemory<Round> round_;
    int productionsBefore_ = 0;
};

void ManyReadersTest::ReadInRound(Mode mode, Reader& reader, const Producer& produce,
                                  Barrier& barrier)
{
    const ObservedPauses pauses([&] {
        reader.waited = true;
        barrier.Arrive();
    });
    reader.number = NumberOf(MakeCache(mode, produce).Read());
}

void ManyReadersTest::ReadAtOnce(int number, const std::function<Mode(int)>& modeOf,
                                 const Action& whileProducing)
{
    productionsBefore_ = Productions();
    Barrier barrier;
    const auto produce = [&](Json::Value& data) {
        if (round_->producing++ != 0) ++round_->overlaps;
        const bool succeeded = whileProducing(barrier);
        --round_->producing;
        return succeeded && Gives(number)(data);
    };

    for (Reader& reader : round_->readers) {
        reader.number = NoDocument;
        reader.waited = false;
    }
    const Crowd crowd(Readers, [&](int i) {
        ReadInRound(modeOf(i), round_->readers.at(static_cast<std::size_t>(i)), produce, barrier);
    });
    barrier.Arrive();
    ASSERT_TRUE(crowd.Start());
    EXPECT_TRUE(crowd.Join());
    ReapAll();

    EXPECT_EQ(round_->overlaps, 0);
    EXPECT_EQ(NumberInFile(), number);
    EXPECT_THAT(Files(), ElementsAre("x.cached"));
}

std::vector<int> ManyReadersTest::NumbersRead(bool waited) const
{
    std::vector<int> numbers;
    for (const Reader& reader : round_->readers) {
        if (reader.waited == waited) numbers.push_back(reader.number);
    }
    return numbers;
}

TEST_F(ManyReadersTest, InTheBackgroundOneReaderProducesAndAllGetTheOldDocument)
{
    if (!HasLocks()) return;
    const int rounds = Scaled(3, 50);
    for (int i = 1; i <= rounds && !HasFailure(); ++i) {
        WriteStale(i);
        ReadAtOnce(
            i + 1, [](int) { return Mode::Background; },
            [](Barrier& barrier) { return barrier.AwaitOthers(); });
        EXPECT_EQ(RoundProductions(), 1);
        EXPECT_THAT(NumbersRead(false), Each(i));
        EXPECT_THAT(NumbersRead(true), ElementsAre());
    }
    ReportCount("rounds", rounds);
}

TEST_F(ManyReadersTest, OneReaderProducesAndAllThatWaitGetTheNewDocument)
{
    if (!HasLocks()) return;
    const int rounds = Scaled(3, 50);
    for (int i = 1; i <= rounds && !HasFailure(); ++i) {
        WriteStale(i);
        ReadAtOnce(
            i + 1, [](int) { return Mode::Blocking; },
            [](Barrier& barrier) { return barrier.AwaitOthers(); });
        EXPECT_EQ(RoundProductions(), 1);
        EXPECT_THAT(NumbersRead(true), Each(i + 1));
        // The one that produced, and those that could not mark themselves because of it.
        EXPECT_THAT(NumbersRead(false), Each(AnyOf(i, i + 1)));
    }
    ReportCount("rounds", rounds);
}

TEST_F(ManyReadersTest, LateReadersMayProduceAgainButNeverTwoAtATime)
{
    if (!HasLocks()) return;
    const int rounds = Scaled(1, 50);
    int all = 0;
    for (int i = 1; i <= rounds && !HasFailure(); ++i) {
        WriteStale(i);
        ReadAtOnce(
            i + 1, [](int reader) { return reader % 2 == 0 ? Mode::Background : Mode::Blocking; },
            [](Barrier& /*barrier*/) {
                std::this_thread::sleep_for(std::chrono::milliseconds(20));
                return true;
            });
        EXPECT_GE(RoundProductions(), 1);
        all += RoundProductions();
        EXPECT_THAT(NumbersRead(true), Each(i + 1));
        EXPECT_THAT(NumbersRead(false), Each(AnyOf(i, i + 1)));
    }
    ReportCount("rounds", rounds);
    ReportCount("productions", all);
}

// ---------------------------------------------------------------------------- readers and updaters

class CacheProcessTest : public ProcessTest {
  protected:
    // A process that produces data and waits for Tell() before it finishes.
    ChildProcess StartUpdater()
    {
        return ChildProcess([this](ChildProcess::Link& link) {
            const auto produce = [&link](Json::Value& data) {
                link.Tell();
                return link.Await() && Gives(New)(data);
            };
            MakeCache(Mode::Blocking, produce).Read();
        });
    }

    // A process that uses a cache and tells when it starts to wait for another updater.
    ChildProcess StartWaiter(const std::function<void(const DocumentCache&)>& action)
    {
        return ChildProcess([this, action](ChildProcess::Link& link) {
            const ObservedPauses pauses([&link] { link.Tell(); });
            action(MakeCache(Mode::Blocking, Gives(New)));
        });
    }
};

// The production ends after both have read.
TEST_F(CacheProcessTest, ABackgroundReaderDoesNotWaitForTheProduction)
{
    if (!HasLocks()) return;
    const SharedMemory<std::atomic<bool>> mayEnd;
    const auto produce = [&](Json::Value& data) {
        return AwaitUntil([&] { return mayEnd->load(); }) && Gives(New)(data);
    };
    WriteStale(Old);
    const Reading first = ReadElsewhere(Mode::Background, produce);
    ASSERT_TRUE(AwaitUntil([&] { return Productions() == 1; }));
    const Reading second = ReadElsewhere(Mode::Background, Gives(New));
    EXPECT_EQ(NumberInFile(), Old);
    *mayEnd = true;
    EXPECT_EQ(first.number, Old);
    EXPECT_TRUE(first.startedProcesses);
    EXPECT_EQ(second.number, Old);
    EXPECT_FALSE(second.startedProcesses);
    ReapAll();
    EXPECT_EQ(NumberInFile(), New);
    EXPECT_EQ(Productions(), 1);
}

TEST_F(CacheProcessTest, AWaitingReaderGetsTheDocumentOfTheOtherUpdater)
{
    if (!HasLocks()) return;
    WriteStale(Old);
    ChildProcess updater = StartUpdater();
    ASSERT_TRUE(updater.Await());
    const SharedMemory<std::atomic<int>> number;
    ChildProcess waiter =
        StartWaiter([&](const DocumentCache& cache) { *number = NumberOf(cache.Read()); });
    ASSERT_TRUE(waiter.Await());
    ASSERT_TRUE(waiter.Await()) << "the wait ended before the updater has written";
    EXPECT_EQ(NumberInFile(), Old);

    updater.Tell();
    EXPECT_EQ(updater.Join(), 0);
    EXPECT_EQ(waiter.Join(), 0);
    EXPECT_EQ(*number, New);
    EXPECT_EQ(Productions(), 1);
}

TEST_F(CacheProcessTest, AReaderWithoutADocumentWaitsForTheOtherUpdater)
{
    if (!HasLocks()) return;
    ChildProcess updater = StartUpdater();
    ASSERT_TRUE(updater.Await());
    const SharedMemory<std::atomic<int>> number;
    ChildProcess waiter([&](ChildProcess::Link& link) {
        const ObservedPauses pauses([&link] { link.Tell(); });
        *number = NumberOf(MakeCache(Mode::Background, Gives(New)).Read());
    });
    ASSERT_TRUE(waiter.Await());

    updater.Tell();
    EXPECT_EQ(updater.Join(), 0);
    EXPECT_EQ(waiter.Join(), 0);
    EXPECT_EQ(*number, New);
    EXPECT_EQ(Productions(), 1);
}

TEST_F(CacheProcessTest, AWaitingReaderGetsTheOldDocumentWhenTheUpdaterIsKilled)
{
    if (!HasLocks()) return;
    WriteStale(Old);
    ChildProcess updater = StartUpdater();
    ASSERT_TRUE(updater.Await());
    const SharedMemory<std::atomic<int>> number;
    const SharedMemory<std::atomic<bool>> updated;
    ChildProcess reader =
        StartWaiter([&](const DocumentCache& cache) { *number = NumberOf(cache.Read()); });
    ChildProcess other =
        StartWaiter([&](const DocumentCache& cache) { *updated = cache.Update(); });
    ASSERT_TRUE(reader.Await());
    ASSERT_TRUE(other.Await());

    updater.Kill(SIGKILL);
    EXPECT_EQ(reader.Join(), 0);
    EXPECT_EQ(other.Join(), 0);
    EXPECT_EQ(*number, Old);
    EXPECT_TRUE(*updated) << "the contract says true, although nothing was written";
    EXPECT_EQ(Productions(), 1) << "a process that waited must not take over";
}

TEST_F(CacheProcessTest, ReadersNeverSeePartOfADocument)
{
    constexpr int Readers = 4;
    if (!HasLocks()) return;
    const int rewrites = Scaled(300, 2000);
    const DocumentCache writer = MakeCache(Mode::Background, nullptr);
    ASSERT_TRUE(writer.UpdateWithData(DocumentOf(Old)));

    const SharedMemory<std::atomic<bool>> done;
    const SharedMemory<std::atomic<int>> reads;
    const SharedMemory<std::atomic<int>> partial;
    const Crowd crowd(Readers, [&](int) {
        while (!*done) {
            // A new object reads the file whatever its modification time.
            const int number = NumberOf(MakeCache(Mode::Background, Gives(New)).Read());
            if (number == NoDocument) ++*partial;
            ++*reads;
        }
    });
    ASSERT_TRUE(crowd.Start());
    // Long and short documents, in no particular order.
    for (int i = 0; i < rewrites; ++i) EXPECT_TRUE(writer.UpdateWithData(DocumentOf(i * 337)));
    *done = true;
    EXPECT_TRUE(crowd.Join());

    EXPECT_GT(*reads, 0);
    EXPECT_EQ(*partial, 0);
    EXPECT_EQ(Productions(), 0) << "a reader has found no valid document";
    ReportCount("rewrites", rewrites);
    ReportCount("reads", *reads);
}

TEST_F(CacheProcessTest, BackgroundRefreshesLeakNothingInALongLivedProcess)
{
    constexpr int WarmUp = 5;
    constexpr std::size_t SmallChange = 4096;
    struct State {
        std::size_t descriptors;
        std::size_t heap;
    };
    const auto look = [] { return State{CountDescriptors(), ::mallinfo2().uordblks}; };
    if (!HasLocks()) return;
    const int refreshes = Scaled(20, 300);
    WriteStale(Old);

    const SharedMemory<std::array<State, 2>> states;
    const SharedMemory<std::atomic<int>> children;
    ChildProcess process([&](ChildProcess::Link& /*link*/) {
        ::alarm(600);
        const DocumentCache cache = MakeCache(Mode::Background, Gives(Old));
        for (int i = 0; i < WarmUp + refreshes; ++i) {
            if (i == WarmUp) states->at(0) = look();
            MakeStale();
            cache.Read();
            if (!AwaitUntil([&] { return !cache.IsTimeout(); })) ::_exit(2);
            if (!AwaitUntil([&] { return ::access(PidFile().c_str(), F_OK) != 0; })) ::_exit(3);
            FileLock lock(LockName());
            if (!AwaitUntil([&] { return lock.tryLock(LOCK_EX | LOCK_NB); })) ::_exit(5);
            if (NumberOf(cache.Read()) != Old) ::_exit(4);
            if (::waitpid(-1, nullptr, WNOHANG | __WALL) >= 0) ++*children;
        }
        states->at(1) = look();
    });
    EXPECT_EQ(process.Join(), 0);
    EXPECT_EQ(Productions(), WarmUp + refreshes);
    EXPECT_EQ(*children, 0);
    EXPECT_EQ(states->at(1).descriptors, states->at(0).descriptors);
    EXPECT_LT(states->at(1).heap, states->at(0).heap + SmallChange);
    ReportCount("refreshes", refreshes);
}

// ------------------------------------------------------------------------------- edits in place

class EditTest : public ProcessTest {};

// If the kernel does not allow the mount, file times are finer and show the edit.
TEST_F(EditTest, AnEditRightAfterAWriteIsSeenOnAFileSystemWithCoarseTimes)
{
    const int rounds = Scaled(200, 5000);
    ChildProcess editor([&](ChildProcess::Link& /*link*/) {
        (void)(BecomeRoot() && MountCoarseDisk(dir.Path()));
        int seen = 0;
        for (int round = 0; round < rounds; ++round) {
            const DocumentCache cache = MakeCache(Mode::Background, nullptr);
            if (!cache.UpdateWithData(DocumentOf(New), 1, 6)) break;
            std::string text;
            std::getline(std::ifstream(CacheFile()), text);
            const std::string written = R"("max_updated_time":5)";
            text.replace(text.find(written), written.size(), R"("max_updated_time":9)");
            std::fstream(CacheFile()) << text;
            if (!cache.UpdateWithData(DocumentOf(Old))) break;
            seen += MakeCache(Mode::Background, nullptr).GetMaxUpdateTime() == 9 ? 1 : 0;
            std::filesystem::remove(CacheFile());
        }
        if (seen < rounds) throw std::runtime_error("an edit was lost");
    });
    EXPECT_EQ(editor.Join(), 0);
    ReportCount("edits", rounds);
}

// ------------------------------------------------------------------------------------ failures

bool Limit(__rlimit_resource resource, rlim_t value)
{
    const rlimit limit{value, value};
    return ::setrlimit(resource, &limit) == 0;
}

class FailingRefreshTest : public ProcessTest {
  protected:
    // Lets processes without root's rights use the cache.
    void SetUpForEveryone()
    {
        ASSERT_EQ(::chmod(dir.Path().c_str(), 0755), 0);
        ASSERT_TRUE(FileLock(LockName()).openLockedFile());
        ASSERT_EQ(::chmod(FileLock::getLockFilePath(LockName()).c_str(), 0644), 0);
    }

    // Updates and reads the stale cache in a process that first calls `spoil`. It must get the old
    // document, and the file must be unchanged afterwards. `updated`: what Update() must return.
    void ExpectTheOldDocument(Mode mode, bool updated, const std::function<bool()>& spoil,
                              const Producer& produce = Gives(New));

    // Puts the stale cache on a disk without room for a large document, or without any room.
    bool FillDisk(bool completely);
};

void FailingRefreshTest::ExpectTheOldDocument(Mode mode, bool updated,
                                              const std::function<bool()>& spoil,
                                              const Producer& produce)
{
    struct Outcome {
        bool updated;
        int read;
        int inFile;
        std::ptrdiff_t temporaries;
    };
    const SharedMemory<Outcome> outcome;
    ChildProcess reader([&](ChildProcess::Link& /*link*/) {
        ::prctl(PR_SET_CHILD_SUBREAPER, 1);
        if (!spoil()) ::_exit(2);
        const DocumentCache cache = MakeCache(mode, produce);
        outcome->updated = cache.Update();
        outcome->read = NumberOf(cache.Read());
        ReapAll();
        const std::set<std::string> files = Files();
        outcome->inFile = NumberInFile();
        outcome->temporaries = std::count_if(files.begin(), files.end(), [](const auto& name) {
            return name.find("orvadr-tmp") != std::string::npos;
        });
    });
    ASSERT_EQ(reader.Join(), 0);
    EXPECT_EQ(outcome->updated, updated);
    EXPECT_EQ(outcome->read, Old);
    EXPECT_EQ(outcome->inFile, Old);
    EXPECT_EQ(outcome->temporaries, 0);
}

bool FailingRefreshTest::FillDisk(bool completely)
{
    constexpr int Size = 32 * 1024;
    if (!MountSmallDisk(dir.Path(), Size)) {
        WriteStale(Old);
        (void)::signal(SIGXFSZ, SIG_IGN);
        return Limit(RLIMIT_FSIZE, completely ? 0 : Size);
    }
    WriteStale(Old);
    if (!completely) return true;
    std::ofstream filler(dir.File("filler"));
    while (filler << std::string(Size, 'x') << std::flush) {
    }
    return true;
}

TEST_F(FailingRefreshTest, AReaderThatCannotForkGetsTheOldDocument)
{
    if (!HasLocks()) return;
    SetUpForEveryone();
    WriteStale(Old);
    ExpectTheOldDocument(Mode::Background, false,
                         [] { return LoseRights() && Limit(RLIMIT_NPROC, 0); });
    EXPECT_EQ(Productions(), 0);
}

TEST_F(FailingRefreshTest, AnUnwritableDirectoryLeavesTheOldDocument)
{
    if (!HasLocks()) return;
    SetUpForEveryone();
    WriteStale(Old);
    ASSERT_EQ(::chmod(dir.Path().c_str(), 0555), 0);
    ExpectTheOldDocument(Mode::Blocking, false, LoseRights);
    ExpectTheOldDocument(Mode::Background, true, LoseRights);
    EXPECT_EQ(Productions(), 0);
}

TEST_F(FailingRefreshTest, AnUnwritablePidFileLeavesTheOldDocument)
{
    if (!HasLocks()) return;
    WriteStale(Old);
    ASSERT_TRUE(std::filesystem::create_directories(PidFile() + "/not empty"));
    const auto nothing = [] { return true; };
    ExpectTheOldDocument(Mode::Blocking, false, nothing);
    ExpectTheOldDocument(Mode::Background, true, nothing);
    EXPECT_EQ(Productions(), 0);
}

TEST_F(FailingRefreshTest, ADocumentThatDoesNotFitOnTheDiskLeavesTheOldOne)
{
    constexpr int Large = 999;
    if (!HasLocks()) return;
    const auto fill = [this] { return FillDisk(false); };
    ExpectTheOldDocument(Mode::Blocking, false, fill, Gives(Large));
    EXPECT_EQ(Productions(), 2);
    ExpectTheOldDocument(Mode::Background, true, fill, Gives(Large));
    EXPECT_GT(Productions(), 2);
}

TEST_F(FailingRefreshTest, AFullDiskLeavesTheOldDocument)
{
    if (!HasLocks()) return;
    const auto fill = [this] { return FillDisk(true); };
    ExpectTheOldDocument(Mode::Blocking, false, fill);
    ExpectTheOldDocument(Mode::Background, true, fill);
    EXPECT_EQ(Productions(), 0);
}

TEST_F(FailingRefreshTest, AReaderReplacesAFileThatHoldsNoDocument)
{
    if (!HasLocks()) return;
    const std::vector<std::string> contents{"",
                                            "\n",
                                            "{",
                                            std::string(100, '\0'),
                                            std::string(100'000, '['),
                                            "no JSON",
                                            "42",
                                            "{}",
                                            R"({"cached_data":{"number":1,"text":"cut off)"};
    for (const std::string& content : contents) {
        SCOPED_TRACE(content.substr(0, 100));
        std::ofstream(CacheFile()) << content;
        const int before = Productions();
        EXPECT_EQ(NumberOf(MakeCache(Mode::Background, Gives(New)).Read()), New);
        EXPECT_EQ(Productions(), before + 1);
        EXPECT_EQ(NumberInFile(), New);
    }
}

TEST_F(FailingRefreshTest, ADirectoryInPlaceOfTheFileGivesTheDefaultValue)
{
    if (!HasLocks()) return;
    ASSERT_TRUE(std::filesystem::create_directories(CacheFile()));
    const DocumentCache cache = MakeCache(Mode::Background, Gives(New));
    EXPECT_FALSE(cache.Update());
    EXPECT_EQ(cache.Read(), cache.GetDefaultValue());
    EXPECT_TRUE(std::filesystem::is_directory(CacheFile()));
    EXPECT_THAT(Files(), ElementsAre("x.cached"));
}

// A lock that others hold is attempted six times, a second apart.
class HeldLockTest : public ProcessTest {
  protected:
    static constexpr std::chrono::seconds AllAttempts{5};

    // A process that holds the cache's lock until Tell().
    ChildProcess StartHolder(int operation)
    {
        return ChildProcess([this, operation](ChildProcess::Link& link) {
            FileLock lock(LockName());
            if (!lock.lock(operation, 0)) return;
            link.Tell();
            link.Await();
        });
    }
};

TEST_F(HeldLockTest, AReaderThatCannotLookForAnUpdaterAssumesThereIsOne)
{
    if (!HasLocks()) return;
    WriteStale(Old);
    ChildProcess holder = StartHolder(LOCK_EX);
    ASSERT_TRUE(holder.Await());
    const Reading reading = ReadElsewhere(Mode::Background, Gives(New));
    EXPECT_EQ(reading.number, Old);
    EXPECT_FALSE(reading.startedProcesses);
    EXPECT_GE(reading.took, AllAttempts);

    holder.Tell();
    EXPECT_EQ(holder.Join(), 0);
    EXPECT_EQ(Productions(), 0);
    EXPECT_EQ(ReadElsewhere(Mode::Blocking, Gives(New)).number, New);
}

TEST_F(HeldLockTest, AReaderThatCannotMarkItselfAsUpdaterDoesNotProduce)
{
    if (!HasLocks()) return;
    WriteStale(Old);
    ChildProcess holder = StartHolder(LOCK_SH);
    ASSERT_TRUE(holder.Await());
    EXPECT_EQ(NumberOf(MakeCache(Mode::Background, Gives(New)).Read()), Old);
    const Reading reading = ReadElsewhere(Mode::Blocking, Gives(New));
    EXPECT_EQ(reading.number, Old);
    EXPECT_GE(reading.took, AllAttempts);
    EXPECT_EQ(Productions(), 0);
    EXPECT_EQ(NumberInFile(), Old);
}

TEST_F(HeldLockTest, AnUpdaterThatCannotRemoveItsMarkCountsAsUpdaterUntilItEnds)
{
    if (!HasLocks()) return;
    WriteStale(Old);
    ChildProcess updater([this](ChildProcess::Link& link) {
        const auto produce = [&link](Json::Value& data) {
            link.Tell();
            return link.Await() && Gives(New)(data);
        };
        MakeCache(Mode::Blocking, produce).Read();
        link.Tell();
        link.Await();
    });
    ASSERT_TRUE(updater.Await());
    ChildProcess holder = StartHolder(LOCK_EX);
    ASSERT_TRUE(holder.Await());
    updater.Tell();
    ASSERT_TRUE(updater.Await());
    EXPECT_EQ(NumberInFile(), New);
    EXPECT_THAT(Files(), ElementsAre("x.cached", "x.cached.pid"));
    holder.Tell();
    EXPECT_EQ(holder.Join(), 0);

    MakeStale();
    const Reading reading = ReadElsewhere(Mode::Background, Gives(Old));
    EXPECT_EQ(reading.number, New);
    EXPECT_FALSE(reading.startedProcesses);
    updater.Tell();
    EXPECT_EQ(updater.Join(), 0);
    EXPECT_EQ(ReadElsewhere(Mode::Blocking, Gives(Old)).number, Old);
    EXPECT_THAT(Files(), ElementsAre("x.cached"));
}

}  // namespace
