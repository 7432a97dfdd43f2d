// CoreLibFileExist() and CoreLibFileCheckDir().
#include <orvacore/orvacore.h>

#include <sys/socket.h>
#include <sys/un.h>

#include <cstring>
#include <filesystem>

#include "caller.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"
#include "support/processes/rights.h"

namespace {

namespace fs = std::filesystem;

class FilesTest : public ::testing::Test {
  protected:
    static void Expect(const std::string& path, bool exists, int isDirectory)
    {
        EXPECT_EQ(CoreLibFileExist(path.c_str()), exists) << path;
        EXPECT_EQ(CoreLibFileCheckDir(path.c_str()), isDirectory) << path;
    }

    TempDir dir;
};

TEST_F(FilesTest, EverythingWithANameExists)
{
    WriteFile(dir.File("file"), "text");
    WriteFile(dir.File("secret"), "");
    WriteFile(dir.File("two\nlines \xff"), "");
    EXPECT_EQ(::chmod(dir.File("secret").c_str(), 0000), 0);
    EXPECT_EQ(::mkfifo(dir.File("fifo").c_str(), 0600), 0);
    for (const char* name : {"file", "secret", "two\nlines \xff", "fifo"}) {
        Expect(dir.File(name), true, 0);
    }
    Expect("/dev/null", true, 0);
}

TEST_F(FilesTest, RecognizesDirectories)
{
    fs::create_directory(dir.File("directory"));
    EXPECT_EQ(::chmod(dir.File("directory").c_str(), 0000), 0);
    for (const char* name : {"directory", "directory/", ".", "directory//"}) {
        Expect(dir.File(name), true, 1);
    }
    Expect("/", true, 1);
    Expect(".", true, 1);
}

TEST_F(FilesTest, WhatHasNoNameDoesNotExist)
{
    WriteFile(dir.File("file"), "");
    for (const char* name : {"missing", "missing/", "missing/file", "file/", "file/name"}) {
        Expect(dir.File(name), false, 0);
    }
    Expect(dir.File(std::string(300, 'x')), false, 0);
    Expect("", false, 0);
}

TEST_F(FilesTest, FollowsSymbolicLinks)
{
    WriteFile(dir.File("file"), "");
    fs::create_symlink("file", dir.File("to file"));
    fs::create_directory_symlink(dir.Path(), dir.File("to directory"));
    fs::create_symlink("to file", dir.File("to link"));
    fs::create_symlink("missing", dir.File("dangling"));
    fs::create_symlink("loop", dir.File("loop"));
    Expect(dir.File("to file"), true, 0);
    Expect(dir.File("to link"), true, 0);
    Expect(dir.File("to directory"), true, 1);
    Expect(dir.File("to directory/to directory/file"), true, 0);
    Expect(dir.File("dangling"), false, 0);
    Expect(dir.File("loop"), false, 0);
}

TEST_F(FilesTest, NothingExistsInADirectoryThatMayNotBeSearched)
{
    fs::create_directories(dir.File("closed/directory"));
    EXPECT_EQ(::chmod(dir.Path().c_str(), 0711), 0);
    EXPECT_EQ(::chmod(dir.File("closed").c_str(), 0000), 0);
    CheckInChild([this] {
        EXPECT_TRUE(LoseRights());
        Expect(dir.File("closed"), true, 1);
        Expect(dir.File("closed/directory"), false, 0);
    });
    EXPECT_EQ(::chmod(dir.File("closed").c_str(), 0700), 0);
}

}  // namespace
