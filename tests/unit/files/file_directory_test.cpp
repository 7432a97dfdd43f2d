// File::CreateDir and File::RemoveDir, which run programs.
#include <orvadrcore/file.h>

#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <filesystem>
#include <string>
#include <vector>

#include "support/fixtures/file_fixture.h"
#include "support/processes/child_checks.h"

namespace {

using OrvaDRCore::File;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class FileDirectoryTest : public FileFixture {
  protected:
    // Records the programs that are started, with their arguments.
    void NotePrograms()
    {
        faults.spawn = [&](const SpawnCall& call) {
            programs.push_back(call.Arguments());
            return RealSpawn(call);
        };
    }

    // From now on another thread gets the results of all children.
    void LoseResults()
    {
        faults.waitpid = [](pid_t pid, int* status, int options) {
            RealWaitpid(pid, status, options);
            return Failing(ECHILD)();
        };
    }

    std::vector<std::vector<std::string>> programs;
};

class FileCreateDirTest : public FileDirectoryTest {};
class FileRemoveDirTest : public FileDirectoryTest {};

// --------------------------------------------------------------------------------------- CreateDir

TEST_F(FileCreateDirTest, MakesADirectoryOfTheModeWhateverTheUmask)
{
    for (const mode_t mask : {0U, 0022U, 0077U}) {
        for (const int mode : {0, 01, 0700, 0750, 0755, 0777}) {
            const Umask umask(mask);
            const std::string made = dir.File(std::to_string(mask) + " " + std::to_string(mode));
            EXPECT_TRUE(File::CreateDir(made, mode));
            EXPECT_EQ(ModeOf(made), static_cast<mode_t>(mode));
            ASSERT_EQ(::rmdir(made.c_str()), 0);
        }
    }
}

TEST_F(FileCreateDirTest, RunsMkdirWithTheModeInOctal)
{
    NotePrograms();
    EXPECT_TRUE(File::CreateDir(dir.File("a"), 0755));
    EXPECT_TRUE(File::CreateDir(dir.File("b"), 0));
    EXPECT_THAT(programs, ElementsAre(ElementsAre("/bin/mkdir", "-p", dir.File("a"), "-m", "755"),
                                      ElementsAre("/bin/mkdir", "-p", dir.File("b"), "-m", "0")));
    ASSERT_EQ(::rmdir(dir.File("b").c_str()), 0);
}

TEST_F(FileCreateDirTest, MakesParentsWithTheUsualMode)
{
    const Umask umask(0022);
    EXPECT_TRUE(File::CreateDir(dir.File("a/b/c"), 0700));
    EXPECT_EQ(ModeOf(dir.File("a")), 0755U);
    EXPECT_EQ(ModeOf(dir.File("a/b")), 0755U);
    EXPECT_EQ(ModeOf(dir.File("a/b/c")), 0700U);
}

TEST_F(FileCreateDirTest, AnExistingDirectoryStaysAsItIs)
{
    const std::string there = dir.File("there");
    std::filesystem::create_directory(there);
    std::filesystem::create_directory_symlink(there, dir.File("link"));
    ASSERT_EQ(::chmod(there.c_str(), 0711), 0);
    NotePrograms();
    for (const int mode : {0, 0755, 01000, -1}) {
        EXPECT_TRUE(File::CreateDir(there, mode));
        EXPECT_TRUE(File::CreateDir(dir.File("link"), mode));
    }
    EXPECT_EQ(ModeOf(there), 0711U);
    EXPECT_THAT(programs, IsEmpty());
}

TEST_F(FileCreateDirTest, RefusesAnEmptyPathWithoutALogLine)
{
    NotePrograms();
    for (const int mode : {0755, 01000, -1}) EXPECT_FALSE(File::CreateDir("", mode));
    EXPECT_THAT(programs, IsEmpty());
}

TEST_F(FileCreateDirTest, RefusesInvalidModes)
{
    struct Row {
        int mode;
        const char* line;
    };
    const std::vector<Row> table = {
        {01000, "Directory mode error: 1000"},
        {01777, "Directory mode error: 1777"},
        {04755, "Directory mode error: 4755"},
        {INT_MAX, "Directory mode error: 17777777777"},
        {-1, "snprintf error with mode [37777777777]"},
        {-0755, "snprintf error with mode [37777777023]"},
        {INT_MIN, "snprintf error with mode [20000000000]"},
    };
    NotePrograms();
    for (const Row& row : table) {
        EXPECT_FALSE(File::CreateDir(dir.File("new"), row.mode));
        ExpectLines({Err("CreateDir", row.line)});
    }
    EXPECT_THAT(programs, IsEmpty());
    EXPECT_THAT(NamesIn(dir.Path()), IsEmpty());
}

TEST_F(FileCreateDirTest, AFileInTheWayIsLogged)
{
    WriteFile(dir.File("file"), "stays");
    for (const std::string& place : {dir.File("file"), dir.File("file/below")}) {
        EXPECT_FALSE(File::CreateDir(place, 0755));
        ExpectLines({Err("CreateDir", "Failed to create dir [" + place + "] with mode [755]")});
    }
    EXPECT_EQ(ReadFile(dir.File("file")), "stays");
}

TEST_F(FileCreateDirTest, AProgramThatCannotBeStartedIsLogged)
{
    faults.spawn = FailingToStart(ENOENT);
    EXPECT_FALSE(File::CreateDir(dir.File("new"), 0));
    ExpectLines({Err("CreateDir", "Failed to create dir [" + dir.File("new") + "] with mode [0]")});
}

TEST_F(FileCreateDirTest, IfTheResultIsLostTheDirectoryTellsWhetherItWasMade)
{
    LoseResults();
    EXPECT_TRUE(File::CreateDir(dir.File("new"), 0755));
    WriteFile(dir.File("file"), "");
    EXPECT_FALSE(File::CreateDir(dir.File("file"), 0755));
    ExpectLines(
        {Err("CreateDir", "Failed to create dir [" + dir.File("file") + "] with mode [755]")});
}

TEST_F(FileCreateDirTest, PassesThePathUnchanged)
{
    for (const char* name : {"a b", "$HOME", "a;b", "*", "'", "\"", "\\", "a\nb", "\xff"}) {
        EXPECT_TRUE(File::CreateDir(dir.File(name), 0755));
        EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(name));
        EXPECT_TRUE(File::RemoveDir(dir.File(name)));
        EXPECT_THAT(NamesIn(dir.Path()), IsEmpty());
    }
}

