// What a cache loads from its file, and what it returns from memory.
#include <orvadrcore/cache.h>

#include <gmock/gmock.h>
#include <sys/stat.h>

#include <cerrno>
#include <ctime>
#include <filesystem>
#include <string>
#include <vector>

#include "support/fakes/global_locale.h"
#include "support/fixtures/cache_fixture.h"
#include "support/fixtures/json_kinds.h"
#include "support/fixtures/special_file.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

class CacheLoadTest : public CacheFixture {};

// ------------------------------------------------------------------------------------------- Load

TEST_F(CacheLoadTest, AMissingFileCannotBeLoaded)
{
    EXPECT_FALSE(cache.Load());
    ExpectLines({NoData()});
    EXPECT_EQ(CountOpened(path), 0U);
}

TEST_F(CacheLoadTest, AFileThatIsNoJsonDocumentCannotBeLoaded)
{
    for (const std::string& text : NoJsonTexts()) {
        SCOPED_TRACE(text);
        WriteFile(path, text);
        EXPECT_FALSE(cache.Load());
        ExpectLines({Unreadable()});
    }
}

TEST_F(CacheLoadTest, AFileThatCannotBeReadCannotBeLoaded)
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
TEST_F(CacheLoadTest, WhatIsNoRegularFileIsNotLoadedOrWaitedFor)
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
TEST_F(CacheLoadTest, LoadsWhatItHasWrittenInALocaleWithADecimalComma)
{
    const GlobalLocale locale(new CommaDecimals);
    EXPECT_TRUE(cache.UpdateWithData(1.234, 100, 103));
    const TestCache another = Another(false);
    EXPECT_TRUE(another.Load());
    EXPECT_EQ(another.GetCachedData(), 1.234);
    EXPECT_EQ(another.GetMaxUpdateTime(), 3);
}

TEST_F(CacheLoadTest, LoadsDataOfEveryType)
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
TEST_F(CacheLoadTest, ADocumentWithoutDataCountsAsLoadedAndLeavesTheDataInMemory)
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

TEST_F(CacheLoadTest, ADocumentWithoutDataLeavesTheInitialNull)
{
    WriteFile(path, "{}");
    cache.defaultValue = [] { return "default"; };
    EXPECT_EQ(cache.GetCachedData(), Json::Value());
}

TEST_F(CacheLoadTest, AFailedLoadKeepsDataAndTime)
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
TEST_F(CacheLoadTest, AFileThatIsReplacedWhileItIsReadIsReadAgain)
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

TEST_F(CacheLoadTest, ReturnsTheDefaultValueWithoutAFile)
{
    EXPECT_EQ(cache.GetCachedData(), Json::Value());
    ExpectLines({NoData(), UsesDefault()});
    cache.defaultValue = [] { return "default"; };
    EXPECT_EQ(cache.GetCachedData(), "default");
    ExpectLines({NoData(), UsesDefault()});
    EXPECT_THAT(cache.TakeCalls(), ElementsAre("GetDefaultValue", "GetDefaultValue"));
}

TEST_F(CacheLoadTest, ReturnsTheDefaultValueForAnUnreadableFileAndReadsItAgain)
{
    cache.defaultValue = [] { return "default"; };
    WriteFile(path, "{");
    for (int i = 0; i < 2; ++i) {
        EXPECT_EQ(cache.GetCachedData(), "default");
        ExpectLines({Unreadable(), UsesDefault()});
    }
    EXPECT_EQ(CountOpened(path), 2U);
}

TEST_F(CacheLoadTest, AnUnchangedFileIsReadOnce)
{
    WriteCache("data");
    EXPECT_EQ(cache.GetCachedData(), "data");
    EXPECT_EQ(cache.GetCachedData(), "data");
    EXPECT_EQ(CountOpened(path), 1U);
    EXPECT_THAT(cache.TakeCalls(), IsEmpty());
}

TEST_F(CacheLoadTest, ReadsTheFileAgainWhenItsModificationTimeHasChanged)
{
    WriteCache("first", Now);
    EXPECT_EQ(cache.GetCachedData(), "first");
    WriteCache("second", Now + 1);
    EXPECT_EQ(cache.GetCachedData(), "second");
    WriteCache("third", Now - 1);
    EXPECT_EQ(cache.GetCachedData(), "third");
}

// The contract: only the modification time counts, in whole seconds.
TEST_F(CacheLoadTest, DoesNotNoticeAChangeWithTheSameModificationTime)
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

TEST_F(CacheLoadTest, ReturnsACopy)
{
    WriteCache("data");
    cache.GetCachedData() = "changed";
    Json::Value data = cache.GetCachedData();
    data = "changed";
    EXPECT_EQ(cache.GetCachedData(), "data");
}

// The contract: the default value goes with the time of the last load.
TEST_F(CacheLoadTest, TheDefaultValueReplacesTheDataInMemory)
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

TEST_F(CacheLoadTest, TheLongestRefreshIsAnIntegerInTheFileOrZero)
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

TEST_F(CacheLoadTest, WithoutAFileTheLongestRefreshIsZero)
{
    EXPECT_EQ(cache.GetMaxUpdateTime(), 0);
    std::filesystem::create_directory(path);
    EXPECT_EQ(cache.GetMaxUpdateTime(), 0);
}

TEST_F(CacheLoadTest, TheLongestRefreshIsReadFromTheFileEachTime)
{
    WriteFile(path, R"({"cached_data":"data","max_updated_time":7})");
    SetModifyTime(path, Now);
    EXPECT_EQ(cache.GetMaxUpdateTime(), 7);
    WriteFile(path, R"({"cached_data":"other","max_updated_time":8})");
    SetModifyTime(path, Now);
    EXPECT_EQ(cache.GetMaxUpdateTime(), 8);
    EXPECT_EQ(cache.GetCachedData(), "other");  // nothing was loaded before
}

}  // namespace
