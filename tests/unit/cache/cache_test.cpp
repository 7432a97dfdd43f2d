// Where a cache is stored, copies of the object, and its removal.
#include <orvadrcore/cache.h>

#include <gmock/gmock.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include "support/fixtures/cache_fixture.h"
#include "support/fixtures/test_files.h"

namespace {

using OrvaDRCore::Cache;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

static_assert(std::is_abstract_v<Cache> && std::has_virtual_destructor_v<Cache>);

class CacheTest : public CacheFixture {};

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
