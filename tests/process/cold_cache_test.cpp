// Processes and threads that all need data which is not there: Cache::ReadWithin().
#include <gmock/gmock.h>
#include <signal.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <set>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include <orvadrcore/cache.h>

#include "support/fixtures/process_test.h"
#include "support/fixtures/scale.h"
#include "support/processes/await.h"
#include "support/processes/child_process.h"
#include "support/processes/crowd.h"
#include "support/processes/kills.h"
#include "support/processes/reap.h"
#include "support/processes/rights.h"
#include "support/processes/shared_memory.h"

namespace {

using OrvaDRCore::Cache;
using OrvaDRCore::CacheState;
using std::chrono::milliseconds;
using ::testing::AnyOf;
using ::testing::Each;
using ::testing::ElementsAre;
using Clock = std::chrono::steady_clock;

constexpr int Old = 1;
constexpr int New = 2;
constexpr int Later = 3;
constexpr milliseconds Long{60'000};
constexpr milliseconds Production{300};

// Documents of any user: the lock is in a directory of the test.
class OwnCache : public Cache {
  public:
    OwnCache(const std::string& dir, const std::string& lockDir, Producer producer, int retries = 0)
        : Cache(dir, "x", DocumentCache::TimeoutSeconds, false, retries, lockDir),
          produce_(std::move(producer))
    {
    }

    Json::Value GetInfo() const override { return "a cache of documents"; }
    bool GetUpdatedData(Json::Value& data) const override { return produce_(data); }
    bool IsValidData(const Json::Value& data) const override
    {
        return NumberOf(data) != NoDocument;
    }

  private:
    Producer produce_;
};

class ColdCacheTest : public ProcessTest {
  protected:
    static constexpr int MaxReaders = 64 * 8;

    struct Reader {
        std::atomic<int> number;
        std::atomic<CacheState> state;
        std::atomic<Clock::rep> end;
    };
    struct Round {
        std::array<Reader, MaxReaders> readers;
        std::atomic<int> productions;
        std::atomic<int> producing;
        std::atomic<int> overlaps;
        std::atomic<Clock::rep> produced;  // the end of the last production
    };

    ColdCacheTest() { std::filesystem::create_directory(dir.File("cache")); }

    // A cache whose producer takes a while. With `locks` it is that of an ordinary user.
    OwnCache MakeOwn(const Producer& produce, int retries = 0) const
    {
        return {dir.File("cache"), locks,
                [this, produce](Json::Value& data) {
                    ++round->productions;
                    if (round->producing++ != 0) ++round->overlaps;
                    const bool succeeded = produce(data);
                    --round->producing;
                    round->produced = Clock::now().time_since_epoch().count();
                    return succeeded;
                },
                retries};
    }

    void Read(int number, milliseconds patience, const Producer& produce) const
    {
        Reader& reader = round->readers.at(static_cast<std::size_t>(number));
        const OwnCache cache = MakeOwn(produce);
        Json::Value data;
        reader.state = cache.ReadWithin(patience, data);
        reader.end = Clock::now().time_since_epoch().count();
        reader.number = NumberOf(data);
    }

    // All threads of all processes read at the same moment.
    void ReadAtOnce(int processes, int threads, milliseconds patience, const Producer& produce)
    {
        const Crowd crowd(processes, [&](int process) {
            std::vector<std::thread> others;
            for (int i = 1; i < threads; ++i) {
                others.emplace_back([&, i] { Read(process * threads + i, patience, produce); });
            }
            Read(process * threads, patience, produce);
            for (std::thread& other : others) other.join();
        });
        ASSERT_TRUE(crowd.Start());
        EXPECT_TRUE(crowd.Join());
    }

    std::vector<CacheState> States(int readers) const
    {
        std::vector<CacheState> states;
        for (int i = 0; i < readers; ++i) states.push_back(At(i).state);
        return states;
    }
    std::vector<int> Numbers(int readers) const
    {
        std::vector<int> numbers;
        for (int i = 0; i < readers; ++i) numbers.push_back(At(i).number);
        return numbers;
    }
    const Reader& At(int reader) const
    {
        return round->readers.at(static_cast<std::size_t>(reader));
    }

    // From the end of the last production to the end of the slowest read.
    int SlowestMSec(int readers) const
    {
        Clock::rep last = round->produced;
        for (int i = 0; i < readers; ++i) last = std::max(last, At(i).end.load());
        const Clock::duration time(last - round->produced);
        return static_cast<int>(std::chrono::duration_cast<milliseconds>(time).count());
    }

    static Producer After(milliseconds time, int number = New)
    {
        return [=](Json::Value& data) {
            std::this_thread::sleep_for(time);
            return Gives(number)(data);
        };
    }

    std::string Path() const { return dir.File("cache/x.cached"); }
    std::set<std::string> FilesIn(const std::string& name) const { return NamesIn(dir.File(name)); }

    std::string locks = dir.File("locks");
    SharedMemory<Round> round;
};

// The bound that is wanted, on a machine with nothing else to do, is 100 ms. A reader that waits for
// nothing takes its whole time, a minute.
constexpr int BusyMachineMSec = 20'000;

TEST_F(ColdCacheTest, ManyProcessesThatStartTogetherShareOneProduction)
{
    constexpr int Processes = 64;
    const int rounds = Scaled(2, 20);
    int slowest = 0;
    for (int i = 0; i < rounds && !HasFailure(); ++i) {
        std::filesystem::remove(Path());
        round->productions = 0;
        ReadAtOnce(Processes, 1, Long, After(Production));
        EXPECT_EQ(round->productions, 1);
        EXPECT_THAT(States(Processes), Each(CacheState::Fresh));
        EXPECT_THAT(Numbers(Processes), Each(New));
        EXPECT_THAT(FilesIn("cache"), ElementsAre("x.cached"));
        EXPECT_THAT(FilesIn("locks"), ElementsAre("x.cached.lock"));
        slowest = std::max(slowest, SlowestMSec(Processes));
    }
    ReportCount("ms from the end of a production to the last of 64 processes", slowest);
    EXPECT_LT(slowest, BusyMachineMSec);
}

TEST_F(ColdCacheTest, ManyThreadsThatStartTogetherShareOneProduction)
{
    constexpr int Threads = 8;
    const int rounds = Scaled(2, 20);
    int slowest = 0;
    for (int i = 0; i < rounds && !HasFailure(); ++i) {
        std::filesystem::remove(Path());
        round->productions = 0;
        ReadAtOnce(1, Threads, Long, After(Production));
        EXPECT_EQ(round->productions, 1);
        EXPECT_THAT(States(Threads), Each(CacheState::Fresh));
        EXPECT_THAT(Numbers(Threads), Each(New));
        EXPECT_THAT(FilesIn("cache"), ElementsAre("x.cached"));
        slowest = std::max(slowest, SlowestMSec(Threads));
    }
    ReportCount("ms from the end of a production to the last of 8 threads", slowest);
    EXPECT_LT(slowest, BusyMachineMSec);
}

TEST_F(ColdCacheTest, ThreadsOfManyProcessesShareOneProduction)
{
    constexpr int Processes = 64;
    constexpr int Threads = 8;
    ReadAtOnce(Processes, Threads, Long, After(Production));
    EXPECT_EQ(round->productions, 1);
    EXPECT_THAT(States(Processes * Threads), Each(CacheState::Fresh));
    EXPECT_THAT(Numbers(Processes * Threads), Each(New));
    const int slowest = SlowestMSec(Processes * Threads);
    ReportCount("ms from the end of a production to the last of 64 x 8 threads", slowest);
    EXPECT_LT(slowest, BusyMachineMSec);
}

// A cache whose data is always stale. The production begins when all readers have looked.
TEST_F(ColdCacheTest, ReadersShareOneProductionOfDataThatIsNeverFresh)
{
    static constexpr int Threads = 8;
    class NeverFresh : public OwnCache {
      public:
        NeverFresh(OwnCache cache, std::atomic<int>& looks)
            : OwnCache(std::move(cache)), looks_(looks)
        {
        }
        bool IsNeedUpdate(const Json::Value& /*data*/) const override
        {
            if (!std::exchange(hasLooked_, true)) ++looks_;
            return true;
        }
        bool IsUpdatedDataRequired() const override
        {
            return AwaitUntil([this] { return looks_ == Threads; });
        }

      private:
        std::atomic<int>& looks_;
        mutable bool hasLooked_ = false;
    };
    ASSERT_TRUE(MakeOwn(nullptr).UpdateWithData(DocumentOf(Old)));
    std::atomic<int> looks{0};
    std::vector<std::thread> threads;
    for (int i = 0; i < Threads; ++i) {
        threads.emplace_back([&, i] {
            const NeverFresh cache(MakeOwn(After(Production)), looks);
            Json::Value data;
            round->readers.at(static_cast<std::size_t>(i)).state = cache.ReadWithin(Long, data);
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(looks, Threads);
    EXPECT_EQ(round->productions, 1);
    EXPECT_THAT(States(Threads), Each(CacheState::Fresh));
}

// ---------------------------------------------------------------------------------- with other readers

TEST_F(ColdCacheTest, ReadersInTimeWaitForARefreshInTheBackground)
{
    constexpr int Readers = 16;
    ASSERT_TRUE(MakeOwn(nullptr).UpdateWithData(DocumentOf(Old)));
    SetModifyTime(Path(), std::time(nullptr) - 2 * DocumentCache::TimeoutSeconds);
    EXPECT_EQ(NumberOf(MakeOwn(After(Production)).Read()), Old);
    ASSERT_TRUE(AwaitUntil([this] { return round->productions == 1; }));
    ReadAtOnce(Readers, 1, Long, After(Production, Later));
    EXPECT_EQ(round->productions, 1);
    EXPECT_THAT(States(Readers), Each(CacheState::Fresh));
    EXPECT_THAT(Numbers(Readers), Each(New));
}

TEST_F(ColdCacheTest, ReadWaitsForARefreshOfAReaderInTime)
{
    ChildProcess reader([this](ChildProcess::Link& link) {
        Json::Value data;
        MakeOwn([&link](Json::Value& produced) {
            link.Tell();
            return link.Await() && Gives(New)(produced);
        }).ReadWithin(Long, data);
    });
    ASSERT_TRUE(reader.Await());
    std::thread later([&reader] {
        std::this_thread::sleep_for(Production);
        reader.Tell();
    });
    EXPECT_EQ(NumberOf(MakeOwn(Gives(Later)).Read()), New);
    later.join();
    EXPECT_EQ(reader.Join(), 0);
    EXPECT_EQ(round->productions, 1);
}

TEST_F(ColdCacheTest, NobodyWaitsBeyondItsTimeForAProducerThatHangs)
{
    constexpr int Readers = 8;
    ChildProcess hanging([this](ChildProcess::Link& link) {
        Json::Value data;
        MakeOwn([&link](Json::Value& /*produced*/) {
            link.Tell();
            return link.Await();
        }).ReadWithin(Long, data);
    });
    ASSERT_TRUE(hanging.Await());
    const auto begin = Clock::now();
    ReadAtOnce(2, Readers / 2, milliseconds(200), Gives(New));
    const auto took = std::chrono::duration_cast<milliseconds>(Clock::now() - begin);
    EXPECT_THAT(States(Readers), Each(CacheState::None));
    EXPECT_EQ(round->productions, 1);
    EXPECT_GE(took, milliseconds(200));
    EXPECT_LT(took, milliseconds(200 + BusyMachineMSec));
    ReportCount("ms that 8 readers took whose time was 200 ms", static_cast<int>(took.count()));
}

// ---------------------------------------------------------------------------------------- failures

TEST_F(ColdCacheTest, ReadersTakeOverOneAfterTheOtherFromProducersThatDie)
{
    constexpr int Readers = 16;
    constexpr int Deaths = 5;
    const Crowd crowd(Readers, [this](int reader) {
        Read(reader, Long, [this](Json::Value& data) {
            if (round->productions <= Deaths) {
                --round->producing;
                ::raise(SIGKILL);
            }
            return After(Production)(data);
        });
    });
    for (int i = 0; i < Readers; ++i) round->readers.at(std::size_t(i)).state = CacheState::None;
    ASSERT_TRUE(crowd.Start());
    EXPECT_FALSE(crowd.Join());
    const std::vector<CacheState> states = States(Readers);
    EXPECT_EQ(std::count(states.begin(), states.end(), CacheState::Fresh), Readers - Deaths);
    EXPECT_EQ(round->productions, Deaths + 1);
    EXPECT_EQ(round->overlaps, 0);
    EXPECT_THAT(FilesIn("cache"), ElementsAre("x.cached"));
}

TEST_F(ColdCacheTest, ReadersTryOneAfterTheOtherWhenProductionsFail)
{
    constexpr int Readers = 16;
    constexpr int Failures = 5;
    const Crowd crowd(Readers, [this](int number) {
        Reader& reader = round->readers.at(static_cast<std::size_t>(number));
        const auto produce = [this](Json::Value& data) {
            std::this_thread::sleep_for(milliseconds(20));
            return round->productions > Failures && Gives(New)(data);
        };
        Json::Value data;
        reader.state = MakeOwn(produce, DocumentCache::SingleTry).ReadWithin(Long, data);
    });
    ASSERT_TRUE(crowd.Start());
    EXPECT_TRUE(crowd.Join());
    const std::vector<CacheState> states = States(Readers);
    EXPECT_EQ(std::count(states.begin(), states.end(), CacheState::Fresh), Readers - Failures);
    EXPECT_EQ(std::count(states.begin(), states.end(), CacheState::None), Failures);
    EXPECT_EQ(round->productions, Failures + 1);
    EXPECT_EQ(round->overlaps, 0);
}

TEST_F(ColdCacheTest, AReaderKilledAnywhereBlocksNobody)
{
    const auto prepare = [this] {
        for (const std::string name : {"cache", "locks"}) {
            std::filesystem::remove_all(dir.File(name));
            std::filesystem::create_directory(dir.File(name));
        }
    };
    const auto read = [this](int number) {
        Json::Value data;
        const CacheState state = MakeOwn(Gives(number)).ReadWithin(milliseconds(0), data);
        return state == CacheState::Fresh ? NumberOf(data) : NoDocument;
    };
    const auto inspect = [&] {
        EXPECT_THAT(read(Later), AnyOf(New, Later));
        SetModifyTime(Path(), std::time(nullptr) - 2 * DocumentCache::TimeoutSeconds);
        EXPECT_EQ(read(Later), Later);
        EXPECT_THAT(FilesIn("cache"), ElementsAre("x.cached"));
        EXPECT_THAT(FilesIn("locks"), ElementsAre("x.cached.lock"));
    };
    KillEverywhere({prepare, [&] { (void)read(New); }, inspect});
}

TEST_F(ColdCacheTest, OnAFullDiskEveryReaderGetsWhatItProduced)
{
    constexpr int Size = 16 * 1024;
    constexpr int Threads = 4;
    constexpr int Large = 999;  // about 100 KB
    ChildProcess process([&](ChildProcess::Link& /*link*/) {
        if (!BecomeRoot() || !MountSmallDisk(dir.File("cache"), Size)) {
            // As if it were full.
            (void)::chmod(dir.File("cache").c_str(), 0555);
            if (::geteuid() == 0 &&
                (::chown(dir.Path().c_str(), Nobody, Nobody) != 0 || !LoseRights())) {
                throw std::runtime_error("cannot become an ordinary user");
            }
        }
        std::vector<std::thread> threads;
        for (int i = 0; i < Threads; ++i) {
            threads.emplace_back([&, i] { Read(i, Long, Gives(Large)); });
        }
        for (std::thread& thread : threads) thread.join();
    });
    EXPECT_EQ(process.Join(), 0);
    EXPECT_EQ(round->productions, Threads);
    EXPECT_THAT(States(Threads), Each(CacheState::Fresh));
    EXPECT_THAT(Numbers(Threads), Each(Large));
    EXPECT_THAT(FilesIn("locks"), ElementsAre("x.cached.lock"));
}

// ----------------------------------------------------------------------------------- ordinary users

class OrdinaryUserTest : public ColdCacheTest {
  protected:
    static constexpr int Readers = 16;

    // All files of the test belong to whoever an ordinary process is.
    void GiveAway() const
    {
        constexpr unsigned int Nobody = 65534;
        for (const std::string& path : {dir.Path(), dir.File("cache")}) {
            ASSERT_TRUE(::geteuid() != 0 || ::chown(path.c_str(), Nobody, Nobody) == 0);
        }
    }

    // Each in a process without root's rights.
    void ReadAsOrdinaryUsers(milliseconds patience, const Producer& produce)
    {
        const Crowd crowd(Readers, [&](int reader) {
            if (::geteuid() == 0 && !LoseRights()) ::_exit(2);
            Read(reader, patience, produce);
        });
        ASSERT_TRUE(crowd.Start());
        EXPECT_TRUE(crowd.Join());
    }
};

TEST_F(OrdinaryUserTest, ShareOneProductionWithALockOfTheirOwn)
{
    GiveAway();
    ReadAsOrdinaryUsers(Long, After(Production));
    EXPECT_EQ(round->productions, 1);
    EXPECT_THAT(States(Readers), Each(CacheState::Fresh));
    EXPECT_THAT(FilesIn("cache"), ElementsAre("x.cached"));
    ReportCount("ms from the end of a production to the last of 16 ordinary processes",
                SlowestMSec(Readers));
}

// The named lock is root's: some produce at the same time, and nobody hangs.
TEST_F(OrdinaryUserTest, GetDataWithoutALockOfTheirOwn)
{
    GiveAway();
    locks = "";
    const auto begin = Clock::now();
    ReadAsOrdinaryUsers(Long, Gives(New));
    EXPECT_THAT(States(Readers), Each(CacheState::Fresh));
    EXPECT_THAT(Numbers(Readers), Each(New));
    EXPECT_LT(Clock::now() - begin, Long / 2);
}

TEST_F(OrdinaryUserTest, GetDataThatTheyCannotStore)
{
    GiveAway();
    ASSERT_EQ(::chmod(dir.File("cache").c_str(), 0555), 0);
    ReadAsOrdinaryUsers(Long, Gives(New));
    EXPECT_THAT(States(Readers), Each(CacheState::Fresh));
    EXPECT_THAT(Numbers(Readers), Each(New));
    EXPECT_EQ(round->productions, Readers);
    EXPECT_THAT(FilesIn("cache"), ElementsAre());
}

}  // namespace
