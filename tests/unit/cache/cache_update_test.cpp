// How a cache gets fresh data: producing, writing, marking the updater, background refreshes,
// waiting; and what docs/cache.md says about the files.
#include <orvadrcore/cache.h>

#include <gmock/gmock.h>
#include <orvacore/orvacore.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <filesystem>
#include <limits>
#include <optional>
#include <regex>
#include <set>
#include <sstream>
#include <stdexcept>
#include <utility>

#include "base/json_helpers.h"
#include "support/fixtures/cache_fixture.h"
#include "support/fixtures/json_kinds.h"
#include "support/fixtures/special_file.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"

namespace {

using OrvaDRCore::toString;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::StartsWith;

constexpr int MaxInt = std::numeric_limits<int>::max();
constexpr int MinInt = std::numeric_limits<int>::min();

constexpr int Probe = LOCK_SH | LOCK_NB;
constexpr int Mark = LOCK_EX | LOCK_NB;

constexpr unsigned int ShortestProducePause = 500'000;
constexpr unsigned int ShortestWritePause = 300'000;
constexpr unsigned int ShortestWaitPause = 300'000;

class CacheUpdateTest : public CacheFixture {
  protected:
    // The document in the cache file.
    Json::Value Document() const { return ParseJson(ReadFile(path)); }

    bool IsMarked() const { return std::filesystem::exists(pidPath); }

    // The line of a refresh that could not produce data.
    LogLine ProducedNothing(int limit = 0) const
    {
        return Debug("DoUpdate",
                     R"(Failed to get updated cache ["test cache"] and reach the retry limit[)" +
                         std::to_string(limit) + "]");
    }

    LogLine WroteNothing(int limit = 0) const
    {
        return Debug("UpdateWithData", "Failed to write cache to file [" + path +
                                           "] and reach retry limit[" + std::to_string(limit) +
                                           "]");
    }

    // Calls `action` before the n-th flock() of the lock file, from 1, and before all later ones. Its
    // result, if any, replaces the call.
    void OnLocking(std::size_t number, const std::function<std::optional<int>()>& action)
    {
        faults.flock = [=](int fd, int operation) {
            if (!IsLockFile(fd) || operation == LOCK_UN) return RealFlock(fd, operation);
            locking.push_back(operation);
            const auto answer = locking.size() >= number ? action() : std::nullopt;
            return answer ? *answer : RealFlock(fd, operation);
        };
    }

    // The lock file cannot be opened from the n-th time on, from 1.
    void FailOpeningLock(std::size_t number)
    {
        faults.open = [=, openings = std::size_t{0}](const char* name, int flags,
                                                     mode_t mode) mutable {
            if (name == lockPath && ++openings >= number) return Failing(EACCES)();
            return RealOpen(Place(name).c_str(), flags, mode);
        };
    }

    std::vector<LogLine> LockIsNotOpened() const
    {
        return {Err("openLockedFile",
                    "Failed to open lock file[" + lockPath + "], errno=Permission denied")
                    .In("file_lock.cpp"),
                Err("lock", "Bad fd [-1] to lock [" + lockPath + "]").In("file_lock.cpp")};
    }