// --------------------------------------------------------------------------------------- RemoveDir

TEST_F(FileRemoveDirTest, RemovesATreeByRm)
{
    std::filesystem::create_directories(dir.File("tree/a/b"));
    WriteFile(dir.File("tree/a/file"), "text");
    WriteFile(dir.File("other"), "text");
    NotePrograms();
    EXPECT_TRUE(File::RemoveDir(dir.File("tree")));
    EXPECT_THAT(programs, ElementsAre(ElementsAre("/bin/rm", "-rf", dir.File("tree"))));
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("other"));
}

TEST_F(FileRemoveDirTest, LeavesWhatIsNoDirectoryAndSucceeds)
{
    WriteFile(path, "text");
    NotePrograms();
    EXPECT_TRUE(File::RemoveDir(dir.File("missing")));
    EXPECT_TRUE(File::RemoveDir(path));
    EXPECT_TRUE(File::RemoveDir(""));
    EXPECT_THAT(programs, IsEmpty());
    EXPECT_EQ(ReadFile(path), "text");
}

TEST_F(FileRemoveDirTest, RemovesASymbolicLinkAndNotItsTarget)
{
    std::filesystem::create_directory(dir.File("target"));
    WriteFile(dir.File("target/file"), "text");
    std::filesystem::create_directory_symlink(dir.File("target"), dir.File("link"));
    EXPECT_TRUE(File::RemoveDir(dir.File("link")));
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("target"));
    EXPECT_EQ(ReadFile(dir.File("target/file")), "text");
}

TEST_F(FileRemoveDirTest, IfTheResultIsLostTheDirectoryTellsWhetherItIsGone)
{
    LoseResults();
    std::filesystem::create_directories(dir.File("tree/below"));
    EXPECT_TRUE(File::RemoveDir(dir.File("tree")));
    std::filesystem::create_directories(dir.File("tree"));
    faults.spawn = [](SpawnCall call) {  // another program, which removes nothing
        call.path = "/bin/true";
        return RealSpawn(call);
    };
    EXPECT_FALSE(File::RemoveDir(dir.File("tree")));
}

TEST_F(FileRemoveDirTest, AFailureIsNotLogged)
{
    CheckAsOrdinaryUser(dir, [&] {
        std::filesystem::create_directories(dir.File("locked/below"));
        ASSERT_EQ(::chmod(dir.File("locked").c_str(), 0500), 0);
        EXPECT_FALSE(File::RemoveDir(dir.File("locked/below")));
        ASSERT_EQ(::chmod(dir.File("locked").c_str(), 0700), 0);
        ExpectLines({});
    });
    std::filesystem::create_directories(dir.File("tree"));
    faults.spawn = FailingToStart(ENOENT);
    EXPECT_FALSE(File::RemoveDir(dir.File("tree")));
}

}  // namespace
