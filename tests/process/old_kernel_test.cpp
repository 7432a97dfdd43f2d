// The library on the oldest kernel that it supports.
#include <gmock/gmock.h>
#include <signal.h>
#include <sys/prctl.h>
#include <unistd.h>

#include <filesystem>
#include <functional>

#include <orvadrcore/file.h>
#include <orvadrcore/file_lock.h>
#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_db.h>
#include <orvadrcore/utils.h>

#include "support/fakes/old_kernel.h"
#include "support/fixtures/process_test.h"
#include "support/processes/await.h"
#include "support/processes/child_process.h"
#include "support/processes/reap.h"

namespace {

using OrvaDRCore::File;
using OrvaDRCore::FileLock;
using OrvaDRCore::GenerateUUID;
using OrvaDRCore::InsertCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteTableHandler;
using ::testing::AnyOf;

constexpr int Old = 1;
constexpr int New = 2;

class OldKernelTest : public ProcessTest {
  protected:
    // Runs checks on each of the pretended kernels.
    static void OnEach(const std::function<void()>& checks)
    {
        for (const OldKernel& kernel : OldKernels) {
            SCOPED_TRACE(kernel.name);
            ChildProcess process([&](ChildProcess::Link& /*link*/) {
                ::prctl(PR_SET_CHILD_SUBREAPER, 1);
                ASSERT_TRUE(kernel.pretend());
                checks();
                if (HasFailure()) ::_exit(2);
            });
            EXPECT_EQ(process.Join(), 0);
        }
    }
};

TEST_F(OldKernelTest, StartsPrograms)
{
    OnEach([this] {
        // As a child of the caller, and through a companion process.
        for (void (*handler)(int) : {SIG_DFL, SIG_IGN}) {
            ASSERT_NE(::signal(SIGCHLD, handler), SIG_ERR);
            EXPECT_EQ(GenerateUUID().size(), 36U);
            EXPECT_TRUE(File::CreateDir(dir.File("a/b"), 0755));
            EXPECT_TRUE(std::filesystem::is_directory(dir.File("a/b")));
            EXPECT_TRUE(File::RemoveDir(dir.File("a")));
            EXPECT_FALSE(std::filesystem::exists(dir.File("a")));
        }
    });
}

TEST_F(OldKernelTest, RefreshesCaches)
{
    if (!HasLocks()) return;
    OnEach([this] {
        WriteStale(Old);
        // The new data if the child is faster than its parent.
        EXPECT_THAT(NumberOf(MakeCache(Mode::Background, Gives(New)).Read()), AnyOf(Old, New));
        EXPECT_TRUE(AwaitUntil([this] { return NumberInFile() == New; }));
        ReapAll();
        EXPECT_TRUE(MakeCache(Mode::Blocking, Gives(Old)).Update());
        EXPECT_EQ(NumberInFile(), Old);
    });
}

TEST_F(OldKernelTest, TakesLocks)
{
    if (!HasLocks()) return;
    OnEach([this] {
        FileLock lock(LockName());
        EXPECT_TRUE(lock.lock(LOCK_EX | LOCK_NB, 0));
        EXPECT_FALSE(FileLock(LockName()).tryLock(LOCK_SH | LOCK_NB));
    });
}

TEST_F(OldKernelTest, InsertsRecords)
{
    OnEach([this] {
        SqliteDB db(dir.File("nodes.db"), 0);
        InsertCommand insert;
        EXPECT_TRUE(insert.SetTable(SqliteTableHandler("nodes", "id INTEGER")));
        EXPECT_TRUE(insert.AddFieldValue("id", 1));
        EXPECT_TRUE(db.InsertRecord(insert));
    });
}

}  // namespace