    TestCache waiting = Another(true);
};

std::vector<LogLine> Joined(const std::vector<std::vector<LogLine>>& parts)
{
    std::vector<LogLine> all;
    for (const auto& part : parts) all.insert(all.end(), part.begin(), part.end());
    return all;
}

// ---------------------------------------------------------------------------- DoUpdate: producing

struct Attempts {
    int limit;
    std::size_t attempts;
};

// The contract: the limit plus two attempts, or a single one if it is negative.
constexpr std::array<Attempts, 5> AttemptsByLimit{{{0, 2}, {1, 3}, {3, 5}, {-1, 1}, {MinInt, 1}}};

TEST_F(CacheUpdateTest, ProducingIsRetriedUpToTheLimit)
{
    WriteCache("old");
    const std::string before = ReadFile(path);
    for (const Attempts& row : AttemptsByLimit) {
        SCOPED_TRACE(row.limit);
        TestCache each = Another(false, row.limit);
        each.produce = [](Json::Value& data) {
            EXPECT_EQ(data, Json::Value());  // for each attempt
            data["left"] = "behind";
            return false;
        };
        EXPECT_FALSE(each.DoUpdate());
        EXPECT_EQ(each.CountCalls("GetUpdatedData"), row.attempts);
        ExpectPauses(row.attempts - 1, ShortestProducePause);
        ExpectLines({ProducedNothing(row.limit)});
    }
    EXPECT_EQ(ReadFile(path), before);
}

TEST_F(CacheUpdateTest, AProductionThatSucceedsLaterEndsTheRetriesWithoutALogLine)
{
    for (const int limit : {1, 3, MaxInt}) {
        TestCache each = Another(false, limit);
        int attempts = 0;
        each.produce = [&](Json::Value& data) {
            EXPECT_EQ(data, Json::Value());
            data = ++attempts;
            return attempts == 3;
        };
        EXPECT_TRUE(each.DoUpdate());
        EXPECT_EQ(attempts, 3);
        ExpectPauses(2, ShortestProducePause);
        EXPECT_EQ(Document()["cached_data"], 3);
    }
}

TEST_F(CacheUpdateTest, TheRecordedTimesIncludeAllAttemptsAndPauses)
{
    std::time_t now = 5'000'000'000;
    processes.time = [&] { return now; };
    pauses.OnPause([&](std::size_t /*number*/) { now += 10; });
    TestCache each = Another(false, 2);
    int attempts = 0;
    each.produce = [&](Json::Value& data) {
        now += 1;
        data = "new";
        return ++attempts == 3;
    };
    EXPECT_TRUE(each.DoUpdate());
    EXPECT_TRUE(Same(Document()["begin_time_to_update"], Json::Int64{5'000'000'000}));
    EXPECT_TRUE(Same(Document()["finish_time_to_update"], Json::Int64{5'000'000'023}));
    EXPECT_TRUE(Same(Document()["updated_time"], 23.0));
    EXPECT_TRUE(Same(Document()["max_updated_time"], 23));
}

TEST_F(CacheUpdateTest, InvalidDataIsNotProducedAgain)
{
    WriteCache("old");
    const std::string before = ReadFile(path);
    TestCache each = Another(false, 3);
    each.produce = [](Json::Value& data) {
        data = Json::Value();
        return true;
    };
    EXPECT_FALSE(each.DoUpdate());
    EXPECT_EQ(each.CountCalls("GetUpdatedData"), 1U);
    ExpectPauses(0, 0);
    ExpectLines(
        {Debug("UpdateWithData", R"([null] is not valid to update for cache ["test cache"])")});
    EXPECT_EQ(ReadFile(path), before);
}

TEST_F(CacheUpdateTest, DoUpdateTakesNoLockAndSetsNoMark)
{
    cache.produce = [this](Json::Value& data) {
        EXPECT_FALSE(IsMarked());
        data = "new";
        return true;
    };
    EXPECT_TRUE(cache.DoUpdate());
    EXPECT_EQ(CountOpened(lockPath), 0U);
    EXPECT_EQ(CountOpened(pidPath), 0U);
    EXPECT_EQ(cache.GetCachedData(), "new");
}

// ------------------------------------------------------------------------ UpdateWithData: writing

TEST_F(CacheUpdateTest, TheFileHoldsAllSevenKeys)
{
    cache.info = [] { return ParseJson(R"({"node":["a",1]})"); };
    EXPECT_TRUE(cache.UpdateWithData(ParseJson(R"({"b":[null,0.5],"a":"ä"})"), 100, 103));
    EXPECT_EQ(ReadFile(path),
              R"({"begin_time_to_update":100,"cached_data":{"a":"ä","b":[null,0.5]},)"
              R"("finish_time_to_update":103,"info":{"node":["a",1]},"max_updated_time":3,)"
              R"("timeout":60,"updated_time":3.0})");
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("status.cached"));
}

TEST_F(CacheUpdateTest, TimesAndTimeoutAreIntegersOf64Bits)
{
    for (const long timeout : {std::numeric_limits<long>::max(), std::numeric_limits<long>::min(),
                               5'000'000'000L, -1L, 0L}) {
        const TestCache each = Another(false, 0, timeout);
        EXPECT_TRUE(each.UpdateWithData("data", 4'294'967'297, 4'294'967'299));
        EXPECT_TRUE(Same(Document()["timeout"], Json::Int64{timeout}));
        EXPECT_TRUE(Same(Document()["begin_time_to_update"], Json::Int64{4'294'967'297}));
        EXPECT_TRUE(Same(Document()["finish_time_to_update"], Json::Int64{4'294'967'299}));
        EXPECT_TRUE(Same(Document()["updated_time"], 2.0));
    }
}

TEST_F(CacheUpdateTest, OneUnknownTimeMakesBothUnknown)
{
    constexpr long Min = std::numeric_limits<long>::min();
    struct Row {
        long begin;
        long finish;
        Json::Int64 beginWritten;
        Json::Int64 finishWritten;
        double took;
    };
    const std::vector<Row> table = {
        {0, 0, 0, 0, 0.0},  {0, 5, 0, 0, 0.0},   {5, 0, 0, 0, 0.0},   {-1, 5, 0, 0, 0.0},
        {5, -1, 0, 0, 0.0}, {Min, 5, 0, 0, 0.0}, {5, Min, 0, 0, 0.0}, {1, 1, 1, 1, 0.0},
        {1, 2, 1, 2, 1.0},  {5, 2, 5, 2, -3.0},  // the clock was set back
    };
    for (const Row& row : table) {
        SCOPED_TRACE(std::to_string(row.begin) + ", " + std::to_string(row.finish));
        EXPECT_TRUE(cache.UpdateWithData("data", row.begin, row.finish));
        EXPECT_TRUE(Same(Document()["begin_time_to_update"], row.beginWritten));
        EXPECT_TRUE(Same(Document()["finish_time_to_update"], row.finishWritten));
        EXPECT_TRUE(Same(Document()["updated_time"], row.took));
    }
}

TEST_F(CacheUpdateTest, WithoutTimesZerosAreWrittenAndTheLongestRefreshStays)
{
    EXPECT_TRUE(cache.UpdateWithData("data", 100, 112));
    EXPECT_TRUE(cache.UpdateWithData("other"));
    EXPECT_EQ(ReadFile(path),
              R"({"begin_time_to_update":0,"cached_data":"other","finish_time_to_update":0,)"
              R"("info":"test cache","max_updated_time":12,"timeout":60,"updated_time":0.0})");
}

TEST_F(CacheUpdateTest, TheLongestRefreshOnlyIncreases)
{
    struct Row {
        const char* before;
        long took;
        int longest;
    };
    const std::vector<Row> table = {
        {R"({"max_updated_time":7})", 3, 7},
        {R"({"max_updated_time":7})", 7, 7},
        {R"({"max_updated_time":7})", 8, 8},
        {R"({"max_updated_time":7})", -8, 7},
        {R"({"max_updated_time":-5})", 0, 0},
        {R"({"max_updated_time":7.0})", 3, 3},  // a real number counts as 0: the contract
        {R"({"max_updated_time":"7"})", 3, 3},
        {"{}", 3, 3},
        {"{}", -3, 0},
        {"garbage", 3, 3},
        {"{}", MaxInt, MaxInt},
        {"{}", 3'000'000'000, MaxInt},
    };
    for (const Row& row : table) {
        SCOPED_TRACE(std::string(row.before) + ", " + std::to_string(row.took));
        WriteFile(path, row.before);
        EXPECT_TRUE(cache.UpdateWithData("data", 100, 100 + row.took));
        const bool known = 100 + row.took > 0;
        EXPECT_TRUE(Same(Document()["updated_time"], known ? static_cast<double>(row.took) : 0.0));
        EXPECT_TRUE(Same(Document()["max_updated_time"], row.longest));
    }
}

TEST_F(CacheUpdateTest, KeepsTheLongestRefreshOfAFileItHasLoadedOrWritten)
{
    WriteFile(path, R"({"cached_data":"data","max_updated_time":7})");
    EXPECT_TRUE(cache.Load());
    EXPECT_TRUE(cache.UpdateWithData("other"));
    EXPECT_EQ(Document()["max_updated_time"], 7);
    EXPECT_TRUE(cache.UpdateWithData("other", 100, 109));
    EXPECT_TRUE(cache.UpdateWithData("other"));
    EXPECT_EQ(Document()["max_updated_time"], 9);
    EXPECT_EQ(cache.GetMaxUpdateTime(), 9);
}

// As on a file system with a coarse clock.
TEST_F(CacheUpdateTest, NoticesAnEditThatLeavesTheModificationTime)
{
    std::vector<std::function<bool()>> ways = {
        [&] { return cache.UpdateWithData("data", 100, 105); }, [&] { return cache.Load(); }};
    for (const std::function<bool()>& known : ways) {
        EXPECT_TRUE(known());
        struct stat seen {};
        ASSERT_EQ(::stat(path.c_str(), &seen), 0);
        faults.stat = [&](const char* name, struct stat* status) {
            const int result = RealStat(Place(name).c_str(), status);
            if (name == path) *status = seen;
            return result;
        };
        std::string text = ReadFile(path);
        text.replace(text.find("\"max_updated_time\":5"), 20, "\"max_updated_time\":9");
        WriteFile(path, text);
        EXPECT_EQ(cache.GetMaxUpdateTime(), 9);
        EXPECT_TRUE(cache.UpdateWithData("data"));
        EXPECT_EQ(Document()["max_updated_time"], 9);
        faults.stat = nullptr;
        WriteFile(path, R"({"cached_data":"data","max_updated_time":5})");
        SetModifyTime(path, 1'000'000);
    }
}

TEST_F(CacheUpdateTest, TakesTheLongestRefreshFromAFileChangedBySomebodyElse)
{
    struct Row {
        const char* what;
        std::function<void()> change;
        int longest;
    };
    const std::string text =
        R"({"begin_time_to_update":0,"cached_data":"data","finish_time_to_update":0,)"
        R"("info":"test cache","max_updated_time":9,"timeout":60,"updated_time":0.0})";
    const std::vector<Row> table = {
        {"another object's", [&] { EXPECT_TRUE(Another(false).UpdateWithData("data", 100, 109)); },
         9},
        {"written in place", [&] { WriteFile(path, text); }, 9},
        {"replaced, with the same size and time",
         [&] {
             struct stat status {};
             EXPECT_EQ(::stat(path.c_str(), &status), 0);
             WriteFile(dir.File("new"), text);
             SetModifyTime(dir.File("new"), status.st_mtim.tv_sec, status.st_mtim.tv_nsec);
             std::filesystem::rename(dir.File("new"), path);
         },
         9},
        {"gone", [&] { EXPECT_EQ(cache.Remove(), 0); }, 0},
        {"garbage", [&] { WriteFile(path, "garbage"); }, 0},
        {"without it", [&] { WriteCache("data"); }, 0},
    };
    for (const Row& row : table) {
        SCOPED_TRACE(row.what);
        cache.Remove();
        EXPECT_TRUE(cache.UpdateWithData("data", 100, 105));
        EXPECT_TRUE(cache.UpdateWithData("data"));
        EXPECT_EQ(Document()["max_updated_time"], 5);
        EXPECT_EQ(std::filesystem::file_size(path), text.size());
        row.change();
        EXPECT_TRUE(cache.UpdateWithData("data"));
        EXPECT_EQ(Document()["max_updated_time"], row.longest);
    }
}

TEST_F(CacheUpdateTest, AFailedWriteDoesNotChangeTheLongestRefresh)
{
    EXPECT_TRUE(cache.UpdateWithData("data", 100, 105));
    faults.rename = Failing(EROFS);
    EXPECT_FALSE(cache.UpdateWithData("data", 100, 109));
    faults.rename = nullptr;
    EXPECT_TRUE(cache.UpdateWithData("data"));
    ExpectLines({WroteNothing()});
    EXPECT_EQ(Document()["max_updated_time"], 5);
}

TEST_F(CacheUpdateTest, RefusesInvalidDataAndLeavesTheFile)
{
    cache.isValid = [](const Json::Value& data) { return data.isString(); };
    cache.info = [] { return ParseJson(R"({"%d":["ä"]})"); };
    EXPECT_FALSE(cache.UpdateWithData(ParseJson(R"({"%s":[1, 2.0, null]})"), 100, 103));
    ExpectLines(
        {Debug("UpdateWithData",
               R"([{"%s":[1,2.0,null]}] is not valid to update for cache [{"%d":["ä"]}])")});
    EXPECT_THAT(NamesIn(dir.Path()), IsEmpty());

    WriteFile(path, " { \"cached_data\" :\"old\"}\n");
    EXPECT_EQ(cache.GetCachedData(), "old");
    EXPECT_FALSE(cache.UpdateWithData(1));
    ExpectLines(
        {Debug("UpdateWithData", R"([1] is not valid to update for cache [{"%d":["ä"]}])")});
    EXPECT_EQ(ReadFile(path), " { \"cached_data\" :\"old\"}\n");
    ForgetOpened();
    EXPECT_EQ(cache.GetCachedData(), "old");
    EXPECT_EQ(CountOpened(path), 0U);
    ExpectPauses(0, 0);
}

TEST_F(CacheUpdateTest, KeepsWhatItHasWrittenInMemory)
{
    WriteStale("old");
    EXPECT_EQ(cache.GetCachedData(), "old");
    EXPECT_TRUE(cache.UpdateWithData("new"));
    ForgetOpened();
    EXPECT_EQ(cache.GetCachedData(), "new");
    EXPECT_EQ(CountOpened(path), 0U);
    EXPECT_FALSE(cache.IsTimeout());

    WriteCache("by somebody else", 1);
    EXPECT_EQ(cache.GetCachedData(), "by somebody else");
}

TEST_F(CacheUpdateTest, WritingIsRetriedUpToTheLimit)
{
    WriteCache("old", 1'000'000);
    const std::string before = ReadFile(path);
    std::size_t attempts = 0;
    faults.fsync = [&](int /*fd*/) {
        ++attempts;
        return Failing(EIO)();
    };
    for (const Attempts& row : AttemptsByLimit) {
        SCOPED_TRACE(row.limit);
        TestCache each = Another(false, row.limit);
        EXPECT_EQ(each.GetCachedData(), "old");
        attempts = 0;
        EXPECT_FALSE(each.UpdateWithData("new"));
        EXPECT_EQ(attempts, row.attempts);
        ExpectPauses(row.attempts - 1, ShortestWritePause);
        ExpectLines({WroteNothing(row.limit)});
        ForgetOpened();
        EXPECT_EQ(each.GetCachedData(), "old");  // as in the file
        EXPECT_EQ(CountOpened(path), 0U);
        EXPECT_EQ(each.CountCalls("IsValidData"), 1U);
    }
    EXPECT_EQ(ReadFile(path), before);
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("status.cached"));
}

TEST_F(CacheUpdateTest, AWriteThatSucceedsLaterEndsTheRetriesWithoutALogLine)
{
    for (const int limit : {1, 3, MaxInt}) {
        int attempts = 0;
        faults.rename = [&](const char* from, const char* to) {
            return ++attempts == 3 ? RealRename(from, to) : Failing(EIO)();
        };
        const TestCache each = Another(false, limit);
        EXPECT_TRUE(each.UpdateWithData(limit));
        EXPECT_EQ(attempts, 3);
        ExpectPauses(2, ShortestWritePause);
        EXPECT_EQ(each.GetCachedData(), limit);
    }
}

TEST_F(CacheUpdateTest, ADirectoryInPlaceOfTheFileCannotBeReplaced)
{
    std::filesystem::create_directory(path);
    EXPECT_FALSE(cache.UpdateWithData("new"));
    ExpectPauses(1, ShortestWritePause);
    ExpectLines({WroteNothing()});
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("status.cached"));
}

TEST_F(CacheUpdateTest, ReplacesWhatIsNoRegularFileByOne)
{
    const Umask umask(0022);
    for (const SpecialFile::Kind kind : SpecialFile::Kinds()) {
        if (kind == SpecialFile::Kind::Directory) continue;
        const SpecialFile special(kind, path, R"({"cached_data":1,"max_updated_time":7})");
        CheckInChild([&] {
            SCOPED_TRACE(kind);
            EXPECT_EQ(cache.Read(), "new");
            EXPECT_EQ(TakeLines().size(), 6U);
            EXPECT_EQ(Document()["cached_data"], "new");
            EXPECT_EQ(Document()["max_updated_time"], 0);
            EXPECT_EQ(ModeOf(path), 0644U);
        });
    }
}

// ------------------------------------------------------------- UpdateWithData: what cannot be read

class UnreadableDataTest : public CacheUpdateTest {
  protected:
    UnreadableDataTest() { WriteCache("old", std::time(nullptr) - 10); }

    // Whether the data is written and can be loaded by another object. If not, nothing has changed.
    bool IsWritten(const Json::Value& data)
    {
        const std::string before = ReadFile(path);
        EXPECT_EQ(cache.GetCachedData(), "old");
        const bool written = cache.UpdateWithData(data, 100, 103);
        ExpectPauses(0, 0);
        if (written) {
            EXPECT_TRUE(Same(Another(false).GetCachedData(), data));
            EXPECT_TRUE(Same(Document()["info"], cache.info()));
        } else {
            ExpectLines({Debug("UpdateWithData", "[" + toString(data) +
                                                     "] is not valid to update for cache [" +
                                                     toString(cache.info()) + "]")});
            EXPECT_EQ(ReadFile(path), before);
            ForgetOpened();
            EXPECT_EQ(cache.GetCachedData(), "old");
            EXPECT_EQ(CountOpened(path), 0U);
        }
        WriteCache("old", std::time(nullptr) - 10);
        return written;
    }
};

// The document around the value is one level.
TEST_F(UnreadableDataTest, NestingTooDeepIsRefused)
{
    for (const Json::Value& innermost : {Json::Value(Json::arrayValue), Json::Value(1)}) {
        EXPECT_TRUE(IsWritten(Nested(998, innermost)));
        EXPECT_TRUE(IsWritten(Nested(999, innermost)));
        EXPECT_FALSE(IsWritten(Nested(1000, innermost)));
        EXPECT_FALSE(IsWritten(Nested(1001, innermost)));
        EXPECT_FALSE(IsWritten(Nested(5000, innermost)));

        cache.info = [&] { return Nested(999, innermost); };
        EXPECT_TRUE(IsWritten("data"));
        cache.info = [&] { return Nested(1000, innermost); };
        EXPECT_FALSE(IsWritten("data"));
        cache.info = [] { return Json::Value("test cache"); };
    }
}

TEST_F(UnreadableDataTest, AnInfinityIsRefused)
{
    constexpr double Infinity = std::numeric_limits<double>::infinity();
    for (const double number : {Infinity, -Infinity}) {
        Json::Value data;
        data["list"].append(1);
        data["list"].append(number);
        EXPECT_FALSE(IsWritten(number));
        EXPECT_FALSE(IsWritten(data));
        cache.info = [&] { return data; };
        EXPECT_FALSE(IsWritten("data"));
        cache.info = [] { return Json::Value("test cache"); };
    }
    EXPECT_TRUE(IsWritten(std::numeric_limits<double>::max()));
}

TEST_F(UnreadableDataTest, NotANumberIsWrittenAsNull)
{
    Json::Value data;
    data["a"] = std::numeric_limits<double>::quiet_NaN();
    EXPECT_TRUE(cache.UpdateWithData(data));
    EXPECT_TRUE(Same(Another(false).GetCachedData(), ParseJson(R"({"a":null})")));
}

TEST_F(UnreadableDataTest, ProducedDataThatIsRefusedIsNotProducedAgain)
{
    TestCache each = Another(true, 3);
    each.produce = [](Json::Value& data) {
        data = std::numeric_limits<double>::infinity();
        return true;
    };
    const std::string before = ReadFile(path);
    EXPECT_FALSE(each.Update());
    EXPECT_EQ(each.CountCalls("GetUpdatedData"), 1U);
    ExpectPauses(0, 0);
    ExpectLines(
        {Start(),
         Debug("UpdateWithData", R"([1e+9999] is not valid to update for cache ["test cache"])"),
         Finish()});
    EXPECT_EQ(ReadFile(path), before);
}

// Copying it, or making its text, would overflow the stack.
TEST_F(UnreadableDataTest, AValueThatWouldOverflowTheStackIsLoggedWithoutItsText)
{
    CheckInChild([this] {
        // Destroying it would, too.
        static const Json::Value& data = *new Json::Value(Nested(1'000'000));
        const auto refused = Debug("UpdateWithData",
                                   "[(nested too deep)] is not valid to update "
                                   R"(for cache ["test cache"])");
        EXPECT_FALSE(cache.UpdateWithData(data));
        ExpectLines({refused});
        cache.isValid = [](const Json::Value& /*data*/) { return false; };
        EXPECT_FALSE(cache.UpdateWithData(data));
        ExpectLines({refused});
        EXPECT_EQ(Document()["cached_data"], "old");
    });
}

// ----------------------------------------------------------------------------------------- pauses

TEST_F(CacheUpdateTest, PausesAreSpreadOverTheirWholeRange)
{
    constexpr std::size_t Count =
        200;  // with so many, a tenth of a second stays empty once in 10^13 runs
    std::size_t from = 0;
    const auto expectSpread = [&](unsigned int shortest) {
        const std::vector<unsigned int> taken(pauses.Taken().begin() + static_cast<long>(from),
                                              pauses.Taken().end());
        from += taken.size();
        ExpectPauses(Count, shortest);
        ASSERT_FALSE(taken.empty());
        EXPECT_LT(*std::min_element(taken.begin(), taken.end()), shortest + 100'000);
        EXPECT_GT(*std::max_element(taken.begin(), taken.end()), 900'000U);
    };
    constexpr int Limit = Count - 1;
    TestCache each = Another(true, Limit);
    each.produce = [](const Json::Value&) { return false; };
    EXPECT_FALSE(each.DoUpdate());
    ExpectLines({ProducedNothing(Limit)});
    expectSpread(ShortestProducePause);

    faults.fsync = Failing(EIO);
    EXPECT_FALSE(each.UpdateWithData("new"));
    ExpectLines({WroteNothing(Limit)});
    expectSpread(ShortestWritePause);

    faults.fsync = nullptr;
    WriteFile(pidPath, std::to_string(::getpid()));
    pauses.OnPause([&](std::size_t number) {
        if (number == from + Count) std::filesystem::remove(pidPath);
    });
    EXPECT_TRUE(each.Update());
    ExpectLines({StartWait(), FinishWait()});
    expectSpread(ShortestWaitPause);
}

// ------------------------------------------------------------------------- a refresh in the caller

TEST_F(CacheUpdateTest, TheFirstReadRefreshesInTheCaller)
{
    FailForks(EAGAIN);
    const pid_t self = ::getpid();
    cache.produce = [&](Json::Value& data) {
        EXPECT_EQ(::getpid(), self);
        data = "new";
        return true;
    };
    EXPECT_EQ(cache.Read(), "new");
    ExpectLines({NoData(), UsesDefault(), NoData(), UsesDefault(), Start(), Finish()});
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("status.cached"));
    EXPECT_THAT(cache.TakeCalls(),
                ElementsAre("GetDefaultValue", "IsUpdatedDataRequired", "GetDefaultValue",
                            "IsValidData", "GetUpdatedData", "IsValidData", "GetInfo"));
    EXPECT_EQ(cache.Read(), "new");
    EXPECT_EQ(cache.CountCalls("GetUpdatedData"), 0U);
}

TEST_F(CacheUpdateTest, UpdateRefreshesFreshDataToo)
{
    WriteCache("old");
    EXPECT_TRUE(waiting.Update());
    ExpectLines({Start(), Finish()});
    EXPECT_EQ(waiting.GetCachedData(), "new");
}

TEST_F(CacheUpdateTest, DuringARefreshTheCacheIsMarkedAndNoLockIsHeld)
{
    NoteLocking();
    waiting.produce = [this](Json::Value& data) {
        EXPECT_THAT(locking, ElementsAre(Probe, Probe, Mark));
        EXPECT_FALSE(IsLocked(lockFile));
        EXPECT_EQ(CoreLibReadPidFile(pidPath.c_str()), ::getpid());
        locking.clear();
        data = "new";
        return true;
    };
    EXPECT_TRUE(waiting.Update());
    EXPECT_THAT(locking, ElementsAre(Probe, Probe));
    EXPECT_FALSE(IsLocked(lockFile));
    EXPECT_FALSE(IsMarked());
    EXPECT_EQ(ReadFile(lockFile), "");
    ExpectLines({Start(), Finish()});
    ExpectSleeps(0);
}

// A program that another thread starts meanwhile inherits the descriptor.
TEST_F(CacheUpdateTest, EveryLockIsUnlockedBeforeItsFileIsClosed)
{
    std::set<int> held;
    int locks = 0;
    int closed = 0;
    faults.flock = [&](int fd, int operation) {
        const int result = RealFlock(fd, operation);
        if (result != 0 || !IsLockFile(fd)) return result;
        if (operation == LOCK_UN) {
            held.erase(fd);
        } else {
            held.insert(fd);
            ++locks;
        }
        return result;
    };
    faults.close = [&](int fd) {
        if (IsLockFile(fd)) {
            ++closed;
            EXPECT_EQ(held.count(fd), 0U) << "closed while it is locked";
        }
        return RealClose(fd);
    };
    EXPECT_TRUE(waiting.Update());
    EXPECT_EQ(locks, 5);
    EXPECT_EQ(closed, 5);

    WriteFile(pidPath, "1");  // a living process's
    WriteStale("old");
    EXPECT_TRUE(cache.Update());
    EXPECT_EQ(locks, 6);
    EXPECT_EQ(closed, 6);
    ExpectLines({Start(), Finish()});
}

TEST_F(CacheUpdateTest, ALockOnDescriptorZeroIsUnlockedToo)
{
    CheckInChild([this] {
        ASSERT_EQ(::close(STDIN_FILENO), 0);
        std::vector<int> unlocked;
        faults.flock = [&](int fd, int operation) {
            if (operation == LOCK_UN) unlocked.push_back(fd);
            return RealFlock(fd, operation);
        };
        EXPECT_TRUE(waiting.Update());
        EXPECT_THAT(unlocked, Contains(STDIN_FILENO));
        ExpectLines({Start(), Finish()});
    });
}

// Readers of the mark take the lock shared.
TEST_F(CacheUpdateTest, ReadingTheMarkExcludesNoOtherReader)
{
    std::optional<HeldLock> look;
    waiting.produce = [&](Json::Value& data) {
        look.emplace(lockFile, LOCK_SH);
        data = "new";
        return true;
    };
    EXPECT_TRUE(waiting.Update());
    ExpectLines({Start(), Finish()});
    EXPECT_FALSE(IsMarked());
    ExpectSleeps(0);
}

TEST_F(CacheUpdateTest, AFailedRefreshIsLoggedAndUnmarked)
{
    struct Row {
        const char* what;
        std::function<bool(Json::Value&)> produce;
        std::function<int(int)> fsync;
        LogLine line;
    };
    const auto nothing = [](Json::Value&) { return false; };
    const auto invalid = [](Json::Value&) { return true; };
    const auto valid = [](Json::Value& data) {
        data = "new";
        return true;
    };
    // The cache file cannot be written once the pid file is.
    const auto fail = [this](int fd) { return IsMarked() ? Failing(ENOSPC)() : RealFsync(fd); };
    const std::vector<Row> table = {
        {"nothing produced", nothing, nullptr, ProducedNothing()},
        {"invalid data", invalid, nullptr,
         Debug("UpdateWithData", R"([null] is not valid to update for cache ["test cache"])")},
        {"nothing written", valid, fail, WroteNothing()},
    };
    WriteStale("old");
    const std::string before = ReadFile(path);
    for (const Row& row : table) {
        SCOPED_TRACE(row.what);
        waiting.produce = row.produce;
        faults.fsync = row.fsync;
        EXPECT_FALSE(waiting.Update());
        ExpectLines({Start(), row.line, Finish()});
        EXPECT_EQ(waiting.Read(), "old");
        ExpectLines({Start(), row.line, Finish(), UsesOldData()});
        EXPECT_FALSE(IsMarked());
        EXPECT_EQ(ReadFile(path), before);
    }
}

TEST_F(CacheUpdateTest, TheCallerGetsAnExceptionAfterThePidFileIsRemoved)
{
    WriteStale("old");
    waiting.produce = [this](Json::Value& /*data*/) -> bool {
        EXPECT_TRUE(IsMarked());
        throw std::runtime_error("no node answers");
    };
    try {
        waiting.Read();
        ADD_FAILURE() << "nothing was thrown";
    } catch (const std::runtime_error& error) {
        EXPECT_STREQ(error.what(), "no node answers");
    }
    ExpectLines({Start(), Finish()});
    EXPECT_FALSE(IsMarked());
    EXPECT_FALSE(IsLocked(lockFile));

    waiting.produce = [](Json::Value& /*data*/) -> bool { throw 5; };
    EXPECT_THROW(waiting.Update(), int);
    ExpectLines({Start(), Finish()});
    EXPECT_FALSE(IsMarked());
}

// ---------------------------------------------------------------------------------------- marking

TEST_F(CacheUpdateTest, WithoutTheMarkingLockThereIsNoRefresh)
{
    WriteStale("old");
    NoteLocking();
    const HeldLock look(lockFile, LOCK_SH);  // others can read the mark, but not set it
    EXPECT_EQ(waiting.Read(), "old");
    EXPECT_THAT(locking, ElementsAre(Probe, Probe, Mark, Mark, Mark, Mark, Mark, Mark));
    ExpectSleeps(5);
    ExpectLines({Debug("SetUpdating", "Failed to lock [" + lockPath + "]"), UsesOldData()});
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 0U);
    EXPECT_FALSE(IsMarked());
}

TEST_F(CacheUpdateTest, TheNextAttemptTakesAMarkingLockThatHasBecomeFree)
{
    std::optional<HeldLock> look;
    look.emplace(lockFile, LOCK_SH);
    OnLocking(5, [&] {  // the third attempt to mark
        look.reset();
        return std::nullopt;
    });
    EXPECT_TRUE(waiting.Update());
    EXPECT_THAT(locking, ElementsAre(Probe, Probe, Mark, Mark, Mark, Probe, Probe));
    ExpectSleeps(2);
    ExpectLines({Start(), Finish()});
}

TEST_F(CacheUpdateTest, AMarkingLockThatCannotBeOpenedIsLoggedByTheLockToo)
{
    FailOpeningLock(3);
    EXPECT_FALSE(waiting.Update());
    ExpectLines(
        Joined({LockIsNotOpened(), {Debug("SetUpdating", "Failed to lock [" + lockPath + "]")}}));
    ExpectSleeps(0);
    EXPECT_FALSE(IsMarked());
}

TEST_F(CacheUpdateTest, AnUpdaterThatAppearsBetweenTheTwoChecksIsLeftAlone)
{
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    const std::string marked = ReadFile(pidPath);
    std::filesystem::remove(pidPath);
    OnLocking(2, [&] {
        WriteFile(pidPath, marked);
        return std::nullopt;
    });
    EXPECT_FALSE(waiting.Update());  // without a log line
    EXPECT_THAT(locking, ElementsAre(Probe, Probe));
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 0U);
    EXPECT_EQ(ReadFile(pidPath), marked);
}

TEST_F(CacheUpdateTest, AnUpdaterThatAppearsBeforeTheMarkingIsLeftAlone)
{
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    const std::string marked = ReadFile(pidPath);
    std::filesystem::remove(pidPath);
    OnLocking(3, [&] {
        WriteFile(pidPath, marked);
        return std::nullopt;
    });
    WriteStale("old");
    EXPECT_EQ(waiting.Read(), "old");
    ExpectLines({Debug("SetUpdating", "there is other process to update cache [" + path + "]"),
                 UsesOldData()});
    EXPECT_THAT(locking, ElementsAre(Probe, Probe, Mark));
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 0U);
    EXPECT_EQ(ReadFile(pidPath), marked);
    EXPECT_FALSE(IsLocked(lockFile));
}

TEST_F(CacheUpdateTest, WithoutAPidFileThereIsNoRefresh)
{
    WriteStale("old");
    std::filesystem::create_directory(pidPath);  // no file can replace it
    EXPECT_EQ(waiting.Read(), "old");
    ExpectLines(
        {Debug("SetUpdating", "Failed to set cache [" + path + "] updating"), UsesOldData()});
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 0U);
    EXPECT_FALSE(IsLocked(lockFile));
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("status.cached", "status.cached.pid"));
}

// -------------------------------------------------------------------------------------- unmarking

TEST_F(CacheUpdateTest, KeepsTheMarkOfAnotherLivingProcess)
{
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    const std::string marked = ReadFile(pidPath);
    std::filesystem::remove(pidPath);
    waiting.produce = [&](Json::Value& data) {
        WriteFile(pidPath, marked);
        data = "new";
        return true;
    };
    EXPECT_TRUE(waiting.Update());
    ExpectLines({Start(), Debug("UnsetUpdating", "Failed to unset updating cache [" + pidPath +
                                                     "] since different pid[" +
                                                     std::to_string(updater.Pid()) + "]")});
    EXPECT_EQ(ReadFile(pidPath), marked);
    EXPECT_FALSE(IsLocked(lockFile));
    EXPECT_EQ(Document()["cached_data"], "new");
}

TEST_F(CacheUpdateTest, ProcessOneIsAnUpdaterLikeAnyOther)
{
    WriteStale();  // with cached data nobody waits
    WriteFile(pidPath, "1");
    FailForks(EAGAIN);  // it could not refresh by itself
    EXPECT_TRUE(cache.Update());
    EXPECT_TRUE(IsMarked());
    ExpectLines({});
}

TEST_F(CacheUpdateTest, AFileWrittenByGetDefaultValueCountsAsFresh)
{
    cache.defaultValue = [&] {
        WriteCache("written meanwhile");
        return Json::Value("default");
    };
    EXPECT_EQ(cache.Read(), "default");
    EXPECT_EQ(cache.CountCalls("GetUpdatedData"), 0U);
    ExpectLines(
        {Debug("Load", "no data is cached in [" + path + "]"),
         Debug("GetCachedData", "Failed to load cache [" + path + "], use default cache data")});
}

TEST_F(CacheUpdateTest, RemovesAMarkThatNamesNoLivingProcess)
{
    const ChildProcess somebody([](ChildProcess::Link& link) { link.Await(); });
    const std::string reused = std::to_string(somebody.Pid()) + "\n1\n";
    for (const std::string& content : {reused, std::string("garbage"), std::string()}) {
        waiting.produce = [&](Json::Value& data) {
            WriteFile(pidPath, content);
            data = "new";
            return true;
        };
        EXPECT_TRUE(waiting.Update());
        ExpectLines({Start(), Finish()});
        EXPECT_FALSE(IsMarked());
    }
    waiting.produce = [&](Json::Value& data) {
        std::filesystem::remove(pidPath);
        data = "new";
        return true;
    };
    EXPECT_TRUE(waiting.Update());
    ExpectLines({Start(), Finish()});
}

// The contract: for all others, and for itself, this process is the updater as long as it lives.
TEST_F(CacheUpdateTest, WithoutTheLockTheMarkStaysAndNothingIsLogged)
{
    NoteLocking();
    std::optional<HeldLock> other;
    waiting.produce = [&](Json::Value& data) {
        locking.clear();
        other.emplace(lockFile, LOCK_EX);
        data = "new";
        return true;
    };
    EXPECT_TRUE(waiting.Update());
    ExpectLines({Start()});
    EXPECT_THAT(locking, ElementsAre(Probe, Probe, Probe, Probe, Probe, Probe));
    ExpectSleeps(5);
    EXPECT_EQ(CoreLibReadPidFile(pidPath.c_str()), ::getpid());

    other.reset();
    waiting.TakeCalls();
    EXPECT_TRUE(waiting.Update());
    ExpectLines({StartWait(), FinishWait()});  // the file is fresh
    ExpectPauses(1, ShortestWaitPause);
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 0U);
}

TEST_F(CacheUpdateTest, ALockThatCanNoLongerBeOpenedLeavesTheMark)
{
    FailOpeningLock(4);
    EXPECT_TRUE(waiting.Update());
    ExpectLines(Joined({{Start()}, LockIsNotOpened()}));
    EXPECT_TRUE(IsMarked());
}

TEST_F(CacheUpdateTest, WithoutTheSecondLockAMissingMarkCountsAsAnothers)
{
    OnLocking(5, [] { return Failing(EWOULDBLOCK)(); });
    waiting.produce = [&](Json::Value& data) {
        std::filesystem::remove(pidPath);
        data = "new";
        return true;
    };
    EXPECT_TRUE(waiting.Update());
    ExpectLines({Start(), Debug("UnsetUpdating", "Failed to unset updating cache [" + pidPath +
                                                     "] since different pid[0]")});
    ExpectSleeps(5);

    waiting.produce = [](Json::Value& data) {
        data = "newer";
        return true;
    };
    locking.clear();
    EXPECT_TRUE(waiting.Update());
    ExpectLines({Start(), Finish()});  // the pid file names this process
    EXPECT_FALSE(IsMarked());
    ExpectSleeps(5);
}

// ------------------------------------------------------------------------------ is there an updater

TEST_F(CacheUpdateTest, APidFileOfNoLivingProcessCountsAsNone)
{
    ChildProcess ended = Updater();
    ASSERT_TRUE(ended.Await());
    const std::string ofEnded = ReadFile(pidPath);
    ended.Tell();
    ASSERT_EQ(ended.Join(), 0);
    const ChildProcess somebody([](ChildProcess::Link& link) { link.Await(); });
    const std::string living = std::to_string(somebody.Pid());
    const std::vector<std::string> table = {
        ofEnded,
        living + "\n1\n",  // a later process with the id
        "4294967297",      // 1 in 32 bits
        "4294967297\n",   "18446744073709551617", "0\n",         "-1\n", "-" + living + "\n",
        "garbage",        living + "garbage",     "\n" + living, "\n",   "",
    };
    for (const std::string& content : table) {
        SCOPED_TRACE(content);
        WriteStale("old");
        WriteFile(pidPath, content);
        EXPECT_EQ(waiting.Read(), "new");
        ExpectLines({Start(), Finish()});
        EXPECT_FALSE(IsMarked());
    }
}

TEST_F(CacheUpdateTest, APidFileThatIsNoRegularFileCountsAsNone)
{
    for (const SpecialFile::Kind kind : SpecialFile::Kinds()) {
        if (kind == SpecialFile::Kind::Directory) continue;  // a pid file cannot replace it
        WriteStale("old");
        const SpecialFile special(kind, pidPath, std::to_string(::getppid()) + "\n");
        CheckInChild([&] {
            SCOPED_TRACE(kind);
            EXPECT_EQ(waiting.Read(), "new");
            ExpectLines({Start(), Finish()});
        });
    }
}

TEST_F(CacheUpdateTest, APidFileThatCannotBeReadToItsEndCountsAsNone)
{
    WriteStale("old");
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    const std::size_t size = ReadFile(pidPath).size();
    for (const std::size_t readable : {std::size_t{0}, std::size_t{1}, size}) {
        bool failed = false;
        faults.read = [&](int fd, void* buffer, std::size_t most) -> ssize_t {
            if (most > 64) return RealRead(fd, buffer, most);  // of another file
            if (std::exchange(failed, true) || readable == 0) return Failing(EIO)();
            return RealRead(fd, buffer, readable);
        };
        EXPECT_EQ(CoreLibReadPidFile(pidPath.c_str()), 0) << readable;
    }
}

TEST_F(CacheUpdateTest, APidFileIsReadWholeByteByByte)
{
    WriteStale("old");
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    const std::string marked = ReadFile(pidPath);
    faults.read = [](int fd, void* buffer, std::size_t size) {
        return RealRead(fd, buffer, std::min<std::size_t>(size, 1));
    };
    FailForks(EAGAIN);
    EXPECT_EQ(cache.Read(), "old");  // somebody refreshes
    EXPECT_EQ(ReadFile(pidPath), marked);
}

TEST_F(CacheUpdateTest, AZombieIsNoUpdater)
{
    WriteStale("old");
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    updater.Kill(SIGKILL);
    siginfo_t ended{};
    ASSERT_EQ(::waitid(P_PID, static_cast<id_t>(updater.Pid()), &ended, WEXITED | WNOWAIT), 0);
    EXPECT_EQ(waiting.Read(), "new");
    ExpectLines({Start(), Finish()});
}

TEST_F(CacheUpdateTest, ReturnsOldDataWhileALivingProcessUpdates)
{
    WriteStale("old");
    NoteLocking();
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    FailForks(EAGAIN);
    const std::string id = std::to_string(updater.Pid());
    for (const std::string& content : {ReadFile(pidPath), id, id + "\n", id + "\ngarbage\n"}) {
        SCOPED_TRACE(content);
        WriteFile(pidPath, content);
        locking.clear();
        EXPECT_EQ(cache.Read(), "old");
        EXPECT_TRUE(cache.Update());
        EXPECT_THAT(locking, ElementsAre(Probe, Probe));
        EXPECT_EQ(ReadFile(pidPath), content);
    }
    EXPECT_EQ(cache.CountCalls("GetUpdatedData"), 0U);
    ExpectPauses(0, 0);
}

TEST_F(CacheUpdateTest, ALockThatCannotBeTakenLooksLikeAnUpdater)
{
    WriteStale("old");
    FailForks(EAGAIN);
    NoteLocking();
    const HeldLock other(lockFile, LOCK_EX);
    EXPECT_EQ(cache.Read(), "old");
    EXPECT_THAT(locking, ElementsAre(Probe, Probe, Probe, Probe, Probe, Probe));
    ExpectSleeps(5);
    EXPECT_EQ(CountOpened(pidPath), 0U);
}

TEST_F(CacheUpdateTest, ReadsTheMarkOnceTheLockBecomesFree)
{
    std::optional<HeldLock> other;
    other.emplace(lockFile, LOCK_EX);
    OnLocking(3, [&] {
        other.reset();
        return std::nullopt;
    });
    EXPECT_TRUE(waiting.Update());
    ExpectSleeps(2);
    ExpectLines({Start(), Finish()});
}

TEST_F(CacheUpdateTest, ALockThatCannotBeOpenedLooksLikeAnUpdater)
{
    WriteStale("old");
    FailForks(EAGAIN);
    FailOpeningLock(1);
    EXPECT_EQ(cache.Read(), "old");
    ExpectLines(LockIsNotOpened());
    ExpectSleeps(0);
}

TEST_F(CacheUpdateTest, ALockDirectoryThatCannotBeMadeLooksLikeAnUpdater)
{
    WriteStale("old");
    FailForks(EAGAIN);
    std::filesystem::remove_all(Place("/tmp/.orvadr_lock"));
    faults.spawn = FailingToStart(EACCES);
    EXPECT_EQ(cache.Read(), "old");
    const std::string lockDir = "/tmp/.orvadr_lock/" + dir.Path();
    ExpectLines(
        {Err("CreateDir", "Failed to create dir [" + lockDir + "] with mode [755]").In("file.cpp"),
         Err("checkLockDir", "Failed to create lock dir [" + lockDir + "] in local host")
             .In("file_lock.cpp"),
         Err("openLockedFile", "Failed to check lock dir of lock file [" + lockPath + "].")
             .In("file_lock.cpp"),
         Err("lock", "Bad fd [-1] to lock [" + lockPath + "]").In("file_lock.cpp")});
}

// --------------------------------------------------------------------- a refresh in the background

TEST_F(CacheUpdateTest, ABackgroundReadReturnsOldDataAndAChildWritesTheNew)
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

TEST_F(CacheUpdateTest, ASecondReaderStartsNoRefresh)
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

TEST_F(CacheUpdateTest, TheChildChecksForAnUpdaterAgain)
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
TEST_F(CacheUpdateTest, IsUpdatedDataRequiredDecidesWhereTheRefreshRuns)
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

TEST_F(CacheUpdateTest, DataThatNeedsAnUpdateIsRefreshedInTheBackground)
{
    CheckInBackground([this] {
        WriteCache("old");
        cache.isNeedUpdate = [](const Json::Value& data) { return data == "old"; };
        EXPECT_EQ(cache.Read(), "old");
        EXPECT_EQ(AwaitRefresh(), 0);
        EXPECT_EQ(Document()["cached_data"], "new");
    });
}

TEST_F(CacheUpdateTest, AChildThatFailsPrintsNothingAndLeavesTheFile)
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
    explicit Witness(std::string note) : file(std::move(note)) {}
    Witness(const Witness&) = delete;
    Witness& operator=(const Witness&) = delete;
    ~Witness() { Note(); }

    void Note() const
    {
        if (::getpid() != owner) WriteFile(file, "seen");
    }

  private:
    std::string file;
    pid_t owner = ::getpid();
};

TEST_F(CacheUpdateTest, TheChildRunsNoDestructorOrExitHandler)
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

TEST_F(CacheUpdateTest, AFailedForkIsLogged)
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

TEST_F(CacheUpdateTest, TheChildInheritsNoLock)
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

// ---------------------------------------------------------------------------------------- waiting

TEST_F(CacheUpdateTest, WaitingEndsWhenTheFileIsFresh)
{
    WriteStale("old");
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    const std::string marked = ReadFile(pidPath);
    pauses.OnPause([this](std::size_t number) {
        EXPECT_FALSE(IsLocked(lockFile));
        if (number == 3) WriteCache("written by the updater");
    });
    EXPECT_EQ(waiting.Read(), "written by the updater");
    ExpectPauses(3, ShortestWaitPause);
    ExpectLines({StartWait(), FinishWait()});
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 0U);
    EXPECT_EQ(ReadFile(pidPath), marked);
}

TEST_F(CacheUpdateTest, WaitingEndsWhenTheUpdaterDies)
{
    WriteStale("old");
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    pauses.OnPause([&](std::size_t number) {
        if (number != 2) return;
        updater.Kill(SIGKILL);
        EXPECT_EQ(updater.Join(), 128 + SIGKILL);
    });
    EXPECT_EQ(waiting.Read(), "old");  // what the file holds
    ExpectPauses(2, ShortestWaitPause);
    ExpectLines({StartWait(), FinishWait()});
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 0U);
    EXPECT_TRUE(IsMarked());
    EXPECT_EQ(waiting.Read(), "new");  // the next read finds it dead
    ExpectLines({Start(), Finish()});
}

TEST_F(CacheUpdateTest, WaitingEndsWhenThePidFileIsGone)
{
    WriteStale("old");
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    pauses.OnPause([this](std::size_t number) {
        if (number == 4) std::filesystem::remove(pidPath);
    });
    EXPECT_TRUE(waiting.Update());
    ExpectPauses(4, ShortestWaitPause);
    ExpectLines({StartWait(), FinishWait()});
    EXPECT_EQ(waiting.GetCachedData(), "old");
}

// Only the age counts here, neither validity nor need.
TEST_F(CacheUpdateTest, WaitingTakesOnePauseWhenTheFileIsNotTooOld)
{
    WriteCache("old");
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    cache.isNeedUpdate = waiting.isNeedUpdate = [](const Json::Value&) { return true; };
    cache.isValid = [](const Json::Value&) { return false; };
    for (TestCache* each : {&cache, &waiting}) {
        EXPECT_EQ(each->Read(), "old");
        ExpectPauses(1, ShortestWaitPause);
        ExpectLines({StartWait(), FinishWait()});
    }
}

TEST_F(CacheUpdateTest, TheFirstReadersWaitForTheMissingFile)
{
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    pauses.OnPause([this](std::size_t number) {
        if (number == 2) WriteCache("first");
    });
    EXPECT_EQ(cache.Read(), "first");
    ExpectPauses(2, ShortestWaitPause);
    ExpectLines({NoData(), UsesDefault(), NoData(), UsesDefault(), StartWait(), FinishWait()});
}

TEST_F(CacheUpdateTest, WaitingContinuesWhileTheLockCannotBeTaken)
{
    WriteStale("old");
    NoteLocking();
    std::optional<HeldLock> other;
    other.emplace(lockFile, LOCK_EX);
    pauses.OnPause([&](std::size_t number) {
        if (number == 3) other.reset();
    });
    EXPECT_TRUE(waiting.Update());
    ExpectPauses(3, ShortestWaitPause);
    ExpectSleeps(15);  // of the first check, and of those after two pauses
    EXPECT_EQ(locking, std::vector<int>(19, Probe));
    ExpectLines({StartWait(), FinishWait()});
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 0U);
}

TEST_F(CacheUpdateTest, WaitingForALockEndsWhenTheFileIsFresh)
{
    WriteStale("old");
    FailOpeningLock(1);
    pauses.OnPause([this](std::size_t number) {
        if (number == 2) WriteCache("fresh");
    });
    EXPECT_EQ(waiting.Read(), "fresh");
    ExpectPauses(2, ShortestWaitPause);
    ExpectLines(Joined(
        {LockIsNotOpened(), {StartWait()}, LockIsNotOpened(), LockIsNotOpened(), {FinishWait()}}));
}

// --------------------------------------------------------------------------------- killed updaters

TEST_F(CacheUpdateTest, TheNextReaderReplacesAnUpdaterKilledWhileProducing)
{
    WriteStale("old");
    ChildProcess updater([this](ChildProcess::Link& link) {
        waiting.produce = [&](Json::Value& /*data*/) {
            link.Tell();
            return link.Await();
        };
        waiting.Read();
    });
    ASSERT_TRUE(updater.Await());
    EXPECT_EQ(cache.Read(), "old");  // somebody refreshes
    updater.Kill(SIGKILL);
    EXPECT_EQ(updater.Join(), 128 + SIGKILL);
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("status.cached", "status.cached.pid"));
    EXPECT_EQ(Document()["cached_data"], "old");

    EXPECT_EQ(waiting.Read(), "new");
    ExpectLines({Start(), Finish()});
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("status.cached"));
}

TEST_F(CacheUpdateTest, TheNextUpdaterRemovesWhatOneKilledWhileWritingLeft)
{
    WriteStale("old");
    ChildProcess updater([this](ChildProcess::Link& link) {
        faults.fsync = [&](int fd) {
            if (!IsMarked()) return RealFsync(fd);
            link.Tell();
            return link.Await() ? 0 : -1;
        };
        waiting.Read();
    });
    ASSERT_TRUE(updater.Await());
    updater.Kill(SIGKILL);
    EXPECT_EQ(updater.Join(), 128 + SIGKILL);
    EXPECT_THAT(
        NamesIn(dir.Path()),
        ElementsAre("status.cached", StartsWith("status.cached.orvadr-tmp"), "status.cached.pid"));
    EXPECT_EQ(Document()["cached_data"], "old");

    EXPECT_EQ(waiting.Read(), "new");
    ExpectLines({Start(), Finish()});
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("status.cached"));
}

