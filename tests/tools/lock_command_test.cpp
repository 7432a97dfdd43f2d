// orvadr lock
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/prctl.h>
#include <unistd.h>

#include <cstdint>
#include <filesystem>
#include <functional>
#include <map>
#include <optional>
#include <set>
#include <string>

#include <orvadrcore/file_lock.h>

#include "kernel_locks.h"
#include "orvadr.h"
#include "processes.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/await.h"
#include "support/processes/child_checks.h"
#include "support/processes/child_process.h"
#include "support/processes/reap.h"
#include "support/processes/rights.h"

namespace {

using OrvaDRCore::FileLock;
using ::testing::HasSubstr;

constexpr const char* LockDir = "/tmp/.orvadr_lock";

class LockCommandTest : public ::testing::Test {
  protected:
    void TearDown() override
    {
        std::error_code ignored;
        std::filesystem::remove_all(LockDir + dir.Path(), ignored);
    }

    // Whether this process may make lock files. If not, checks what an ordinary user gets.
    static bool HasLocks()
    {
        static const bool isRoot = BecomeRoot();
        if (!isRoot) {
            EXPECT_EQ(Ask({"lock", "/no such lock"}).Only()["state"], "missing");
        }
        return isRoot;
    }

    std::string Name() const { return dir.File("lock"); }
    std::string Path() const { return FileLock::getLockFilePath(Name()); }

    // A process that takes the lock and holds it until Tell().
    ChildProcess StartHolder(
        int operation, const std::function<void()>& whileHolding = [] {}) const
    {
        return ChildProcess([this, operation, whileHolding](ChildProcess::Link& link) {
            FileLock lock(Name());
            if (!lock.lock(operation, 0)) return;
            whileHolding();
            link.Tell();
            link.Await();
        });
    }

    // A process that takes the lock and ends. Another one, whose id is in the file "heir", was forked by
    // it and keeps the lock.
    ChildProcess StartHeir(const std::function<void()>& whileHolding = [] {}) const
    {
        return ChildProcess([this, whileHolding](ChildProcess::Link& link) {
            FileLock lock(Name());
            if (!lock.lock(LOCK_EX, 0)) return;
            const pid_t parent = ::getpid();
            if (::fork() != 0) ::_exit(0);
            whileHolding();
            WriteFile(dir.File("heir"), std::to_string(::getpid()));
            if (!AwaitUntil([&] { return ::getppid() != parent; })) return;
            link.Tell();
            link.Await();
        });
    }

    Json::Value Look(int code) const
    {
        const Answer answer = Ask({"lock", Name()});
        EXPECT_EQ(answer.code, code);
        EXPECT_EQ(answer.Only()["name"], Name());
        EXPECT_EQ(answer.Only()["path"], Path());
        return answer.Only();
    }

