// The temporary file that ReplaceFile writes: its name, and other writers' files.
#include "base/replace_file.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <climits>
#include <filesystem>
#include <string>
#include <thread>
#include <vector>

#include "support/fixtures/replace_file_fixture.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"

namespace {

using OrvaDRCore::ReplaceFile;
using ::testing::ElementsAre;

class TemporaryFileTest : public ReplaceFileFixture {};

TEST_F(TemporaryFileTest, ATemporaryFileIsNamedAfterItsWriter)
{
    const Writer self = Self();
    EXPECT_NE(self.domain, 0U);
    EXPECT_EQ(ReplaceAndTell(), Temporary(self));
    CheckInChild([&] {
        const pid_t pid = ::getpid();
        EXPECT_EQ(ReplaceAndTell(), Temporary({self.domain, pid, StartOf(pid)}));
    });
}

TEST_F(TemporaryFileTest, NeverWritesThroughWhatHasTheTemporaryName)
{
    const std::string target = dir.File("target");
    const std::vector<Planted> table = {
        {"a file", [](auto& name) { WriteFile(name, "planted"); }},
        {"a link to a file", [&](auto& name) { std::filesystem::create_symlink(target, name); }},
        {"a link to the file itself",
         [&](auto& name) { std::filesystem::create_symlink(path, name); }},
        {"a link to nothing",
         [&](auto& name) { std::filesystem::create_symlink(dir.File("nothing"), name); }},
        {"a link to a directory",
         [&](auto& name) { std::filesystem::create_symlink(dir.Path(), name); }},
        {"a directory", [&](auto& name) { std::filesystem::create_directory(name); }},
        {"a pipe", [](auto& name) { EXPECT_EQ(::mkfifo(name.c_str(), 0600), 0); }},
    };
    const Writer self = Self();
    WriteFile(target, "the target's");
    for (const Planted& row : table) {
        SCOPED_TRACE(row.what);
        WriteFile(path, "old");
        row.plant(Temporary(self));
        EXPECT_EQ(ReplaceAndTell(), Temporary(self, 1));
        EXPECT_FALSE(std::filesystem::is_symlink(path));
        EXPECT_EQ(ReadFile(target), "the target's");
        EXPECT_EQ(NamesIn(dir.Path()).size(), 3U);
        std::filesystem::remove(Temporary(self));
    }
}

TEST_F(TemporaryFileTest, FailsWhenEveryTemporaryNameIsTaken)
{
    WriteFile(path, "old");
    std::size_t attempts = 0;
    faults.open = [&](const char* name, int flags, mode_t mode) {
        if ((flags & O_CREAT) == 0) return RealOpen(name, flags, mode);
        ++attempts;
        return Failing(EEXIST)();
    };
    errno = 0;
    EXPECT_FALSE(ReplaceFile(path, "new"));
    EXPECT_EQ(errno, EEXIST);
    EXPECT_EQ(attempts, 10'000U);
    EXPECT_EQ(ReadFile(path), "old");
}

TEST_F(TemporaryFileTest, ManyThreadsMayReplaceOneFile)
{
    constexpr int Rounds = 50;
    const std::array<std::string, 8> texts = {"a", "bb", "ccc", "d", "ee", "fff", "g", "hh"};
    std::vector<std::thread> threads;
    threads.reserve(texts.size());
    for (const std::string& text : texts) {
        threads.emplace_back([&, text] {
            for (int round = 0; round < Rounds; ++round) EXPECT_TRUE(ReplaceFile(path, text));
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_THAT(texts, ::testing::Contains(ReadFile(path)));
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name));
}

// Each writer begins while the one before it writes.
TEST_F(TemporaryFileTest, ManyThreadsMayReplaceAFileWithTheLongestName)
{
    constexpr std::size_t Writers = 100;
    const std::string longest = dir.File(std::string(NAME_MAX, 'n'));
    std::size_t writers = 0;
    faults.write = [&](int fd, const void* buffer, std::size_t size) {
        if (++writers < Writers) {
            EXPECT_TRUE(ReplaceFile(longest, "text"));
        }
        return RealWrite(fd, buffer, size);
    };
    EXPECT_TRUE(ReplaceFile(longest, "text"));
    EXPECT_EQ(writers, Writers);
    EXPECT_EQ(ReadFile(longest), "text");
    EXPECT_EQ(NamesIn(dir.Path()).size(), 1U);
}

TEST_F(TemporaryFileTest, ANameWithRoomForTheLongestEndingIsNotShortened)
{
    path = dir.File(std::string(199, 'n'));
    EXPECT_EQ(ReplaceAndTell().substr(0, path.size() + 11), path + ".orvadr-tmp");
}

// Locks fail on some file systems, and on others each machine has locks of its own.
TEST_F(TemporaryFileTest, TakesNoLock)
{
    faults.flock = [](int /*fd*/, int /*operation*/) {
        ADD_FAILURE();
        return Failing(ENOLCK)();
    };
    faults.fcntl = [](int /*fd*/, int /*command*/, void* /*argument*/) {
        ADD_FAILURE();
        return Failing(ENOLCK)();
    };
    EXPECT_TRUE(ReplaceFile(path, "text"));
    EXPECT_EQ(ReadFile(path), "text");
}

}  // namespace