// ---------------------------------------------------------------------------------- docs/cache.md

// The page that describes the files.
class CachePageTest : public CacheUpdateTest {
  protected:
    // The first fenced block of a language.
    std::string Block(const std::string& language) const
    {
        const std::string fence = "\n```" + language + "\n";
        const std::size_t begin = page.find(fence);
        if (begin == std::string::npos) throw std::runtime_error("no block of " + language);
        const std::size_t end = page.find("\n```\n", begin + fence.size());
        return page.substr(begin + fence.size(), end + 1 - begin - fence.size());
    }

    // The cells of the table whose header begins with this cell, without the blanks and backquotes
    // around them.
    std::vector<std::vector<std::string>> Table(const std::string& firstCell) const
    {
        std::istringstream lines(page.substr(page.find("\n| " + firstCell + " |") + 1));
        std::vector<std::vector<std::string>> rows;
        for (std::string line; std::getline(lines, line) && !line.empty();) {
            std::istringstream cells(line.substr(1));
            rows.emplace_back();
            for (std::string cell; std::getline(cells, cell, '|');) {
                const std::size_t first = std::min(cell.find_first_not_of(" `"), cell.size());
                const std::size_t last = cell.find_last_not_of(" `") + 1;
                rows.back().push_back(cell.substr(first, last - std::min(first, last)));
            }
        }
        if (rows.size() < 3) throw std::runtime_error("no table of " + firstCell);
        rows.erase(rows.begin(), rows.begin() + 2);  // the header and the line below it
        return rows;
    }

