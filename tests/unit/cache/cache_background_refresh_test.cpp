// A refresh in a child of the process that reads.
#include <orvadrcore/cache.h>

#include <fcntl.h>
#include <gmock/gmock.h>
#include <orvacore/orvacore.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <functional>
#include <optional>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "support/fixtures/cache_update_fixture.h"
#include "support/fixtures/test_files.h"

namespace {

using ::testing::ElementsAre;

class CacheBackgroundRefreshTest : public CacheUpdateFixture {};

TEST_F(CacheBackgroundRefreshTest, ABackgroundReadReturnsOldDataAndAChildWritesTheNew)
{
    CheckInBackground([this] {
        WriteStale("old");
        cache.produce = [this](Json::Value& data) {
            data["child"] = ::getpid();
            data["marked"] = CoreLibReadPidFile(pidPath.c_str());
            return true;
        };
        EXPECT_EQ(cache.Read(), "old");
        EXPECT_EQ(Document()["cached_data"], "old");
        EXPECT_EQ(cache.CountCalls("GetUpdatedData"), 0U);
        EXPECT_EQ(AwaitRefresh(), 0);
        const Json::Value data = cache.GetCachedData();
        EXPECT_NE(data["child"], ::getpid());
        EXPECT_EQ(data["child"], data["marked"]);
        EXPECT_FALSE(IsMarked());
    });
}

TEST_F(CacheBackgroundRefreshTest, ASecondReaderStartsNoRefresh)
{
    CheckInBackground([this] {
        WriteStale("old");
        const ChildProcess::Link producing = MakeGate();
        const ChildProcess::Link gate = MakeGate();
        cache.produce = [&](Json::Value& data) {
            producing.Tell();
            gate.Await();
            data = "new";
            return true;
        };
        EXPECT_EQ(cache.Read(), "old");
        LetRefresh();
        EXPECT_TRUE(producing.Await());
        FailForks(EAGAIN);
        EXPECT_EQ(cache.Read(), "old");
        const TestCache second = Another(false);
        EXPECT_EQ(second.Read(), "old");
        gate.Tell();
        EXPECT_EQ(AwaitRefresh(), 0);
        EXPECT_EQ(second.Read(), "new");
    });
}

TEST_F(CacheBackgroundRefreshTest, TheChildChecksForAnUpdaterAgain)
{
    CheckInBackground([this] {
        WriteStale("old");
        ChildProcess updater = Updater();
        ASSERT_TRUE(updater.Await());
        const std::string marked = ReadFile(pidPath);
        std::filesystem::remove(pidPath);
        processes.fork = [&] {  // between the caller's check and the child's
            WriteFile(pidPath, marked);
            return RealFork();
        };
        EXPECT_EQ(cache.Read(), "old");
        EXPECT_EQ(AwaitRefresh(), 0);
        EXPECT_EQ(ReadFile(pidPath), marked);
        EXPECT_EQ(Document()["cached_data"], "old");
    });
}

// Age, validity and need decide whether there is a refresh; this decides where.
TEST_F(CacheBackgroundRefreshTest, IsUpdatedDataRequiredDecidesWhereTheRefreshRuns)
{
    struct Row {
        const char* what;
        bool byConstructor;
        bool valid;
        std::optional<bool> required;  // overridden
        bool inCaller;
    };
    const std::vector<Row> table = {
        {"valid", false, true, {}, false},
        {"not valid", false, false, {}, true},
        {"by the constructor", true, true, {}, true},
        {"by the constructor but not required", true, true, false, false},
        {"not valid but not required", false, false, false, false},
        {"required", false, true, true, true},
    };
    for (const Row& row : table) {
        CheckInBackground([&] {
            SCOPED_TRACE(row.what);
            WriteStale("old");
            TestCache each = Another(row.byConstructor);
            each.isValid = [&](const Json::Value& data) { return row.valid || data == "new"; };
            if (row.required) each.isRequired = [&] { return *row.required; };
            EXPECT_EQ(each.Read(), row.inCaller ? "new" : "old");
            EXPECT_EQ(each.CountCalls("GetUpdatedData"), row.inCaller ? 1U : 0U);
            if (row.inCaller) {
                ExpectLines({Start(), Finish()});
            } else {
                EXPECT_EQ(AwaitRefresh(), 0);
                EXPECT_EQ(Document()["cached_data"], "new");
            }
        });
    }
}

TEST_F(CacheBackgroundRefreshTest, DataThatNeedsAnUpdateIsRefreshedInTheBackground)
{
    CheckInBackground([this] {
        WriteCache("old");
        cache.isNeedUpdate = [](const Json::Value& data) { return data == "old"; };
        EXPECT_EQ(cache.Read(), "old");
        EXPECT_EQ(AwaitRefresh(), 0);
        EXPECT_EQ(Document()["cached_data"], "new");
    });
}

TEST_F(CacheBackgroundRefreshTest, AChildThatFailsPrintsNothingAndLeavesTheFile)
{
    CheckInBackground([this] {
        WriteStale("old");
        const std::string before = ReadFile(path);
        const auto nothing = [](Json::Value&) { return false; };
        const auto invalid = [](Json::Value&) { return true; };
        const auto throwing = [](Json::Value&) -> bool { throw std::runtime_error("no node"); };
        const auto throwingOther = [](Json::Value&) -> bool { throw 5; };
        const std::string output = dir.File("output");
        const int fd = OpenFile(output, O_WRONLY | O_CREAT);
        for (const std::function<bool(Json::Value&)>& produce :
             std::vector<std::function<bool(Json::Value&)>>{nothing, invalid, throwing,
                                                            throwingOther}) {
            cache.produce = produce;
            const int standardError = ::dup(STDERR_FILENO);
            ::dup2(fd, STDERR_FILENO);
            EXPECT_EQ(cache.Read(), "old");
            EXPECT_EQ(AwaitRefresh(), 0);
            ::dup2(standardError, STDERR_FILENO);
            ::close(standardError);
            EXPECT_FALSE(IsMarked());
            EXPECT_EQ(ReadFile(path), before);
            EXPECT_EQ(ReadFile(output), "");
        }
        ::close(fd);
    });
}

// Makes a file if it is destroyed in another process than its owner's.
class Witness {
  public:
    explicit Witness(std::string note) : file_(std::move(note)) {}
    Witness(const Witness&) = delete;
    Witness& operator=(const Witness&) = delete;
    ~Witness() { Note(); }

