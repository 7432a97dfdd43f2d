// Reading: where a cache lies, when it is stale, what it returns. cache_update_test.cpp tests
// refreshing.
#include <orvadrcore/cache.h>

#include <gmock/gmock.h>
#include <sys/file.h>

#include <cerrno>
#include <filesystem>
#include <limits>
#include <type_traits>
#include <utility>

#include "support/fakes/global_locale.h"
#include "support/fixtures/cache_fixture.h"
#include "support/fixtures/json_kinds.h"
#include "support/fixtures/special_file.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"

namespace {

using OrvaDRCore::Cache;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

static_assert(std::is_abstract_v<Cache> && std::has_virtual_destructor_v<Cache>);

constexpr std::time_t Now = 1'700'000'000;

class CacheTest : public CacheFixture {
  protected:
    // From now on the clock stands still.
    void StopClock(std::time_t at = Now)
    {
        processes.time = [at] { return at; };
    }
};

// ------------------------------------------------------------------------------------------ names

TEST_F(CacheTest, ThePathIsDirectorySlashNameAndSuffix)
{
    struct Row {
        std::string dir;
        std::string file;
        std::string path;
    };
    const std::vector<Row> table = {
        {dir.Path(), "b", dir.File("b.cached")},
        {dir.Path(), "b.cached", dir.File("b.cached.cached")},
        {dir.Path(), " %s", dir.File(" %s.cached")},
        {dir.Path() + "/", "b", dir.Path() + "//b.cached"},
    };
    for (const Row& row : table) {
        EXPECT_FALSE(TestCache(row.dir, row.file, Timeout, false, 0).Load());
        ExpectLines({Debug("Load", "no data is cached in [" + row.path + "]")});
    }
}

TEST_F(CacheTest, ConstructionNeitherOpensNorMakesAFile)
{
    WriteCache("old");
    ForgetOpened();
    TestCache another = Another(true);
    EXPECT_EQ(CountOpened(path), 0U);
    EXPECT_THAT(another.TakeCalls(), IsEmpty());
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("status.cached"));
}

TEST_F(CacheTest, MakesAMissingDirectoryWithItsParents)
{
    const Umask umask(0077);
    const TestCache made(dir.File("a/b"), "c", Timeout, false, 0);
    EXPECT_EQ(ModeOf(dir.File("a/b")), 0755U);
    EXPECT_THAT(NamesIn(dir.File("a/b")), IsEmpty());
}

TEST_F(CacheTest, LeavesAnExistingDirectoryAsItIs)
{
    ASSERT_EQ(ModeOf(dir.Path()), 0700U);
    EXPECT_FALSE(cache.Load());
    ExpectLines({NoData()});
    EXPECT_EQ(ModeOf(dir.Path()), 0700U);
}

TEST_F(CacheTest, WithoutADirectoryOrANameItUsesTheDefaultPath)
{
    struct Row {
        std::string dir;
        std::string file;
    };
    for (const Row& row : {Row{"", "b"}, Row{dir.File("a"), ""}, Row{"", ""}}) {
        const TestCache homeless(row.dir, row.file, Timeout, false, 0);
        EXPECT_FALSE(homeless.Load());
        ExpectLines({Warn("GetCachedPath",
                          "Invalid dir[" + row.dir + "] and file[" + row.file + "] to cache"),
                     Debug("Load", "no data is cached in [/tmp/default_dr_cache]")});
    }
    EXPECT_FALSE(std::filesystem::exists(dir.File("a")));
}

TEST_F(CacheTest, WithADirectoryThatCannotBeMadeItUsesTheDefaultPath)
{
    faults.spawn = FailingToStart(EACCES);
    const TestCache homeless(dir.File("a"), "b", Timeout, false, 0);
    EXPECT_FALSE(homeless.Load());
    ExpectLines({Err("CreateDir", "Failed to create dir [" + dir.File("a") + "] with mode [755]")
                     .In("file.cpp"),
                 Err("GetCachedPath", "Failed to create [" + dir.File("a") + "]"),
                 Debug("Load", "no data is cached in [/tmp/default_dr_cache]")});
}