    // A path of the page, for the cache of this test.
    std::string Filled(std::string text) const
    {
        text = std::regex_replace(text, std::regex("/DIR/"), "/" + dir.Path() + "/");
        text = std::regex_replace(text, std::regex("DIR/"), dir.Path() + "/");
        return std::regex_replace(text, std::regex("FILE"), "status");
    }

    const std::string page = ReadFile(ORVADR_SOURCE_DIR "/docs/cache.md");
};

TEST_F(CachePageTest, TheExampleIsAFileThatTheLibraryWrites)
{
    const Json::Value example = ParseJson(Block("json"));
    TestCache each = Another(false, 0, example["timeout"].asInt64());
    each.info = [&] { return example["info"]; };
    EXPECT_TRUE(each.UpdateWithData("before", 1, 1 + example["max_updated_time"].asInt64()));
    EXPECT_TRUE(each.UpdateWithData(example["cached_data"],
                                    example["begin_time_to_update"].asInt64(),
                                    example["finish_time_to_update"].asInt64()));
    EXPECT_EQ(ReadFile(path), toString(example));
    EXPECT_EQ(each.GetCachedData(), example["cached_data"]);

    // On the page, spread out, it has the keys in the order of the file.
    std::string spread = Block("json");
    spread.erase(std::remove(spread.begin(), spread.end(), '\n'), spread.end());
    std::size_t at = 0;
    for (const std::string& key : example.getMemberNames()) {
        const std::size_t found = spread.find("  \"" + key + "\": ");
        ASSERT_NE(found, std::string::npos) << key;
        EXPECT_GE(found, at) << key;
        at = found;
    }
}

