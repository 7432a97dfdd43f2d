// The file of a lock: its name, its directory, how it is made and opened.
#include <orvadrcore/file_lock.h>

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/stat.h>

#include <cerrno>
#include <filesystem>
#include <string>
#include <vector>

#include "support/fixtures/file_lock_fixture.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"

namespace {

using OrvaDRCore::FileLock;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class FileLockTest : public FileLockFixture {};

// ------------------------------------------------------------------------------------------- names

TEST_F(FileLockTest, TheLockFileIsTheNameInTheLockDirectory)
{
    EXPECT_EQ(FileLock::getLockFilePath("a"), "/tmp/.orvadr_lock/a");
    EXPECT_EQ(FileLock::getLockFilePath("a/b"), "/tmp/.orvadr_lock/a/b");
    EXPECT_EQ(FileLock::getLockFilePath("/a/b"), "/tmp/.orvadr_lock//a/b");
    EXPECT_EQ(FileLock::getLockFilePath("../a b%s"), "/tmp/.orvadr_lock/../a b%s");
    EXPECT_EQ(FileLock::getLockFilePath("/"), "/tmp/.orvadr_lock//");
}

TEST_F(FileLockTest, AnEmptyNameHasNoLockFile)
{
    EXPECT_EQ(FileLock::getLockFilePath(""), "");
    ExpectLines({Err("getLockFilePath", "Bad lock file[]")});

    FileLock lock("");
    ExpectLines({Err("getLockFilePath", "Bad lock file[]")});
    EXPECT_FALSE(lock.lock(Exclusive, 3));
    ExpectLines({Err("openLockedFile", "Bad Lock File"), Err("lock", "Bad fd [-1] to lock []")});
    EXPECT_THAT(sleeps, IsEmpty());
}

TEST_F(FileLockTest, WithoutANameNothingCanBeLocked)
{
    FileLock lock;
    EXPECT_FALSE(lock.checkLockDir());
    ExpectLines({});
    EXPECT_FALSE(lock.openLockedFile());
    ExpectLines({Err("openLockedFile", "Bad Lock File")});
    for (const bool taken : {lock.lock(Exclusive, 0), lock.tryLock(Shared)}) {
        EXPECT_FALSE(taken);
    }
    ExpectLines({Err("openLockedFile", "Bad Lock File"), Err("lock", "Bad fd [-1] to lock []"),
                 Err("openLockedFile", "Bad Lock File"), Err("lock", "Bad fd [-1] to lock []")});
    lock.unlock();
    EXPECT_THAT(attempts, IsEmpty());
}

// --------------------------------------------------------------------------- directory and file

TEST_F(FileLockTest, MakesNothingBeforeTheFirstUse)
{
    FileLock lock("a/b");
    EXPECT_TRUE(lock.setLockFile("c/d"));
    EXPECT_THAT(NamesIn(dir.Path()), IsEmpty());
    EXPECT_THAT(opened, IsEmpty());
}

TEST_F(FileLockTest, TheFirstLockMakesDirectoryAndFile)
{
    const Umask umask(0077);
    FileLock lock("a/b");
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    EXPECT_EQ(ModeOf(dir.File("a")), 0755U);
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("a"));
    EXPECT_THAT(NamesIn(dir.File("a")), ElementsAre("b"));
}

TEST_F(FileLockTest, AnAbsoluteNameMakesItsDirectories)
{
    FileLock lock("/a/b/c");
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    EXPECT_TRUE(std::filesystem::is_regular_file(dir.File("a/b/c")));
    ASSERT_EQ(opened.size(), 1U);
    EXPECT_EQ(opened[0].path, "/tmp/.orvadr_lock//a/b/c");
}

TEST_F(FileLockTest, MakesTheLockDirectory)
{
    std::filesystem::remove(dir.Path());
    FileLock lock("a");
    EXPECT_TRUE(lock.checkLockDir());
    EXPECT_EQ(ModeOf(dir.Path()), 0755U);
    EXPECT_TRUE(lock.checkLockDir());
    EXPECT_THAT(NamesIn(dir.Path()), IsEmpty());
}

TEST_F(FileLockTest, TheFileStaysAfterUse)
{
    {
        FileLock lock("a");
        EXPECT_TRUE(lock.tryLock(Exclusive));
    }
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("a"));
}

// The contract: 644 is a decimal number.
TEST_F(FileLockTest, ANewFileHasTheBitsOfDecimal644LessTheUmask)
{
    for (const mode_t mask : {0U, 0022U, 0077U}) {
        const Umask umask(mask);
        FileLock lock("a");
        EXPECT_TRUE(lock.openLockedFile());
        EXPECT_EQ(ModeOf(dir.File("a")), 01204U & ~mask);
        std::filesystem::remove(dir.File("a"));
    }
}

