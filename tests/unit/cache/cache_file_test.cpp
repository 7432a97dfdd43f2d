// The cache file by itself, without a Cache around it.
#include "cache/cache_file.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <cstdint>
#include <filesystem>
#include <limits>

#include "support/fakes/syscall_faults.h"
#include "support/fixtures/json_kinds.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"

namespace {

using OrvaDRCore::CacheDocument;
using OrvaDRCore::CacheFile;
using OrvaDRCore::IsStorable;
using Result = OrvaDRCore::CacheFile::LoadResult;

constexpr std::time_t SomeTime = 1'700'000'000;

class CacheFileTest : public ::testing::Test {
  protected:
    CacheDocument Compose(const Json::Value& data, std::int64_t begin = 100,
                          std::int64_t finish = 103) const
    {
        return file.Compose({60, "info", data, begin, finish});
    }

    TempDir dir;
    SyscallFaults faults;
    const std::string path = dir.File("status.cached");
    CacheFile file{path};
};

TEST_F(CacheFileTest, BeginsWithNullInMemoryAndNoFileLoaded)
{
    EXPECT_EQ(file.GetPath(), path);
    EXPECT_EQ(file.GetData(), Json::Value());
    EXPECT_EQ(file.GetModifyTime(), -1);
    EXPECT_FALSE(file.IsLoaded(-1));
    EXPECT_FALSE(file.IsLoaded(SomeTime));
}

TEST_F(CacheFileTest, LoadsTheDataTogetherWithTheModificationTime)
{
    WriteFile(path, R"({"cached_data":"data"})");
    SetModifyTime(path, SomeTime, 999'999'999);
    EXPECT_EQ(file.GetModifyTime(), SomeTime);
    EXPECT_EQ(file.Load(), Result::Loaded);
    EXPECT_EQ(file.GetData(), "data");
    EXPECT_TRUE(file.IsLoaded(SomeTime));
    EXPECT_FALSE(file.IsLoaded(SomeTime + 1));
}

TEST_F(CacheFileTest, LeavesMemoryAsItWasWhenTheFileCannotBeLoaded)
{
    WriteFile(path, R"({"cached_data":"data"})");
    SetModifyTime(path, SomeTime);
    EXPECT_EQ(file.Load(), Result::Loaded);
    WriteFile(path, "garbage");
    EXPECT_EQ(file.Load(), Result::Unreadable);
    std::filesystem::remove(path);
    EXPECT_EQ(file.Load(), Result::Missing);
    EXPECT_EQ(file.GetData(), "data");
    EXPECT_TRUE(file.IsLoaded(SomeTime));
}

TEST_F(CacheFileTest, KeepsTheOldDataWhenTheDocumentHasNone)
{
    file.SetData("old");
    WriteFile(path, "{}");
    EXPECT_EQ(file.Load(), Result::Loaded);
    EXPECT_EQ(file.GetData(), "old");
}

TEST_F(CacheFileTest, ComposesTheDocumentThatWriteStores)
{
    CacheDocument document = Compose("data");
    EXPECT_EQ(document.text,
              R"({"begin_time_to_update":100,"cached_data":"data","finish_time_to_update":103,)"
              R"("info":"info","max_updated_time":3,"timeout":60,"updated_time":3.0})");
    EXPECT_EQ(document.longestRefresh, 3);
    EXPECT_FALSE(std::filesystem::exists(path));

    const std::string text = document.text;
    EXPECT_TRUE(file.Write(document));
    EXPECT_EQ(ReadFile(path), text);
    EXPECT_EQ(file.GetData(), "data");
    EXPECT_TRUE(file.IsLoaded(file.GetModifyTime()));
    EXPECT_EQ(file.GetLongestRefresh(), 3);
}

TEST_F(CacheFileTest, CountsBothTimesAsUnknownWhenOneIs)
{
    for (const CacheDocument& document : {Compose("data", 0, 103), Compose("data", 100, -1)}) {
        EXPECT_EQ(document.value["begin_time_to_update"], 0);
        EXPECT_EQ(document.value["finish_time_to_update"], 0);
        EXPECT_TRUE(Same(document.value["updated_time"], 0.0));
    }
}

TEST_F(CacheFileTest, KeepsTheLongestRefreshOfTheFile)
{
    WriteFile(path, R"({"max_updated_time":7})");
    EXPECT_EQ(Compose("data").longestRefresh, 7);
    EXPECT_EQ(Compose("data", 100, 108).longestRefresh, 8);
}

TEST_F(CacheFileTest, AWriteThatFailedCanBeRepeated)
{
    WriteFile(path, R"({"cached_data":"old"})");
    EXPECT_EQ(file.Load(), Result::Loaded);
    CacheDocument document = Compose("new");
    faults.fsync = Failing(EIO);
    EXPECT_FALSE(file.Write(document));
    EXPECT_EQ(file.GetData(), "old");
    EXPECT_EQ(ReadFile(path), R"({"cached_data":"old"})");
    faults.Clear();
    EXPECT_TRUE(file.Write(document));
    EXPECT_EQ(file.GetData(), "new");
}

// As large file systems and network file systems number them.
TEST_F(CacheFileTest, TellsInodesApartThatDifferIn32HighBits)
{
    WriteFile(path, "{}");
    std::uint64_t inode = 7;
    faults.stat = [&](const char* name, struct stat* status) {
        const int result = RealStat(name, status);
        status->st_ino = inode;
        return result;
    };
    const auto before = file.GetVersion();
    EXPECT_TRUE(before == file.GetVersion());
    inode += std::uint64_t{1} << 32U;
    EXPECT_FALSE(before == file.GetVersion());
}

TEST_F(CacheFileTest, TellsSizesApartThatDifferBy4Gigabytes)
{
    WriteFile(path, "{}");
    SetModifyTime(path, SomeTime);
    const auto before = file.GetVersion();
    Lengthen(path, (std::int64_t{1} << 32U) + 2);
    SetModifyTime(path, SomeTime);
    EXPECT_FALSE(before == file.GetVersion());
}

// The document around the value is a level of its own.
TEST_F(CacheFileTest, StoresNoValueThatCouldNotBeLoadedAgain)
{
    EXPECT_TRUE(IsStorable("data"));
    EXPECT_TRUE(IsStorable(Nested(999)));
    EXPECT_FALSE(IsStorable(Nested(1000)));
    EXPECT_FALSE(IsStorable(std::numeric_limits<double>::infinity()));
}

}  // namespace