    void Note() const
    {
        if (::getpid() != owner_) WriteFile(file_, "seen");
    }

  private:
    std::string file_;
    pid_t owner_ = ::getpid();
};

TEST_F(CacheBackgroundRefreshTest, TheChildRunsNoDestructorOrExitHandler)
{
    CheckInBackground([this] {
        static const Witness exitHandler(dir.File("exit handler"));
        for (const bool throws : {false, true}) {
            WriteStale("old");
            const Witness destructor(dir.File("destructor"));
            const Witness producing(dir.File("producing"));
            cache.produce = [&](Json::Value& data) {
                producing.Note();
                if (throws) throw std::runtime_error("no node");
                data = "new";
                return true;
            };
            EXPECT_EQ(cache.Read(), "old");
            EXPECT_EQ(AwaitRefresh(), 0);
            EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("producing", "status.cached"));
            std::filesystem::remove(dir.File("producing"));
        }
    });
}

TEST_F(CacheBackgroundRefreshTest, AFailedForkIsLogged)
{
    WriteStale("old");
    const auto fail = Failing(EAGAIN);
    // An intermediate process forks the child.
    const auto failTheSecond = [&, forks = 0]() mutable {
        return ++forks == 1 ? RealFork() : fail();
    };
    for (const std::function<pid_t()>& fork :
         std::vector<std::function<pid_t()>>{fail, failTheSecond}) {
        processes.fork = fork;
        EXPECT_FALSE(cache.Update());
        ExpectLines(
            {Warn("Update", "Failed to fork(). errno=[11/Resource temporarily unavailable]")});
        processes.fork = fork;
        EXPECT_EQ(cache.Read(), "old");
        ExpectLines(
            {Warn("Update", "Failed to fork(). errno=[11/Resource temporarily unavailable]"),
             UsesOldData()});
        EXPECT_FALSE(IsMarked());
    }
    FailForks(ENOMEM);
    EXPECT_FALSE(cache.Update());
    ExpectLines({Warn("Update", "Failed to fork(). errno=[12/Cannot allocate memory]")});
}

TEST_F(CacheBackgroundRefreshTest, TheChildInheritsNoLock)
{
    WriteStale("old");
    const auto locks = [this] {
        std::size_t count = 0;
        for (int fd = 0; fd < 1024; ++fd) count += IsLockFile(fd) ? 1 : 0;
        return count;
    };
    std::size_t forks = 0;
    processes.fork = [&] {
        ++forks;
        EXPECT_EQ(locks(), 0U);
        EXPECT_FALSE(IsLocked(lockFile));
        return Failing(EAGAIN)();
    };
    EXPECT_FALSE(cache.Update());
    EXPECT_EQ(forks, 1U);
    EXPECT_EQ(TakeLines().size(), 1U);
}

}  // namespace
