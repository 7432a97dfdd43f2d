// UpdateWithData: what is written, how often that is tried, and what is refused.
#include <orvadrcore/cache.h>

#include <gmock/gmock.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <limits>
#include <string>
#include <vector>

#include "support/fixtures/cache_update_fixture.h"
#include "support/fixtures/json_kinds.h"
#include "support/fixtures/special_file.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr int MaxInt = std::numeric_limits<int>::max();

class CacheWritingTest : public CacheUpdateFixture {};

TEST_F(CacheWritingTest, TheFileHoldsAllSevenKeys)
{
    cache.info = [] { return ParseJson(R"({"node":["a",1]})"); };
    EXPECT_TRUE(cache.UpdateWithData(ParseJson(R"({"b":[null,0.5],"a":"ä"})"), 100, 103));
    EXPECT_EQ(ReadFile(path),
              R"({"begin_time_to_update":100,"cached_data":{"a":"ä","b":[null,0.5]},)"
              R"("finish_time_to_update":103,"info":{"node":["a",1]},"max_updated_time":3,)"
              R"("timeout":60,"updated_time":3.0})");
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("status.cached"));
}

TEST_F(CacheWritingTest, TimesAndTimeoutAreIntegersOf64Bits)
{
    using Limits = std::numeric_limits<std::int64_t>;
    const std::vector<std::int64_t> timeouts{Limits::max(), Limits::min(), 5'000'000'000, -1, 0};
    for (const std::int64_t timeout : timeouts) {
        const TestCache each = Another(false, 0, timeout);
        EXPECT_TRUE(each.UpdateWithData("data", 4'294'967'297, 4'294'967'299));
        EXPECT_TRUE(Same(Document()["timeout"], Json::Int64{timeout}));
        EXPECT_TRUE(Same(Document()["begin_time_to_update"], Json::Int64{4'294'967'297}));
        EXPECT_TRUE(Same(Document()["finish_time_to_update"], Json::Int64{4'294'967'299}));
        EXPECT_TRUE(Same(Document()["updated_time"], 2.0));
    }
}

TEST_F(CacheWritingTest, OneUnknownTimeMakesBothUnknown)
{
    constexpr std::int64_t Min = std::numeric_limits<std::int64_t>::min();
    struct Row {
        std::int64_t begin;
        std::int64_t finish;
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

TEST_F(CacheWritingTest, WithoutTimesZerosAreWrittenAndTheLongestRefreshStays)
{
    EXPECT_TRUE(cache.UpdateWithData("data", 100, 112));
    EXPECT_TRUE(cache.UpdateWithData("other"));
    EXPECT_EQ(ReadFile(path),
              R"({"begin_time_to_update":0,"cached_data":"other","finish_time_to_update":0,)"
              R"("info":"test cache","max_updated_time":12,"timeout":60,"updated_time":0.0})");
}

TEST_F(CacheWritingTest, TheLongestRefreshOnlyIncreases)
{
    struct Row {
        const char* before;
        std::int64_t took;
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

TEST_F(CacheWritingTest, KeepsTheLongestRefreshOfAFileItHasLoadedOrWritten)
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
TEST_F(CacheWritingTest, NoticesAnEditThatLeavesTheModificationTime)
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

TEST_F(CacheWritingTest, TakesTheLongestRefreshFromAFileChangedBySomebodyElse)
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

TEST_F(CacheWritingTest, AFailedWriteDoesNotChangeTheLongestRefresh)
{
    EXPECT_TRUE(cache.UpdateWithData("data", 100, 105));
    faults.rename = Failing(EROFS);
    EXPECT_FALSE(cache.UpdateWithData("data", 100, 109));
    faults.rename = nullptr;
    EXPECT_TRUE(cache.UpdateWithData("data"));
    ExpectLines({WroteNothing()});
    EXPECT_EQ(Document()["max_updated_time"], 5);
}

TEST_F(CacheWritingTest, RefusesInvalidDataAndLeavesTheFile)
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

TEST_F(CacheWritingTest, KeepsWhatItHasWrittenInMemory)
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

TEST_F(CacheWritingTest, WritingIsRetriedUpToTheLimit)
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

TEST_F(CacheWritingTest, AWriteThatSucceedsLaterEndsTheRetriesWithoutALogLine)
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

TEST_F(CacheWritingTest, ADirectoryInPlaceOfTheFileCannotBeReplaced)
{
    std::filesystem::create_directory(path);
    EXPECT_FALSE(cache.UpdateWithData("new"));
    ExpectPauses(1, ShortestWritePause);
    ExpectLines({WroteNothing()});
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("status.cached"));
}

TEST_F(CacheWritingTest, ReplacesWhatIsNoRegularFileByOne)
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

}  // namespace