    TempDir dir;
};

std::set<pid_t> PidsOf(const Json::Value& processes)
{
    std::set<pid_t> pids;
    for (const Json::Value& process : processes) pids.insert(process["pid"].asInt());
    return pids;
}

TEST_F(LockCommandTest, ShowsAFreeLockAndMakesNoLockFile)
{
    if (!HasLocks()) return;
    const bool hadDirectory = std::filesystem::exists(LockDir);
    EXPECT_EQ(Look(AllWell)["state"], "missing");
    EXPECT_EQ(std::filesystem::exists(LockDir), hadDirectory);
    EXPECT_FALSE(std::filesystem::exists(Path()));

    EXPECT_TRUE(FileLock(Name()).tryLock(LOCK_EX | LOCK_NB));
    const Json::Value free = Look(AllWell);
    EXPECT_EQ(free["state"], "free");
    EXPECT_EQ(free["holders"].size(), 0U);
}

TEST_F(LockCommandTest, ShowsWhoHoldsALockExclusively)
{
    if (!HasLocks()) return;
    const ChildProcess holder = StartHolder(LOCK_EX);
    ASSERT_TRUE(holder.Await());
    const Json::Value held = Look(NotWell);
    EXPECT_EQ(held["state"], "exclusive");
    ASSERT_EQ(held["holders"].size(), 1U);
    EXPECT_EQ(held["holders"][0]["pid"], holder.Pid());
    EXPECT_THAT(held["holders"][0]["command"].asString(), HasSubstr("tool_tests"));
    EXPECT_TRUE(IsLocked(Path())) << "the program has freed the lock";
}

TEST_F(LockCommandTest, ShowsAllWhoShareALock)
{
    if (!HasLocks()) return;
    const ChildProcess first = StartHolder(LOCK_SH);
    const ChildProcess second = StartHolder(LOCK_SH);
    ASSERT_TRUE(first.Await() && second.Await());
    const Json::Value held = Look(NotWell);
    EXPECT_EQ(held["state"], "shared");
    EXPECT_EQ(PidsOf(held["holders"]), (std::set<pid_t>{first.Pid(), second.Pid()}));
}

TEST_F(LockCommandTest, ShowsAProcessThatInheritedTheLock)
{
    if (!HasLocks()) return;
    const ChildProcess heir = StartHeir();
    ASSERT_TRUE(heir.Await());
    const Json::Value held = Look(NotWell);
    EXPECT_EQ(held["state"], "exclusive");
    EXPECT_EQ(PidsOf(held["holders"]), std::set<pid_t>{std::stoi(ReadFile(dir.File("heir")))});
}

TEST_F(LockCommandTest, DoesNotShowWhoOnlyHasTheFileOpen)
{
    if (!HasLocks()) return;
    FileLock open(Name());
    ASSERT_TRUE(open.openLockedFile());
    EXPECT_EQ(Look(AllWell)["state"], "free");
    const ChildProcess holder = StartHolder(LOCK_SH);
    ASSERT_TRUE(holder.Await());
    EXPECT_EQ(PidsOf(Look(NotWell)["holders"]), std::set<pid_t>{holder.Pid()});
}

TEST_F(LockCommandTest, NamesAHolderThatMayNotBeLookedAt)
{
    if (!HasLocks()) return;
    // Nobody but root may look at a process that is not dumpable.
    const ChildProcess holder = StartHolder(LOCK_EX, [] { ::prctl(PR_SET_DUMPABLE, 0, 0, 0, 0); });
    ASSERT_TRUE(holder.Await());
    CheckInChild([&] {
        ASSERT_TRUE(LoseCapabilities());
        const Json::Value held = Look(NotWell);
        EXPECT_EQ(held["state"], "exclusive");
        ASSERT_EQ(held["holders"].size(), 1U);
        EXPECT_EQ(held["holders"][0]["pid"], holder.Pid());
        EXPECT_EQ(held["holders"][0]["command"], "not permitted");
    });
}

TEST_F(LockCommandTest, TellsThatItCannotSeeAnHeir)
{
    if (!HasLocks()) return;
    const ChildProcess heir = StartHeir([] { ::prctl(PR_SET_DUMPABLE, 0, 0, 0, 0); });
    ASSERT_TRUE(heir.Await());
    CheckInChild([&] {
        ASSERT_TRUE(LoseCapabilities());
        const Json::Value held = Look(NotSeen);
        EXPECT_EQ(held["state"], "exclusive");
        EXPECT_EQ(held["holders"].size(), 0U);
    });
}

TEST_F(LockCommandTest, ListsAllLocksWithoutAName)
{
    if (!HasLocks()) return;
    const ChildProcess holder = StartHolder(LOCK_EX);
    ASSERT_TRUE(holder.Await());
    EXPECT_TRUE(FileLock(dir.File("a\nb")).tryLock(LOCK_EX | LOCK_NB));
    std::filesystem::create_symlink(".", LockDir + dir.Path() + "/loop");

    const Answer answer = Ask({"lock"});
    EXPECT_EQ(answer.code, AllWell) << answer.err;
    std::map<std::string, std::string> states;
    for (const Json::Value& object : answer.objects) {
        states[object["name"].asString()] = object["state"].asString();
    }
    const std::string prefix = dir.Path().substr(1);
    EXPECT_EQ(states[prefix + "/lock"], "exclusive");
    EXPECT_EQ(states[prefix + "/a\nb"], "free");
    EXPECT_EQ(states.count(prefix + "/loop"), 0U);
    EXPECT_THAT(RunOrvadr({"lock"}).out, HasSubstr(prefix + "/a\\nb\n"));
}

TEST_F(LockCommandTest, ShowsATableForPeople)
{
    if (!HasLocks()) return;
    const ChildProcess holder = StartHolder(LOCK_EX);
    ASSERT_TRUE(holder.Await());
    const ProgramResult result = RunOrvadr({"lock", Name()});
    EXPECT_EQ(result.code, NotWell);
    EXPECT_THAT(result.out,
                HasSubstr("exclusive  " + Name() + "  " + std::to_string(holder.Pid()) + " "));
    EXPECT_EQ(result.err, "");
}

TEST_F(LockCommandTest, TellsWhatCannotBeLookedAt)
{
    if (!HasLocks()) return;
    EXPECT_TRUE(FileLock(Name()).tryLock(LOCK_EX | LOCK_NB));
    EXPECT_EQ(Ask({"lock", dir.Path()}).Only()["state"], "missing") << "a directory is no lock";
    EXPECT_EQ(Ask({"lock", Name() + "/below"}).Only()["state"], "missing");

    std::filesystem::permissions(LockDir + dir.Path(), std::filesystem::perms::none);
    CheckInChild([&] {
        ASSERT_TRUE(LoseCapabilities());
        const Answer answer = Ask({"lock", Name()});
        EXPECT_EQ(answer.code, NotSeen);
        EXPECT_TRUE(answer.Only()["state"].isNull());
        EXPECT_EQ(answer.err, "orvadr: " + Path() + ": Permission denied\n");
        EXPECT_THAT(RunOrvadr({"lock", Name()}).out, HasSubstr("?      " + Name()));
        EXPECT_EQ(Ask({"lock"}).code, NotSeen);
    });
    std::filesystem::permissions(LockDir + dir.Path(), std::filesystem::perms::owner_all);
}

// ----------------------------------------------------------------------------- the kernel's table

TEST(KernelLocksTest, ReadsLocksButNotWaiters)
{
    const auto locks = Orvadr::ParseLocks(
        "1: FLOCK  ADVISORY  WRITE 5163 fe:10:11345930 0 EOF\n"
        "1: -> FLOCK  ADVISORY  WRITE 5164 fe:10:11345930 0 EOF\n"
        "2: POSIX  ADVISORY  READ  4242 00:2b:123 1073741826 1073742335\n"
        "3: OFDLCK ADVISORY  READ  -1 00:2b:123 1 1\n"
        "4: LEASE  ACTIVE    READ  17 00:2b:124 0 EOF\n"
        "lock:\t1: FLOCK  ADVISORY  READ 99 00:2b:125 0 EOF\n");
    ASSERT_EQ(locks.size(), 4U);
    EXPECT_TRUE(locks[0].isFlock && locks[0].isExclusive);
    EXPECT_EQ(locks[0].pid, 5163);
    EXPECT_TRUE((locks[0].file == Orvadr::FileId{0xfe10, 11345930}));
    EXPECT_EQ(locks[0].to, UINT64_MAX);
    EXPECT_FALSE(locks[1].isFlock || locks[1].isExclusive);
    EXPECT_EQ(locks[1].from, 1073741826U);
    EXPECT_EQ(locks[1].to, 1073742335U);
    EXPECT_EQ(locks[2].pid, -1);
    EXPECT_EQ(locks[3].pid, 99);
}

TEST(KernelLocksTest, LeavesOutLinesOfAnotherForm)
{
    EXPECT_TRUE(Orvadr::ParseLocks("").empty());
    EXPECT_TRUE(Orvadr::ParseLocks("pos:\t0\nflags:\t0100001\nino:\t1\n").empty());
    EXPECT_TRUE(Orvadr::ParseLocks("1: FLOCK ADVISORY WRITE x fe:00:1 0 EOF\n").empty());
    EXPECT_TRUE(Orvadr::ParseLocks("1: FLOCK ADVISORY NONE 1 fe:00:1 0 EOF\n").empty());
    EXPECT_TRUE(Orvadr::ParseLocks("1: FLOCK ADVISORY WRITE 1 fe:00:1\n").empty());
}

TEST(KernelLocksTest, FindsTheDeviceOfAMount)
{
    const std::string mounts =
        "22 27 0:21 / /proc rw - proc proc rw\nnonsense\n27 1 254:16 / / rw - ext4 /dev/vda rw\n";
    EXPECT_EQ(Orvadr::FindMountDevice(mounts, 27), dev_t{0xfe10});
    EXPECT_EQ(Orvadr::FindMountDevice(mounts, 28), std::nullopt);
}

TEST(ProcessesTest, ShowsTheNameOfAProcessWithoutACommandLine)
{
    const pid_t zombie = ::fork();
    if (zombie == 0) ::_exit(0);
    EXPECT_TRUE(AwaitUntil([&] { return Orvadr::CommandOf(zombie) == "[tool_tests]"; }));
    EXPECT_EQ(Reap(zombie), 0);
    EXPECT_EQ(Orvadr::CommandOf(zombie), "not permitted");
}

TEST(KernelLocksTest, KnowsNoFileThatIsMissing)
{
    EXPECT_EQ(Orvadr::KernelIdOf("/no such file"), std::nullopt);
}

}  // namespace