TEST_F(CacheTest, AFileInPlaceOfTheDirectoryIsAFailure)
{
    WriteFile(dir.File("a"), "");
    const TestCache homeless(dir.File("a"), "b", Timeout, false, 0);
    ExpectLines({Err("CreateDir", "Failed to create dir [" + dir.File("a") + "] with mode [755]")
                     .In("file.cpp"),
                 Err("GetCachedPath", "Failed to create [" + dir.File("a") + "]")});
}

// The contract: they share the lock and the pid file, too.
TEST_F(CacheTest, AllCachesWithTheDefaultPathShareOneFile)
{
    const std::string lock = "/tmp/.orvadr_lock//tmp/default_dr_cache.lock";
    std::filesystem::create_directories(std::filesystem::path(Place(lock)).parent_path());
    WriteFile(Place(lock), "");
    WriteFile(Place("/tmp/default_dr_cache"), R"({"cached_data":"shared"})");
    WriteFile(Place("/tmp/default_dr_cache.pid"), std::to_string(::getpid()));
    faults.spawn = FailingToStart(EACCES);
    TestCache nameless(dir.Path(), "", Timeout, false, 0);
    TestCache homeless(dir.File("a"), "b", Timeout, false, 0);
    EXPECT_EQ(TakeLines().size(), 3U);
    for (TestCache* each : {&nameless, &homeless}) {
        EXPECT_EQ(each->GetCachedData(), "shared");
        ForgetOpened();
        EXPECT_TRUE(each->Update());  // somebody refreshes
        EXPECT_EQ(CountOpened(lock), 1U);
        EXPECT_EQ(CountOpened("/tmp/default_dr_cache.pid"), 1U);
        EXPECT_EQ(each->CountCalls("GetUpdatedData"), 0U);
    }
}

// ----------------------------------------------------------------------------------------- copies

TEST_F(CacheTest, ACopySharesTheFileAndHasItsOwnMemory)
{
    WriteCache("first", Now);
    EXPECT_EQ(cache.GetCachedData(), "first");
    const TestCache copy = cache;
    ForgetOpened();
    EXPECT_EQ(copy.GetCachedData(), "first");
    EXPECT_EQ(CountOpened(path), 0U);

    EXPECT_TRUE(cache.UpdateWithData("second"));
    SetModifyTime(path, Now);
    EXPECT_EQ(copy.GetCachedData(), "first");
    SetModifyTime(path, Now + 1);
    EXPECT_EQ(copy.GetCachedData(), "second");
}

TEST_F(CacheTest, AssignmentTakesFileAndSettingsOfTheOther)
{
    WriteCache("data", Now);
    TestCache other(dir.Path(), "other", 1, true, 0);
    EXPECT_FALSE(other.Load());
    ExpectLines({Debug("Load", "no data is cached in [" + dir.File("other.cached") + "]")});
    other = cache;
    EXPECT_TRUE(other.Load());
    EXPECT_EQ(other.GetCachedData(), "data");
    EXPECT_FALSE(other.IsUpdatedDataRequired());
}

TEST_F(CacheTest, ACacheThatWasMovedFromStillWorks)
{
    WriteCache("data", Now);
    EXPECT_EQ(cache.GetCachedData(), "data");
    const TestCache moved = std::move(cache);
    EXPECT_EQ(moved.GetCachedData(), "data");
    EXPECT_EQ(cache.GetCachedData(), "data");  // NOLINT(bugprone-use-after-move): the promise
}

// -------------------------------------------------------------------------------------- IsTimeout