TEST_F(FileLockTest, TheFileIsOpenedForReading)
{
    FileLock lock("a");
    EXPECT_TRUE(lock.openLockedFile());
    ASSERT_EQ(opened.size(), 1U);
    EXPECT_EQ(opened[0].flags & ~O_LARGEFILE, O_RDONLY | O_CREAT);
    EXPECT_EQ(opened[0].mode, 644U);
    EXPECT_THAT(attempts, IsEmpty());
}

TEST_F(FileLockTest, AnOrdinaryUserCannotOpenItsOwnLockFileAgain)
{
    CheckAsOrdinaryUser(dir, [&] {
        FileLock first("a");
        EXPECT_TRUE(first.lock(Exclusive, 0));
        FileLock second("a");
        EXPECT_FALSE(second.lock(Exclusive, 0));
        ExpectLines({Err("openLockedFile",
                         "Failed to open lock file[/tmp/.orvadr_lock/a], errno=Permission denied"),
                     Err("lock", "Bad fd [-1] to lock [/tmp/.orvadr_lock/a]")});
    });
}

TEST_F(FileLockTest, AFileThatCannotBeOpenedIsLogged)
{
    struct Row {
        std::string name;
        const char* error;
    };
    const std::vector<Row> table = {{"a", "Is a directory"},
                                    {"a/", "Is a directory"},
                                    {std::string(300, 'n'), "File name too long"},
                                    {"loop", "Too many levels of symbolic links"}};
    std::filesystem::create_directory(dir.File("a"));
    std::filesystem::create_symlink("loop", dir.File("loop"));
    for (const Row& row : table) {
        FileLock lock(row.name);
        errno = 0;
        EXPECT_FALSE(lock.lock(Exclusive, 3));
        ExpectLines({Err("openLockedFile", "Failed to open lock file[/tmp/.orvadr_lock/" +
                                               row.name + "], errno=" + row.error),
                     Err("lock", "Bad fd [-1] to lock [/tmp/.orvadr_lock/" + row.name + "]")});
        EXPECT_FALSE(lock.tryLock(Shared));
        EXPECT_EQ(TakeLines().size(), 2U);
    }
    EXPECT_THAT(attempts, IsEmpty());
    EXPECT_THAT(sleeps, IsEmpty());
}

TEST_F(FileLockTest, ANamedPipeIsRefusedWithoutWaiting)
{
    ASSERT_EQ(::mkfifo(dir.File("pipe").c_str(), 0600), 0);
    std::filesystem::create_symlink("pipe", dir.File("link"));
    for (const std::string name : {"pipe", "link"}) {
        CheckInChild([&] {
            FileLock lock(name);
            errno = 0;
            EXPECT_FALSE(lock.lock(Exclusive, 3));
            ExpectLines({Err("openLockedFile", "Failed to open lock file[/tmp/.orvadr_lock/" +
                                                   name + "], errno=Invalid argument"),
                         Err("lock", "Bad fd [-1] to lock [/tmp/.orvadr_lock/" + name + "]")});
            EXPECT_THAT(opened, IsEmpty());
            EXPECT_THAT(sleeps, IsEmpty());

            // The object works once the pipe is gone.
            std::filesystem::remove(dir.File("pipe"));
            MakeLockFile("pipe");
            EXPECT_TRUE(lock.lock(Exclusive, 0));
            std::filesystem::remove(dir.File("pipe"));
            ASSERT_EQ(::mkfifo(dir.File("pipe").c_str(), 0600), 0);
        });
    }
}

TEST_F(FileLockTest, ADirectoryThatCannotBeMadeIsLogged)
{
    WriteFile(dir.File("a"), "in the way");
    FileLock lock("a/b/c");
    EXPECT_FALSE(lock.checkLockDir());
    const std::vector<LogLine> lines = {
        Err("CreateDir", "Failed to create dir [/tmp/.orvadr_lock/a/b] with mode [755]")
            .In("file.cpp"),
        Err("checkLockDir", "Failed to create lock dir [/tmp/.orvadr_lock/a/b] in local host"),
        Err("openLockedFile", "Failed to check lock dir of lock file [/tmp/.orvadr_lock/a/b/c]."),
        Err("lock", "Bad fd [-1] to lock [/tmp/.orvadr_lock/a/b/c]")};
    ExpectLines({lines[0], lines[1]});
    EXPECT_FALSE(lock.openLockedFile());
    ExpectLines({lines[0], lines[1], lines[2]});
    EXPECT_FALSE(lock.lock(Exclusive, 3));
    ExpectLines(lines);
    EXPECT_FALSE(lock.tryLock(Exclusive));
    ExpectLines(lines);
    EXPECT_THAT(opened, IsEmpty());
    EXPECT_THAT(sleeps, IsEmpty());
    EXPECT_EQ(ReadFile(dir.File("a")), "in the way");
}

