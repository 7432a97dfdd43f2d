// GetParentDir and IsRegularFile. Reading, writing and directories have tests of their own.
#include <orvadrcore/file.h>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <string>
#include <vector>

#include "support/fixtures/file_fixture.h"

namespace {

using OrvaDRCore::File;

class FileTest : public FileFixture {};

TEST_F(FileTest, TheParentDirectoryIsTheTextBeforeTheLastSlash)
{
    struct Row {
        const char* path;
        const char* parent;
    };
    const std::vector<Row> table = {
        {"a/b/c", "a/b"}, {"/a/b/c", "/a/b"}, {"/a/b/", "/a/b"}, {"a/", "a"},        {"abc", "abc"},
        {"/abc", ""},     {"/", ""},          {"", ""},          {"//", "/"},        {"//a", "/"},
        {"a//b", "a/"},   {"./a", "."},       {"../", ".."},     {"a/../b", "a/.."},
    };
    for (const Row& row : table) EXPECT_EQ(File::GetParentDir(row.path), row.parent) << row.path;
}

TEST_F(FileTest, IsRegularFileOnlyForARegularFile)
{
    struct Row {
        std::string name;
        bool isRegular;
    };
    WriteFile(path, "");
    std::filesystem::create_symlink(path, dir.File("link"));
    ASSERT_EQ(::mkfifo(dir.File("pipe").c_str(), 0600), 0);
    const std::vector<Row> table = {{path, true},
                                    {dir.File("link"), true},
                                    {dir.Path(), false},
                                    {dir.File("pipe"), false},
                                    {"/dev/null", false}};
    for (const Row& row : table) {
        const int fd = OpenFile(row.name, O_RDONLY | O_NONBLOCK);
        EXPECT_EQ(File::IsRegularFile(fd), row.isRegular) << row.name;
        ::close(fd);
        EXPECT_FALSE(File::IsRegularFile(fd)) << row.name;
    }
    EXPECT_FALSE(File::IsRegularFile(-1));
}

}  // namespace