TEST_F(CachePageTest, TheTableHasAllKeysAndTheirTypes)
{
    EXPECT_TRUE(cache.UpdateWithData("data", 100, 103));
    const Json::Value document = Document();
    std::vector<std::string> keys;
    for (const std::vector<std::string>& row : Table("key")) {
        ASSERT_EQ(row.size(), 4U);
        const std::string& key = row[0];
        const std::string& type = row[1];
        keys.push_back(key);
        ASSERT_TRUE(document.isMember(key)) << key;
        if (type == "integer") {
            EXPECT_EQ(document[key].type(), Json::intValue) << key;
        } else if (type == "real") {
            EXPECT_EQ(document[key].type(), Json::realValue) << key;
        } else {
            EXPECT_EQ(type, "any") << key;
        }
    }
    EXPECT_THAT(keys, ElementsAre("timeout", "info", "cached_data", "begin_time_to_update",
                                  "finish_time_to_update", "updated_time", "max_updated_time"));
    EXPECT_EQ(document.size(), keys.size());
}

TEST_F(CachePageTest, ThePageHasThePathsOfTheFiles)
{
    const auto rows = Table("file");
    ASSERT_EQ(rows.size(), 3U);
    EXPECT_EQ(Filled(rows[0][1]), path);
    EXPECT_EQ(Filled(rows[1][1]), pidPath);
    EXPECT_EQ(Filled(rows[2][1]), lockPath);
    EXPECT_TRUE(waiting.Update());
    ExpectLines({Start(), Finish()});
    for (const auto& row : rows) EXPECT_GT(CountOpened(Filled(row[1])), 0U) << row[1];
}

