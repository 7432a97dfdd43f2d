// ReadProcessStatus and IsProcessAlive. platform/process_test.cpp tests CoreLibProcAlive.
#include "base/process_status.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <climits>
#include <cstring>

#include "support/fakes/syscall_faults.h"
#include "support/processes/child_process.h"
#include "support/processes/reap.h"

namespace {

using OrvaDRCore::IsProcessAlive;
using OrvaDRCore::ReadProcessStatus;

constexpr pid_t Nobodys = INT_MAX;

class ProcessStatusTest : public ::testing::Test {
  protected:
    // From now on /proc shows no process.
    void HideProcesses()
    {
        faults.open = [](const char* path, int flags, mode_t mode) {
            const bool isHidden = std::strncmp(path, "/proc/", 6) == 0;
            return isHidden ? Failing(ENOENT)() : RealOpen(path, flags, mode);
        };
    }

    SyscallFaults faults;
};

TEST_F(ProcessStatusTest, AProcessReadsItsOwnStatus)
{
    const auto status = ReadProcessStatus(::getpid());
    ASSERT_TRUE(status);
    EXPECT_EQ(status->state, 'R');
    EXPECT_EQ(status->threads, 1);
    EXPECT_GT(status->start, 0U);
}

TEST_F(ProcessStatusTest, AnUnusedIdHasNoStatusAndIsNotAlive)
{
    for (const pid_t pid : {Nobodys, 0, -1}) {
        EXPECT_FALSE(ReadProcessStatus(pid));
        EXPECT_FALSE(IsProcessAlive(pid));
        EXPECT_FALSE(IsProcessAlive(pid, 1));
    }
}

TEST_F(ProcessStatusTest, AStatusThatCannotBeReadToItsEndCountsAsNone)
{
    faults.read = [calls = 0](int fd, void* buffer, std::size_t size) mutable -> ssize_t {
        return ++calls == 1 ? RealRead(fd, buffer, size) : Failing(EIO)();
    };
    EXPECT_FALSE(ReadProcessStatus(::getpid()));
}

TEST_F(ProcessStatusTest, TheStartTimeTellsAProcessFromALaterOne)
{
    const unsigned long long start = ReadProcessStatus(::getpid())->start;
    EXPECT_TRUE(IsProcessAlive(::getpid()));
    EXPECT_TRUE(IsProcessAlive(::getpid(), start));
    EXPECT_FALSE(IsProcessAlive(::getpid(), start - 1));
    EXPECT_FALSE(IsProcessAlive(::getpid(), start + 1));
}

TEST_F(ProcessStatusTest, AZombieIsNotAlive)
{
    ChildProcess child([](ChildProcess::Link& /*link*/) {});
    AwaitZombie(child.Pid());
    const auto status = ReadProcessStatus(child.Pid());
    ASSERT_TRUE(status);
    EXPECT_EQ(status->state, 'Z');
    EXPECT_FALSE(IsProcessAlive(child.Pid()));
    EXPECT_FALSE(IsProcessAlive(child.Pid(), status->start));
}

TEST_F(ProcessStatusTest, WithoutProcAnIdInUseIsAlive)
{
    HideProcesses();
    EXPECT_FALSE(ReadProcessStatus(::getpid()));
    EXPECT_TRUE(IsProcessAlive(::getpid()));
    EXPECT_TRUE(IsProcessAlive(::getpid(), 1));
    EXPECT_FALSE(IsProcessAlive(Nobodys, 1));
}

}  // namespace
