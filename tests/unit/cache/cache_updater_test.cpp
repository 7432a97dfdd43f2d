// Whether another process is refreshing the cache, and who replaces one that was killed.
#include <orvadrcore/cache.h>

#include <gmock/gmock.h>
#include <orvacore/orvacore.h>
#include <signal.h>
#include <sys/file.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "support/fixtures/cache_update_fixture.h"
#include "support/fixtures/special_file.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"
#include "support/processes/reap.h"

namespace {

using ::testing::ElementsAre;
using ::testing::StartsWith;

class CacheUpdaterTest : public CacheUpdateFixture {};

// ------------------------------------------------------------------------------ is there an updater

TEST_F(CacheUpdaterTest, APidFileOfNoLivingProcessCountsAsNone)
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

TEST_F(CacheUpdaterTest, APidFileThatIsNoRegularFileCountsAsNone)
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

TEST_F(CacheUpdaterTest, APidFileThatCannotBeReadToItsEndCountsAsNone)
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

TEST_F(CacheUpdaterTest, APidFileIsReadWholeByteByByte)
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

TEST_F(CacheUpdaterTest, AZombieIsNoUpdater)
{
    WriteStale("old");
    ChildProcess updater = Updater();
    ASSERT_TRUE(updater.Await());
    updater.Kill(SIGKILL);
    AwaitZombie(updater.Pid());
    EXPECT_EQ(waiting.Read(), "new");
    ExpectLines({Start(), Finish()});
}

TEST_F(CacheUpdaterTest, ReturnsOldDataWhileALivingProcessUpdates)
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

TEST_F(CacheUpdaterTest, ALockThatCannotBeTakenLooksLikeAnUpdater)
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

TEST_F(CacheUpdaterTest, ReadsTheMarkOnceTheLockBecomesFree)
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

TEST_F(CacheUpdaterTest, ALockThatCannotBeOpenedLooksLikeAnUpdater)
{
    WriteStale("old");
    FailForks(EAGAIN);
    FailOpeningLock(1);
    EXPECT_EQ(cache.Read(), "old");
    ExpectLines(LockIsNotOpened());
    ExpectSleeps(0);
}

TEST_F(CacheUpdaterTest, ALockDirectoryThatCannotBeMadeLooksLikeAnUpdater)
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

TEST_F(CacheUpdaterTest, ProcessOneIsAnUpdaterLikeAnyOther)
{
    WriteStale();  // with cached data nobody waits
    WriteFile(pidPath, "1");
    FailForks(EAGAIN);  // it could not refresh by itself
    EXPECT_TRUE(cache.Update());
    EXPECT_TRUE(IsMarked());
    ExpectLines({});
}

// --------------------------------------------------------------------------------- killed updaters

TEST_F(CacheUpdaterTest, TheNextReaderReplacesAnUpdaterKilledWhileProducing)
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

TEST_F(CacheUpdaterTest, TheNextUpdaterRemovesWhatOneKilledWhileWritingLeft)
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

}  // namespace
