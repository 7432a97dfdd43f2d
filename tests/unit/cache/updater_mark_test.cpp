// The mark of the updater and its lock, without a Cache around them.
#include "cache/updater_mark.h"

#include <gmock/gmock.h>
#include <sys/file.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <optional>

#include "support/fixtures/cache_fixture.h"
#include "support/fixtures/test_files.h"

namespace {

using OrvaDRCore::MarkLock;
using OrvaDRCore::UpdaterMark;

constexpr unsigned int ShortestPause = 300'000;

class UpdaterMarkTest : public CacheFixture {
  protected:
    const UpdaterMark mark{path};
};

TEST_F(UpdaterMarkTest, NamesTheFilesBesideTheCacheFile)
{
    EXPECT_EQ(mark.GetPidPath(), pidPath);
    EXPECT_EQ(mark.GetLockName(), path + ".lock");
}

TEST_F(UpdaterMarkTest, IsOfThisProcessFromSetToRemove)
{
    EXPECT_EQ(mark.Read(), 0);
    EXPECT_FALSE(mark.IsOfLivingProcess());
    EXPECT_TRUE(mark.Set());
    EXPECT_EQ(mark.Read(), ::getpid());
    EXPECT_TRUE(mark.IsOfLivingProcess());
    mark.Remove();
    EXPECT_EQ(mark.Read(), 0);
    EXPECT_FALSE(std::filesystem::exists(pidPath));
}

TEST_F(UpdaterMarkTest, CannotBeSetWhereNoFileCanBe)
{
    std::filesystem::create_directory(pidPath);
    EXPECT_FALSE(mark.Set());
}

TEST_F(UpdaterMarkTest, OfADeadProcessTellsOfNoUpdater)
{
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    EXPECT_TRUE(mark.IsUpdating());
    updater.Tell();
    ASSERT_EQ(updater.Join(), 0);
    EXPECT_FALSE(mark.IsUpdating());
    EXPECT_TRUE(std::filesystem::exists(pidPath));
}

TEST_F(UpdaterMarkTest, ALockThatCannotBeHadLooksLikeAnUpdater)
{
    const HeldLock other(lockFile, LOCK_EX);
    EXPECT_TRUE(mark.IsUpdating());
    ExpectSleeps(5);
}

TEST_F(UpdaterMarkTest, SharedLocksExcludeTheExclusiveOneAndNotEachOther)
{
    MarkLock first(mark);
    MarkLock second(mark);
    MarkLock third(mark);
    EXPECT_TRUE(first.LockShared());
    EXPECT_TRUE(second.LockShared());
    EXPECT_FALSE(third.LockExclusive());
    ExpectSleeps(5);
}

TEST_F(UpdaterMarkTest, ALockEndsWithItsObject)
{
    {
        MarkLock lock(mark);
        EXPECT_TRUE(lock.LockExclusive());
        EXPECT_TRUE(IsLocked(lockFile));
    }
    EXPECT_FALSE(IsLocked(lockFile));
}

TEST_F(UpdaterMarkTest, WaitingTakesOnePauseWhenNobodyIsMarked)
{
    mark.WaitForUpdater([] { return true; });
    ExpectPauses(1, ShortestPause);
}

TEST_F(UpdaterMarkTest, WaitingEndsWhenTheDataIsNoLongerStale)
{
    ASSERT_TRUE(mark.Set());
    int questions = 0;
    mark.WaitForUpdater([&] {
        EXPECT_FALSE(IsLocked(lockFile));
        return ++questions < 3;
    });
    ExpectPauses(3, ShortestPause);
}

TEST_F(UpdaterMarkTest, WaitingEndsWhenTheMarkIsGone)
{
    ASSERT_TRUE(mark.Set());
    pauses.OnPause([this](std::size_t number) {
        if (number == 2) mark.Remove();
    });
    mark.WaitForUpdater([] { return true; });
    ExpectPauses(2, ShortestPause);
}

}  // namespace