TEST_F(FileLockTest, TheFileIsOpenedOnce)
{
    FileLock lock("a");
    for (int round = 0; round < 3; ++round) {
        EXPECT_TRUE(lock.openLockedFile());
        EXPECT_TRUE(lock.lock(Exclusive, 0));
        EXPECT_TRUE(lock.tryLock(Shared));
        lock.unlock();
    }
    EXPECT_EQ(opened.size(), 1U);
}

TEST_F(FileLockTest, ReopensWhatIsNoRegularFileEachTime)
{
    std::filesystem::create_symlink("/dev/null", dir.File("a"));
    const std::size_t before = CountDescriptors();
    FileLock lock("a");
    EXPECT_TRUE(lock.openLockedFile());
    EXPECT_TRUE(lock.openLockedFile());
    EXPECT_EQ(opened.size(), 2U);
    EXPECT_EQ(CountDescriptors(), before + 1);
}

// Every lock checks for the directory, even when the file is open.
TEST_F(FileLockTest, FailsWhenTheDirectoryOfAnOpenFileCannotBeMadeAgain)
{
    FileLock lock("a/b");
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    ASSERT_EQ(attempts.size(), 1U);
    std::filesystem::remove_all(dir.File("a"));
    WriteFile(dir.File("a"), "in the way");
    EXPECT_FALSE(lock.lock(Exclusive, 0));
    ExpectLines(
        {Err("CreateDir", "Failed to create dir [/tmp/.orvadr_lock/a] with mode [755]")
             .In("file.cpp"),
         Err("checkLockDir", "Failed to create lock dir [/tmp/.orvadr_lock/a] in local host"),
         Err("openLockedFile", "Failed to check lock dir of lock file [/tmp/.orvadr_lock/a/b]."),
         Err("lock",
             "Bad fd [" + std::to_string(attempts[0].fd) + "] to lock [/tmp/.orvadr_lock/a/b]")});
}

// ------------------------------------------------------------------------------------ setLockFile

TEST_F(FileLockTest, TheNameMayChangeUntilTheFileIsOpen)
{
    FileLock lock;
    EXPECT_TRUE(lock.setLockFile("a"));
    EXPECT_TRUE(lock.setLockFile("b"));
    EXPECT_TRUE(lock.setLockFile("b"));
    EXPECT_TRUE(lock.openLockedFile());
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("b"));

    EXPECT_TRUE(lock.setLockFile("b"));
    EXPECT_FALSE(lock.setLockFile("c"));
    ExpectLines({Err("setLockFile",
                     "File [/tmp/.orvadr_lock/b] has been open, can not set file "
                     "path to [/tmp/.orvadr_lock/c]")});
    EXPECT_FALSE(lock.setLockFile("/b"));  // another name of the same file
    ExpectLines({Err("setLockFile",
                     "File [/tmp/.orvadr_lock/b] has been open, can not set file "
                     "path to [/tmp/.orvadr_lock//b]")});
    EXPECT_TRUE(lock.lock(Exclusive, 0));
    lock.unlock();
    EXPECT_TRUE(lock.setLockFile("b"));
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("b"));
}

TEST_F(FileLockTest, AnEmptyNameIsRefusedAndChangesNothing)
{
    FileLock lock("a");
    EXPECT_FALSE(lock.setLockFile(""));
    ExpectLines({Err("setLockFile", "Failed to set lock path []")});
    EXPECT_TRUE(lock.openLockedFile());
    EXPECT_FALSE(lock.setLockFile(""));
    ExpectLines({Err("setLockFile", "Failed to set lock path []")});
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("a"));
}

TEST_F(FileLockTest, TheNameMayChangeAfterAFileCouldNotBeOpened)
{
    std::filesystem::create_directory(dir.File("a"));
    FileLock lock("a");
    EXPECT_FALSE(lock.openLockedFile());
    EXPECT_EQ(TakeLines().size(), 1U);
    EXPECT_TRUE(lock.setLockFile("b"));
    EXPECT_TRUE(lock.lock(Exclusive, 0));
}

}  // namespace
