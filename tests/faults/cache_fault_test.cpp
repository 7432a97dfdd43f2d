// Cache, with every call failing once: in the reader, in the child that refreshes, and in the
// intermediate process.
#include <orvacore/orvacore.h>
#include <orvadrcore/cache.h>
#include <orvadrcore/file_lock.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>

#include "base/json_helpers.h"
#include "fault.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"

using OrvaDRCore::Cache;
using OrvaDRCore::FileLock;
using OrvaDRCore::fromFile;

namespace {

const char* const Old = "the data that was there before";
const char* const New = "the data that takes its place";

class Texts : public Cache {
  public:
    Texts(const std::string& dir, bool updatedRequired)
        : Cache(dir, "texts", 3600, updatedRequired, 0)
    {
    }
    Json::Value GetInfo() const override { return "a cache of texts"; }
    bool GetUpdatedData(Json::Value& data) const override
    {
        data = New;
        return true;
    }
    bool IsValidData(const Json::Value& data) const override { return data.isString(); }
    bool IsNeedUpdate(const Json::Value& data) const override { return data != New; }
};

// A directory for a cache, with a lock file that an ordinary user can open more than once.
struct Place {
    Place() { WriteFile(PlaceOfLock(FileLock::getLockFilePath(path + ".lock")), ""); }

    // A minute old, because a write within the same second would go unnoticed.
    void WriteOld() const
    {
        WriteFile(path, std::string(R"({"cached_data":")") + Old + R"("})");
        std::filesystem::last_write_time(
            path, std::filesystem::file_time_type::clock::now() - std::chrono::minutes(1));
    }

    // The data in the file, which must never be damaged.
    std::string Data() const
    {
        Json::Value document;
        if (!fromFile(document, path)) return NamesIn(dir.Path()).empty() ? "" : "(damaged)";
        return document["cached_data"].asString();
    }

    // Removes the mark of the updater. It stays when a system call failed that was needed to remove
    // it, but never because an allocation failed.
    void RemoveMark() const
    {
        const std::string mark = path + ".pid";
        if (::unlink(mark.c_str()) < 0) return;
        EXPECT_FALSE(IsFailing(Call::Memory) || IsFailing(Call::AllMemory)) << "a mark is left";
    }

    // No mark, no temporary file, and the lock is free.
    void ExpectClean() const
    {
        EXPECT_EQ(NamesIn(dir.Path()), std::set<std::string>{"texts.cached"});
        EXPECT_FALSE(IsLocked(PlaceOfLock(FileLock::getLockFilePath(path + ".lock"))));
    }

    TempDir dir;
    std::string path = dir.File("texts.cached");
};

// Runs an operation on old data that may refresh it. A later reader must get new data in any case.
void RefreshWithFault(bool updatedRequired, const std::function<bool(const Texts&)>& operation)
{
    const Place place;
    place.WriteOld();
    const Texts cache(place.dir.Path(), updatedRequired);
    WithFault([&] { return operation(cache); });
    EXPECT_TRUE(place.Data() == Old || place.Data() == New) << place.Data();
    place.RemoveMark();

    EXPECT_EQ(Texts(place.dir.Path(), true).Read().asString(), New);
    EXPECT_EQ(cache.Read().asString(), New) << "the object is unusable";
    place.ExpectClean();
}

bool ReadTexts(const Texts& cache)
{
    const std::string data = cache.Read().asString();
    EXPECT_TRUE(data == Old || data == New || data.empty()) << data;
    return data == New;
}

bool ViewTexts(const Texts& cache)
{
    const std::string data = cache.View().asString();
    EXPECT_TRUE(data == Old || data == New || data.empty()) << data;
    return data == New;
}

bool UpdateTexts(const Texts& cache)
{
    return cache.Update();
}

}  // namespace

TEST(CacheFaults, Constructor)
{
    EveryCallFails("Cache", [] {
        const TempDir dir;
        const std::string path = dir.Path() + "/a directory that is not there yet";
        const Outcome outcome = WithFault([&] {
            const Texts cache(path, false);
            return true;
        });
        EXPECT_TRUE(CoreLibFileCheckDir(path.c_str()) == 1 || outcome.threw || outcome.lines > 0);
        const Texts again(path, false);
        EXPECT_TRUE(CoreLibFileCheckDir(path.c_str()) == 1);
    });
}

TEST(CacheFaults, Load)
{
    EveryCallFails("Cache::Load", [] {
        const Place place;
        place.WriteOld();
        const Texts cache(place.dir.Path(), false);
        const Outcome outcome = WithFault([&] { return cache.Load(); });
        outcome.ExpectLogged();
        EXPECT_TRUE(cache.Load());
        EXPECT_EQ(cache.GetCachedData().asString(), Old);
    });
}

TEST(CacheFaults, Getters)
{
    EveryCallFails("Cache's getters", [] {
        const Place place;
        place.WriteOld();
        const Texts cache(place.dir.Path(), false);
        std::string data;
        WithFault([&] {
            data = cache.GetCachedData().asString();
            return cache.GetMaxUpdateTime() == 0 && !cache.IsTimeout();
        });
        EXPECT_TRUE(data.empty() || data == Old) << data;
        EXPECT_EQ(cache.GetCachedData().asString(), Old);
        EXPECT_FALSE(cache.IsTimeout());
    });
}

TEST(CacheFaults, UpdateWithData)
{
    EveryCallFails("Cache::UpdateWithData", [] {
        const Place place;
        place.WriteOld();
        const Texts cache(place.dir.Path(), false);
        ASSERT_TRUE(cache.Load());
        const Outcome outcome = WithFault([&] { return cache.UpdateWithData(New); });
        outcome.ExpectLogged();
        EXPECT_EQ(place.Data(), outcome.succeeded ? New : Old);
        EXPECT_EQ(cache.GetCachedData().asString(), outcome.succeeded ? New : Old);
        EXPECT_TRUE(cache.UpdateWithData(New));
        EXPECT_EQ(place.Data(), New);
        place.ExpectClean();
    });
}

TEST(CacheFaults, Remove)
{
    EveryCallFails("Cache::Remove", [] {
        const Place place;
        place.WriteOld();
        Texts cache(place.dir.Path(), false);
        const Outcome outcome = WithFault([&] { return cache.Remove() == 0; });
        EXPECT_EQ(place.Data(), outcome.succeeded ? "" : Old);
        EXPECT_EQ(cache.Remove(), outcome.succeeded ? -1 : 0);
    });
}

TEST(CacheFaults, UpdateInTheCaller)
{
    EveryCallFails("Cache::Update, in the caller", [] { RefreshWithFault(true, UpdateTexts); });
}

TEST(CacheFaults, UpdateInAChild)
{
    EveryCallFails("Cache::Update, in a child", [] { RefreshWithFault(false, UpdateTexts); });
}

TEST(CacheFaults, ReadThatRefreshesInTheCaller)
{
    EveryCallFails("Cache::Read, refreshing", [] { RefreshWithFault(true, ReadTexts); });
}

TEST(CacheFaults, ReadThatRefreshesInAChild)
{
    EveryCallFails("Cache::Read, a child refreshing", [] { RefreshWithFault(false, ReadTexts); });
}

TEST(CacheFaults, ViewThatRefreshesInTheCaller)
{
    EveryCallFails("Cache::View, refreshing", [] { RefreshWithFault(true, ViewTexts); });
}