TEST_F(CacheTest, AFileOlderThanTheTimeoutIsStale)
{
    struct Row {
        long timeout;
        long age;
        bool isTimeout;
    };
    const std::vector<Row> table = {
        {60, 0, false},
        {60, 59, false},
        {60, 60, false},
        {60, 61, true},
        {60, -1000, false},  // modified in the future
        {0, 0, false},
        {0, 1, true},
        {-1, 0, true},
        {-1, -1, false},
        {-1, -2, false},
        {1'000'000'000, 1'000'000'000, false},
        {1'000'000'000, 1'000'000'001, true},
        {5'000'000'000, Now, false},
        {std::numeric_limits<long>::max(), Now, false},
        {std::numeric_limits<long>::min(), -1'000'000, true},
    };
    StopClock();
    WriteCache("data");
    for (const Row& row : table) {
        SCOPED_TRACE(std::to_string(row.timeout) + ", " + std::to_string(row.age));
        SetModifyTime(path, Now - row.age);
        EXPECT_EQ(Another(false, 0, row.timeout).IsTimeout(), row.isTimeout);
    }
}

TEST_F(CacheTest, FractionsOfASecondDoNotCount)
{
    StopClock();
    WriteCache("data");
    SetModifyTime(path, Now - Timeout, 999'999'999);
    EXPECT_FALSE(cache.IsTimeout());
    SetModifyTime(path, Now - Timeout - 1, 999'999'999);
    EXPECT_TRUE(cache.IsTimeout());
}

// A missing file has the time -1, so its age is the time of day plus one second.
TEST_F(CacheTest, AMissingFileIsStale)
{
    StopClock();
    EXPECT_TRUE(cache.IsTimeout());
    EXPECT_TRUE(Another(false, 0, 0).IsTimeout());
    EXPECT_TRUE(Another(false, 0, Now).IsTimeout());
    EXPECT_FALSE(Another(false, 0, Now + 1).IsTimeout());
}

TEST_F(CacheTest, WithoutAClockEveryFileIsStale)
{
    StopClock(-1);
    WriteCache("data", Now);
    EXPECT_TRUE(cache.IsTimeout());
    EXPECT_TRUE(Another(false, 0, std::numeric_limits<long>::max()).IsTimeout());
}

TEST_F(CacheTest, TimesInTheFileDoNotCount)
{
    StopClock();
    WriteFile(path, R"({"timeout":1,"finish_time_to_update":5,"cached_data":1})");
    SetModifyTime(path, Now - Timeout);
    EXPECT_FALSE(cache.IsTimeout());
    WriteFile(path, R"({"timeout":9000000,"finish_time_to_update":1700000000,"cached_data":1})");
    SetModifyTime(path, Now - Timeout - 1);
    EXPECT_TRUE(cache.IsTimeout());
}

TEST_F(CacheTest, ADirectoryInPlaceOfTheFileHasAnAge)
{
    StopClock();
    std::filesystem::create_directory(path);
    SetModifyTime(path, Now - Timeout);
    EXPECT_FALSE(cache.IsTimeout());
}

// ------------------------------------------------------------------------------------------- Load

TEST_F(CacheTest, AMissingFileCannotBeLoaded)
{
    EXPECT_FALSE(cache.Load());
    ExpectLines({NoData()});
    EXPECT_EQ(CountOpened(path), 0U);
}

TEST_F(CacheTest, AFileThatIsNoJsonDocumentCannotBeLoaded)
{
    for (const std::string& text : NoJsonTexts()) {
        SCOPED_TRACE(text);
        WriteFile(path, text);
        EXPECT_FALSE(cache.Load());
        ExpectLines({Unreadable()});
    }
}

TEST_F(CacheTest, AFileThatCannotBeReadCannotBeLoaded)
{
    std::filesystem::create_directory(path);
    EXPECT_FALSE(cache.Load());
    ExpectLines({Unreadable()});

    std::filesystem::remove(path);
    WriteCache("data");
    for (const int error : {EACCES, EMFILE, ENOENT}) {
        faults.open = Failing(error);
        EXPECT_FALSE(cache.Load());
        ExpectLines({Unreadable()});
    }
    faults.open = nullptr;
    faults.read = Failing(EIO);
    EXPECT_FALSE(cache.Load());
    ExpectLines({Unreadable()});
}

// The default path lies in /tmp, where anybody can put such a thing.
TEST_F(CacheTest, WhatIsNoRegularFileIsNotLoadedOrWaitedFor)
{
    for (const SpecialFile::Kind kind : SpecialFile::Kinds()) {
        const SpecialFile special(kind, path, R"({"cached_data":1,"max_updated_time":7})");
        CheckInChild([&] {
            SCOPED_TRACE(kind);
            EXPECT_FALSE(cache.Load());
            ExpectLines({Unreadable()});
            EXPECT_EQ(cache.GetCachedData(), Json::Value());
            ExpectLines({Unreadable(), UsesDefault()});
            EXPECT_EQ(cache.GetMaxUpdateTime(), 0);
        });
    }
}

// Every document holds a real number: the duration of the refresh.
TEST_F(CacheTest, LoadsWhatItHasWrittenInALocaleWithADecimalComma)
{
    const GlobalLocale locale(new CommaDecimals);
    EXPECT_TRUE(cache.UpdateWithData(1.234, 100, 103));
    const TestCache another = Another(false);
    EXPECT_TRUE(another.Load());
    EXPECT_EQ(another.GetCachedData(), 1.234);
    EXPECT_EQ(another.GetMaxUpdateTime(), 3);
}

TEST_F(CacheTest, LoadsDataOfEveryType)
{
    std::time_t modifyTime = Now;
    for (const JsonKind& kind : JsonKinds()) {
        WriteFile(path, R"({"cached_data":)" + kind.text + "}");
        SetModifyTime(path, ++modifyTime);
        EXPECT_TRUE(cache.Load());
        EXPECT_TRUE(Same(cache.GetCachedData(), kind.value));
    }
}

// The contract.
TEST_F(CacheTest, ADocumentWithoutDataCountsAsLoadedAndLeavesTheDataInMemory)
{
    WriteCache("old", Now);
    EXPECT_TRUE(cache.Load());
    std::time_t modifyTime = Now;
    for (const std::string text : {"{}", R"({"data":1,"info":{"cached_data":2}})", "[]",
                                   R"(["cached_data"])", "null", "5", R"("cached_data")", "true"}) {
        SCOPED_TRACE(text);
        WriteFile(path, text);
        SetModifyTime(path, ++modifyTime);
        EXPECT_TRUE(cache.Load());
        ForgetOpened();
        EXPECT_EQ(cache.GetCachedData(), "old");
        EXPECT_EQ(CountOpened(path), 0U);
    }
    EXPECT_EQ(cache.CountCalls("GetDefaultValue"), 0U);
}

TEST_F(CacheTest, ADocumentWithoutDataLeavesTheInitialNull)
{
    WriteFile(path, "{}");
    cache.defaultValue = [] { return "default"; };
    EXPECT_EQ(cache.GetCachedData(), Json::Value());
}

TEST_F(CacheTest, AFailedLoadKeepsDataAndTime)
{
    WriteCache("old", Now);
    EXPECT_TRUE(cache.Load());
    WriteFile(path, "garbage");
    SetModifyTime(path, Now + 1);
    EXPECT_FALSE(cache.Load());
    ExpectLines({Unreadable()});
    SetModifyTime(path, Now);
    EXPECT_EQ(cache.GetCachedData(), "old");

    std::filesystem::remove(path);
    EXPECT_FALSE(cache.Load());
    ExpectLines({NoData()});
    WriteFile(path, "garbage");
    SetModifyTime(path, Now);
    EXPECT_EQ(cache.GetCachedData(), "old");
}

// Load() takes the time before it reads, so that a write in between is noticed.
TEST_F(CacheTest, AFileThatIsReplacedWhileItIsReadIsReadAgain)
{
    WriteCache("old", Now);
    faults.open = [this](const char* name, int flags, mode_t mode) {
        const int fd = RealOpen(name, flags, mode);
        faults.open = nullptr;
        std::filesystem::remove(path);
        WriteCache("new", Now + 1);
        return fd;
    };
    EXPECT_EQ(cache.GetCachedData(), "old");
    EXPECT_EQ(cache.GetCachedData(), "new");
}

// ---------------------------------------------------------------------------------- GetCachedData

TEST_F(CacheTest, ReturnsTheDefaultValueWithoutAFile)
{
    EXPECT_EQ(cache.GetCachedData(), Json::Value());
    ExpectLines({NoData(), UsesDefault()});
    cache.defaultValue = [] { return "default"; };
    EXPECT_EQ(cache.GetCachedData(), "default");
    ExpectLines({NoData(), UsesDefault()});
    EXPECT_THAT(cache.TakeCalls(), ElementsAre("GetDefaultValue", "GetDefaultValue"));
}

TEST_F(CacheTest, ReturnsTheDefaultValueForAnUnreadableFileAndReadsItAgain)
{
    cache.defaultValue = [] { return "default"; };
    WriteFile(path, "{");
    for (int i = 0; i < 2; ++i) {
        EXPECT_EQ(cache.GetCachedData(), "default");
        ExpectLines({Unreadable(), UsesDefault()});
    }
    EXPECT_EQ(CountOpened(path), 2U);
}

TEST_F(CacheTest, AnUnchangedFileIsReadOnce)
{
    WriteCache("data");
    EXPECT_EQ(cache.GetCachedData(), "data");
    EXPECT_EQ(cache.GetCachedData(), "data");
    EXPECT_EQ(CountOpened(path), 1U);
    EXPECT_THAT(cache.TakeCalls(), IsEmpty());
}

TEST_F(CacheTest, ReadsTheFileAgainWhenItsModificationTimeHasChanged)
{
    WriteCache("first", Now);
    EXPECT_EQ(cache.GetCachedData(), "first");
    WriteCache("second", Now + 1);
    EXPECT_EQ(cache.GetCachedData(), "second");
    WriteCache("third", Now - 1);
    EXPECT_EQ(cache.GetCachedData(), "third");
}

// The contract: only the modification time counts, in whole seconds.
TEST_F(CacheTest, DoesNotNoticeAChangeWithTheSameModificationTime)
{
    WriteCache("data", Now);
    EXPECT_EQ(cache.GetCachedData(), "data");
    for (const std::string text : {R"({"cached_data":"other"})", "garbage", ""}) {
        WriteFile(path, text);
        SetModifyTime(path, Now, 999'999'999);
        EXPECT_EQ(cache.GetCachedData(), "data");
    }
    EXPECT_EQ(CountOpened(path), 1U);
}

TEST_F(CacheTest, ReturnsACopy)
{
    WriteCache("data");
    cache.GetCachedData() = "changed";
    Json::Value data = cache.GetCachedData();
    data = "changed";
    EXPECT_EQ(cache.GetCachedData(), "data");
}

// The contract: the default value goes with the time of the last load.
TEST_F(CacheTest, TheDefaultValueReplacesTheDataInMemory)
{
    cache.defaultValue = [] { return "default"; };
    WriteCache("data", Now);
    EXPECT_EQ(cache.GetCachedData(), "data");
    std::filesystem::remove(path);
    EXPECT_EQ(cache.GetCachedData(), "default");
    ExpectLines({NoData(), UsesDefault()});
    WriteCache("data", Now);
    EXPECT_EQ(cache.GetCachedData(), "default");
    SetModifyTime(path, Now + 1);
    EXPECT_EQ(cache.GetCachedData(), "data");
}

// ------------------------------------------------------------------------------- GetMaxUpdateTime

TEST_F(CacheTest, TheLongestRefreshIsAnIntegerInTheFileOrZero)
{
    struct Row {
        std::string text;
        int seconds;
    };
    const std::vector<Row> table = {
        {R"({"max_updated_time":7})", 7},
        {R"({"max_updated_time":0})", 0},
        {R"({"max_updated_time":-3})", -3},
        {R"({"max_updated_time":2147483647})", 2147483647},
        {R"({"max_updated_time":2147483648})", 0},
        {R"({"max_updated_time":9223372036854775807})", 0},
        {R"({"max_updated_time":3.0})", 0},  // a real number: the contract
        {R"({"max_updated_time":3.5})", 0},
        {R"({"max_updated_time":"3"})", 0},
        {R"({"max_updated_time":true})", 0},
        {R"({"max_updated_time":null})", 0},
        {R"({"max_updated_time":[3]})", 0},
        {R"({"max_updated_time":{"max_updated_time":3}})", 0},
        {R"({"updated_time":3,"cached_data":{"max_updated_time":3}})", 0},
        {"{}", 0},
        {"null", 0},
        {"[3]", 0},
        {"3", 0},
        {R"("max_updated_time")", 0},
        {R"({"max_updated_time":7)", 0},
        {"", 0},
    };
    for (const Row& row : table) {
        WriteFile(path, row.text);
        EXPECT_EQ(cache.GetMaxUpdateTime(), row.seconds) << row.text;
    }
}

TEST_F(CacheTest, WithoutAFileTheLongestRefreshIsZero)
{
    EXPECT_EQ(cache.GetMaxUpdateTime(), 0);
    std::filesystem::create_directory(path);
    EXPECT_EQ(cache.GetMaxUpdateTime(), 0);
}

TEST_F(CacheTest, TheLongestRefreshIsReadFromTheFileEachTime)
{
    WriteFile(path, R"({"cached_data":"data","max_updated_time":7})");
    SetModifyTime(path, Now);
    EXPECT_EQ(cache.GetMaxUpdateTime(), 7);
    WriteFile(path, R"({"cached_data":"other","max_updated_time":8})");
    SetModifyTime(path, Now);
    EXPECT_EQ(cache.GetMaxUpdateTime(), 8);
    EXPECT_EQ(cache.GetCachedData(), "other");  // nothing was loaded before
}

// -------------------------------------------------------------------------- IsUpdatedDataRequired

TEST_F(CacheTest, FreshDataIsRequiredByTheConstructorOrByInvalidData)
{
    WriteCache("data");
    for (const bool updatedRequired : {false, true}) {
        for (const bool valid : {false, true}) {
            TestCache each = Another(updatedRequired);
            each.isValid = [valid](const Json::Value& data) {
                EXPECT_EQ(data, "data");
                return valid;
            };
            EXPECT_EQ(each.IsUpdatedDataRequired(), updatedRequired || !valid);
            EXPECT_EQ(each.CountCalls("IsValidData"), updatedRequired ? 0U : 1U);
        }
    }
}

TEST_F(CacheTest, WithoutAFileFreshDataIsRequiredUnlessTheDefaultIsValid)
{
    EXPECT_TRUE(cache.IsUpdatedDataRequired());
    ExpectLines({NoData(), UsesDefault()});
    cache.defaultValue = [] { return "default"; };
    EXPECT_FALSE(cache.IsUpdatedDataRequired());
    ExpectLines({NoData(), UsesDefault()});
}

// ------------------------------------------------------------------------------------------- Read

TEST_F(CacheTest, ReturnsFreshDataWithoutARefresh)
{
    WriteCache("data");
    for (const bool updatedRequired :
         {false, true}) {  // the constructor's flag does not make it stale
        TestCache each = Another(updatedRequired);
        each.isValid = [](const Json::Value& data) {
            EXPECT_EQ(data, "data");
            return true;
        };
        each.isNeedUpdate = [](const Json::Value& data) {
            EXPECT_EQ(data, "data");
            return false;
        };
        EXPECT_EQ(each.Read(), "data");
        EXPECT_THAT(each.TakeCalls(), ElementsAre("IsValidData", "IsNeedUpdate"));
    }
    EXPECT_EQ(CountOpened(lockPath), 0U);
    EXPECT_EQ(CountOpened(pidPath), 0U);
}

TEST_F(CacheTest, AValidDefaultValueIsStillTooOld)
{
    FailForks(EAGAIN);
    cache.defaultValue = [] { return "default"; };
    EXPECT_EQ(cache.Read(), "default");
    ExpectLines({NoData(), UsesDefault(), NoData(), UsesDefault(),
                 Warn("Update", "Failed to fork(). errno=[11/Resource temporarily unavailable]"),
                 UsesOldData()});
}

// Age, validity and need are checked in this order, up to the first that says stale. Only then is it
// asked whether the caller must wait.
TEST_F(CacheTest, TheFirstReasonForARefreshEndsTheChecks)
{
    struct Row {
        const char* what;
        long age;
        bool isValid;
        bool isNeedUpdate;
        std::vector<std::string> asked;
    };
    const std::vector<Row> table = {
        {"fresh", 0, true, false, {"IsValidData", "IsNeedUpdate"}},
        {"old", 2 * Timeout, true, false, {"IsUpdatedDataRequired", "GetInfo"}},
        {"old and all else", 2 * Timeout, false, true, {"IsUpdatedDataRequired", "GetInfo"}},
        {"invalid", 0, false, false, {"IsValidData", "IsUpdatedDataRequired", "GetInfo"}},
        {"invalid and unwanted",
         0,
         false,
         true,
         {"IsValidData", "IsUpdatedDataRequired", "GetInfo"}},
        {"unwanted",
         0,
         true,
         true,
         {"IsValidData", "IsNeedUpdate", "IsUpdatedDataRequired", "GetInfo"}},
    };
    FailForks(EAGAIN);
    StopClock();
    for (const Row& row : table) {
        SCOPED_TRACE(row.what);
        WriteCache("data", Now - row.age);
        cache.isValid = [&](const Json::Value&) { return row.isValid; };
        cache.isNeedUpdate = [&](const Json::Value&) { return row.isNeedUpdate; };
        cache.isRequired = [] { return false; };
        EXPECT_EQ(cache.Read(), "data");
        EXPECT_EQ(cache.TakeCalls(), row.asked);
        if (row.asked.back() == "GetInfo") {
            ExpectLines(
                {Warn("Update", "Failed to fork(). errno=[11/Resource temporarily unavailable]"),
                 UsesOldData()});
        }
    }
}

TEST_F(CacheTest, ReadReturnsTheDataFromBeforeAFailedRefresh)
{
    TestCache waiting = Another(true);
    waiting.info = [] { return ParseJson(R"({"node":["%s",3.0]})"); };
    WriteStale("old");
    waiting.produce = [this](const Json::Value&) {
        WriteCache("by somebody else");
        return false;
    };
    EXPECT_EQ(waiting.Read(), "old");
    ExpectLines(
        {Start(),
         Debug("DoUpdate", R"(Failed to get updated cache [{"node":["%s",3.0]}] and reach the )"
                           "retry limit[0]"),
         Finish(),
         Debug("Read", R"(Failed to update cache [{"node":["%s",3.0]}], use old cache data.)")});
    ExpectPauses(1, 500'000);
    EXPECT_EQ(waiting.GetCachedData(), "by somebody else");
}

TEST_F(CacheTest, ReadReturnsTheDataFromAfterTheRefresh)
{
    WriteStale("old");
    cache.isRequired = [] { return true; };
    cache.produce = [](Json::Value& data) {
        data = "new";
        return true;
    };
    EXPECT_EQ(cache.Read(), "new");
    ExpectLines({Start(), Finish()});
}

TEST_F(CacheTest, FreshDataInMemoryTakesOneStat)
{
    WriteCache("data");
    EXPECT_EQ(cache.Read(), "data");
    std::size_t looks = 0;
    faults.stat = [&](const char* name, struct stat* status) {
        if (name == path) ++looks;
        return RealStat(name, status);
    };
    EXPECT_EQ(cache.Read(), "data");
    EXPECT_EQ(looks, 1U);
    EXPECT_EQ(cache.View(), "data");
    EXPECT_EQ(looks, 2U);
    EXPECT_EQ(CountOpened(path), 1U);
}

// ------------------------------------------------------------------------------------------- View

TEST_F(CacheTest, AViewOfFreshDataIsTheDataInMemory)
{
    WriteCache("data");
    const Json::Value& first = cache.View();
    EXPECT_EQ(first, "data");
    EXPECT_THAT(cache.TakeCalls(), ElementsAre("IsValidData", "IsNeedUpdate"));
    EXPECT_EQ(&cache.View(), &first);
    EXPECT_EQ(CountOpened(path), 1U);
    EXPECT_EQ(CountOpened(lockPath), 0U);
}

TEST_F(CacheTest, AViewCopiesNothing)
{
    WriteCache("data");
    const char* const text = cache.View().asCString();
    EXPECT_EQ(cache.View().asCString(), text);
    EXPECT_EQ(cache.Read(), "data");
    EXPECT_EQ(cache.View().asCString(), text);
    const void* seen = nullptr;
    cache.isValid = [&](const Json::Value& data) {
        seen = &data;
        return true;
    };
    const void* given = &cache.View();
    EXPECT_EQ(seen, given);
}

TEST_F(CacheTest, AViewOfAChangedFileShowsTheNewData)
{
    StopClock();
    WriteCache("first", Now);
    EXPECT_EQ(cache.View(), "first");
    WriteCache("second", Now - 1);
    EXPECT_EQ(cache.View(), "second");
}

TEST_F(CacheTest, AViewDecidesAsReadDoes)
{
    FailForks(EAGAIN);
    StopClock();
    struct Row {
        long age;
        bool isValid;
        bool isNeedUpdate;
    };
    for (const Row& row : {Row{0, true, false}, Row{2 * Timeout, true, false}, Row{0, false, false},
                           Row{0, true, true}}) {
        WriteCache("data", Now - row.age);
        cache.isValid = [&](const Json::Value&) { return row.isValid; };
        cache.isNeedUpdate = [&](const Json::Value&) { return row.isNeedUpdate; };
        cache.isRequired = [] { return false; };
        EXPECT_EQ(cache.Read(), "data");
        const std::vector<std::string> asked = cache.TakeCalls();
        const std::size_t lines = TakeLines().size();
        EXPECT_EQ(cache.View(), "data");
        EXPECT_EQ(cache.TakeCalls(), asked);
        if (lines > 0) {
            ExpectLines(
                {Warn("Update", "Failed to fork(). errno=[11/Resource temporarily unavailable]"),
                 Debug("View", R"(Failed to update cache ["test cache"], use old cache data.)")});
        }
    }
}

TEST_F(CacheTest, AViewMayShowTheDefaultValue)
{
    FailForks(EAGAIN);
    cache.defaultValue = [] { return "default"; };
    cache.isRequired = [] { return false; };
    const Json::Value& data = cache.View();
    EXPECT_EQ(data, "default");
    ExpectLines({NoData(), UsesDefault(),
                 Warn("Update", "Failed to fork(). errno=[11/Resource temporarily unavailable]"),
                 Debug("View", R"(Failed to update cache ["test cache"], use old cache data.)")});
    EXPECT_EQ(data, "default");
}

TEST_F(CacheTest, AViewShowsTheDataFromAfterTheRefresh)
{
    WriteStale("old");
    cache.isRequired = [] { return true; };
    EXPECT_EQ(cache.View(), "new");
    ExpectLines({Start(), Finish()});
}

TEST_F(CacheTest, AViewShowsTheDataInMemoryWhenTheRefreshFails)
{
    TestCache waiting = Another(true);
    WriteStale("old");
    waiting.produce = [this](const Json::Value&) {
        WriteCache("by somebody else");
        return false;
    };
    EXPECT_EQ(waiting.View(), "old");  // not loaded again
    EXPECT_EQ(TakeLines().size(), 4U);

    WriteStale("old");
    waiting.produce = [&](const Json::Value&) {
        WriteCache("by somebody else");
        EXPECT_EQ(waiting.GetCachedData(), "by somebody else");
        return false;
    };
    EXPECT_EQ(waiting.View(), "by somebody else");
    EXPECT_EQ(TakeLines().size(), 4U);
}

// ----------------------------------------------------------------------------------------- Remove

TEST_F(CacheTest, RemoveDeletesTheCacheFileAndNothingElse)
{
    WriteCache("data", Now);
    WriteFile(pidPath, "1\n");
    EXPECT_EQ(cache.GetCachedData(), "data");
    EXPECT_EQ(cache.Remove(), 0);
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("status.cached.pid"));
    EXPECT_TRUE(std::filesystem::exists(lockFile));

    WriteFile(path, "garbage");  // data and time in memory stay
    SetModifyTime(path, Now);
    EXPECT_EQ(cache.GetCachedData(), "data");
}

TEST_F(CacheTest, RemoveOfAMissingFileFails)
{
    errno = 0;
    EXPECT_EQ(cache.Remove(), -1);
    EXPECT_EQ(errno, ENOENT);
}

TEST_F(CacheTest, AfterRemoveTheDefaultValueIsReturned)
{
    WriteCache("data");
    EXPECT_EQ(cache.GetCachedData(), "data");
    EXPECT_EQ(cache.Remove(), 0);
    EXPECT_TRUE(cache.IsTimeout());
    EXPECT_EQ(cache.GetCachedData(), Json::Value());
    ExpectLines({NoData(), UsesDefault()});
}

}  // namespace
