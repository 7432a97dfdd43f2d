// Cache::ReadWithin() and locks in a directory of their own, with every call failing once.
#include <orvadrcore/cache.h>
#include <orvadrcore/file_lock.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>

#include "fault.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"

using OrvaDRCore::Cache;
using OrvaDRCore::CacheState;
using OrvaDRCore::FileLock;
using OrvaDRCore::FileLockState;
using std::chrono::milliseconds;

namespace {

const char* const Old = "the data that was there before";
const char* const New = "the data that takes its place";

std::string DocumentOf(const std::string& data)
{
    return R"({"cached_data":")" + data + R"("})";
}

class OwnTexts : public Cache {
  public:
    explicit OwnTexts(const std::string& dir) : Cache(dir, "texts", 3600, false, 0, dir + "/locks")
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

// Reads in time with a fault. What was produced is handed out, whether it could be stored or not, and the
// next reader is neither kept out nor left with damaged data.
void ReadWithFault(const std::string& operation, bool hasOldData)
{
    EveryCallFails(operation, [hasOldData] {
        const TempDir dir;
        const std::string path = dir.File("texts.cached");
        if (hasOldData) WriteFile(path, DocumentOf(Old));
        const OwnTexts cache(dir.Path());
        Json::Value data = "untouched";
        const Outcome outcome =
            WithFault([&] { return cache.ReadWithin(milliseconds(0), data) == CacheState::Fresh; });
        if (outcome.succeeded) {
            EXPECT_EQ(data, New);
        } else if (outcome.threw) {
            EXPECT_EQ(data, "untouched");
        } else {
            EXPECT_EQ(data, hasOldData ? Json::Value(Old) : Json::Value());
        }
        // Only a failing unlink() can leave a mark.
        const bool isMarked = ::unlink((dir.File("locks/texts.cached.pid")).c_str()) == 0;
        EXPECT_TRUE(!isMarked || IsFailing(Call::Unlink)) << "a mark is left";

        Json::Value again;
        EXPECT_EQ(OwnTexts(dir.Path()).ReadWithin(milliseconds(0), again), CacheState::Fresh);
        EXPECT_EQ(again, New);
        EXPECT_EQ(cache.ReadWithin(milliseconds(0), again), CacheState::Fresh);

        WriteFile(path, DocumentOf(Old));
        EXPECT_EQ(cache.ReadWithin(milliseconds(0), again), CacheState::Fresh);
        EXPECT_EQ(again, New);
        EXPECT_EQ(NamesIn(dir.Path()), (std::set<std::string>{"locks", "texts.cached"}));
        EXPECT_EQ(NamesIn(dir.File("locks")), std::set<std::string>{"texts.cached.lock"});
        EXPECT_FALSE(IsLocked(dir.File("locks/texts.cached.lock")));
    });
}

}  // namespace

TEST(ReadWithinFaults, MissingData)
{
    ReadWithFault("Cache::ReadWithin, without data", false);
}

TEST(ReadWithinFaults, StaleData)
{
    ReadWithFault("Cache::ReadWithin, with stale data", true);
}

TEST(ReadWithinFaults, AcquireInADirectoryOfItsOwn)
{
    EveryCallFails("FileLock::acquire, in a directory", [] {
        const TempDir dir;
        const std::string file = dir.File("locks/a lock with a long name");
        FileLock lock("a lock with a long name", dir.File("locks"));
        const Outcome outcome = WithFault(
            [&] { return lock.acquire(LOCK_EX, milliseconds(0)) == FileLockState::Taken; });
        EXPECT_EQ(std::filesystem::exists(file) && IsLocked(file), outcome.succeeded);
        EXPECT_EQ(lock.acquire(LOCK_EX, milliseconds(0)), FileLockState::Taken);
        EXPECT_TRUE(IsLocked(file));
    });
}

TEST(ReadWithinFaults, FileLockInADirectory)
{
    EveryCallFails("FileLock's life, in a directory", [] {
        const TempDir dir;
        WithFault([&] {
            FileLock lock("a lock with a long name", dir.File("locks"));
            return lock.checkLockDir() && lock.openLockedFile() && lock.tryLock(LOCK_EX | LOCK_NB);
        });
        EXPECT_TRUE(FileLock("a lock with a long name", dir.File("locks")).tryLock(LOCK_SH));
    });
}