TEST_F(CachePageTest, ThePageShowsTheFormOfThePidFile)
{
    const std::regex form("([0-9]+)\n([0-9]+)\n");
    EXPECT_TRUE(std::regex_match(Block("text"), form)) << Block("text");

    waiting.produce = [&](Json::Value& data) {
        const std::string written = ReadFile(pidPath);
        std::smatch numbers;
        EXPECT_TRUE(std::regex_match(written, numbers, form)) << written;
        EXPECT_EQ(numbers[1], std::to_string(::getpid()));
        // The third field follows the name in brackets; the start time is field 22.
        const std::string status = ReadFile("/proc/self/stat");
        std::istringstream fields(status.substr(status.rfind(')') + 1));
        std::string start;
        for (int field = 3; field <= 22; ++field) fields >> start;
        EXPECT_EQ(numbers[2], start);
        data = "new";
        return true;
    };
    EXPECT_TRUE(waiting.Update());
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 1U);
    ExpectLines({Start(), Finish()});
}

TEST_F(CachePageTest, ThePageHasTheModeOfTheLockFile)
{
    WriteStale("old");
    FailForks(EAGAIN);  // an ordinary user could open the lock only once
    for (const mode_t mask : {0U, 0077U}) {
        std::filesystem::remove(lockFile);
        const Umask umask(mask);
        EXPECT_FALSE(cache.Update());
        EXPECT_EQ(ModeOf(lockFile), 01204U & ~mask);
        EXPECT_EQ(std::filesystem::file_size(lockFile), 0U);
        EXPECT_EQ(TakeLines().size(), 1U);
    }
    EXPECT_NE(page.find("permission bits are 01204 less the umask"), std::string::npos);
}

}  // namespace
