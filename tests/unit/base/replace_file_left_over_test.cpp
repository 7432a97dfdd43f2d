// Temporary files of writers that were killed, and who removes them.
#include "base/replace_file.h"

#include <gmock/gmock.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <ctime>
#include <filesystem>
#include <functional>
#include <stdexcept>
#include <string>
#include <vector>

#include "support/fixtures/replace_file_fixture.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"
#include "support/processes/child_process.h"
#include "support/processes/reap.h"

namespace {

using OrvaDRCore::ReplaceFile;
using ::testing::ElementsAre;
using ::testing::MatchesRegex;

// The name of a temporary file of "doc".
constexpr const char* TemporaryName = "doc\\.orvadr-tmp[0-9a-f]{8}\\.[0-9]+\\.[0-9]+\\.[0-9]+";

class LeftOverTest : public ReplaceFileFixture {
  protected:
    // Whether replacing the path removes a file of that name.
    bool Goes(const std::string& name, std::time_t age = 0)
    {
        WriteFile(name, "left over");
        SetModifyTime(name, std::time(nullptr) - age);
        EXPECT_TRUE(ReplaceFile(path, "new"));
        EXPECT_EQ(ReadFile(path), "new");
        const bool isThere = std::filesystem::remove(name);
        EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name));
        return !isThere;
    }
    bool GoesOf(const Writer& writer, std::time_t age = 0) { return Goes(Temporary(writer), age); }

    const unsigned int domain = Self().domain;
    const unsigned int otherDomain = domain ^ 1;
};

TEST_F(LeftOverTest, TheNextWriterRemovesTheFileOfOneKilledAtAnyStep)
{
    struct Step {
        const char* name;
        std::function<void(const std::function<void()>& halt)> haltAt;
    };
    const std::vector<Step> table = {
        {"write",
         [&](auto& halt) {
             faults.write = [&](int fd, const void* buffer, std::size_t size) {
                 if (size == 8) halt();  // after three of eleven bytes
                 return WriteThreeBytes(fd, buffer, size);
             };
         }},
        {"fchmod",
         [&](auto& halt) {
             faults.fchmod = [&](int fd, mode_t mode) {
                 halt();
                 return RealFchmod(fd, mode);
             };
         }},
        {"fsync",
         [&](auto& halt) {
             faults.fsync = [&](int fd) {
                 halt();
                 return RealFsync(fd);
             };
         }},
        {"rename",
         [&](auto& halt) {
             faults.rename = [&](const char* from, const char* to) {
                 halt();
                 return RealRename(from, to);
             };
         }},
    };
    for (const Step& step : table) {
        SCOPED_TRACE(step.name);
        WriteFile(path, "old");
        ChildProcess writer([&](ChildProcess::Link& link) {
            const std::function<void()> halt = [&] {
                link.Tell();
                link.Await();
            };
            step.haltAt(halt);
            ReplaceFile(path, "of the dead");
        });
        ASSERT_TRUE(writer.Await());
        writer.Kill(SIGKILL);
        EXPECT_EQ(writer.Join(), 128 + SIGKILL);
        EXPECT_EQ(ReadFile(path), "old");
        EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name, MatchesRegex(TemporaryName)));

        EXPECT_TRUE(ReplaceFile(path, "of the living"));
        EXPECT_EQ(ReadFile(path), "of the living");
        EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name));
    }
}

TEST_F(LeftOverTest, AStoppedWriterKeepsItsFileAndCompletesLater)
{
    ChildProcess first([&](ChildProcess::Link& link) {
        faults.fsync = [&](int fd) {
            link.Tell();
            (void)::raise(SIGSTOP);
            return RealFsync(fd);
        };
        if (!ReplaceFile(path, "first")) throw std::runtime_error("not replaced");
    });
    const std::string temporary = Temporary({Self().domain, first.Pid(), StartOf(first.Pid())});
    ASSERT_TRUE(first.Await());
    int status = 0;
    ASSERT_EQ(::waitpid(first.Pid(), &status, WUNTRACED), first.Pid());
    ASSERT_TRUE(WIFSTOPPED(status));

    EXPECT_TRUE(ReplaceFile(path, "second"));
    EXPECT_EQ(ReadFile(path), "second");
    EXPECT_EQ(ReadFile(temporary), "first");

    first.Kill(SIGCONT);
    EXPECT_EQ(first.Join(), 0);
    EXPECT_EQ(ReadFile(path), "first");
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name));
}

TEST_F(LeftOverTest, AFileOfADeadProcessIsRemovedAndOfALivingOneKept)
{
    const ChildProcess living([](ChildProcess::Link& link) { link.Await(); });
    ChildProcess zombie([](ChildProcess::Link& /*link*/) {});
    AwaitZombie(zombie.Pid());
    const unsigned long long start = StartOf(living.Pid());

    EXPECT_TRUE(GoesOf({domain, Nobodys, 1}));
    EXPECT_TRUE(GoesOf({domain, Nobodys, 0}));
    EXPECT_TRUE(GoesOf({domain, zombie.Pid(), StartOf(zombie.Pid())}));
    EXPECT_TRUE(GoesOf({domain, living.Pid(), start + 1}));  // an earlier process had the id
    for (const std::time_t age : {std::time_t{0}, 100 * Hour}) {
        EXPECT_FALSE(GoesOf({domain, living.Pid(), start}, age));
        EXPECT_FALSE(GoesOf({domain, living.Pid(), 0}, age));
        EXPECT_FALSE(GoesOf({domain, ::getpid(), StartOf(::getpid())}, age));
    }
}

// On a network file system, or a volume that containers share, process ids are not unique.
TEST_F(LeftOverTest, AFileOfAnotherMachineOrContainerIsRemovedAfterAnHour)
{
    for (const pid_t pid : {Nobodys, ::getpid()}) {
        for (const unsigned int other : {otherDomain, 0U}) {
            const Writer writer{other, pid, StartOf(::getpid())};
            EXPECT_FALSE(GoesOf(writer));
            EXPECT_FALSE(GoesOf(writer, Hour - 10));
            EXPECT_TRUE(GoesOf(writer, Hour + 10));
            EXPECT_FALSE(GoesOf(writer, -Hour - 10));  // in the future
        }
    }
}

TEST_F(LeftOverTest, WithoutProcAnIdInUseIsAlive)
{
    faults.open = [](const char* name, int flags, mode_t mode) {
        const bool isHidden = std::string(name).rfind("/proc/", 0) == 0;
        return isHidden ? Failing(ENOENT)() : RealOpen(name, flags, mode);
    };
    EXPECT_EQ(ReplaceAndTell(), Temporary({domain, ::getpid(), 0}));
    EXPECT_TRUE(GoesOf({domain, Nobodys, 1}));
    EXPECT_FALSE(GoesOf({domain, ::getppid(), 1}));
}

TEST_F(LeftOverTest, WithAnUnknownDomainOnlyTheHourCounts)
{
    faults.readlink = Failing(ENOENT);
    const Writer self{0, ::getpid(), StartOf(::getpid())};
    EXPECT_EQ(ReplaceAndTell(), Temporary(self));
    for (const unsigned int each : {0U, domain}) {
        EXPECT_FALSE(GoesOf({each, Nobodys, 1}));
        EXPECT_TRUE(GoesOf({each, Nobodys, 1}, Hour + 10));
    }
}

TEST_F(LeftOverTest, AFileWithAnotherKindOfNameStays)
{
    const std::string dead = TextOf({domain, Nobodys, 1});
    const std::string hex = dead.substr(0, 9);
    const std::vector<std::string> table = {
        "orvadr-tmp" + dead,
        ".orvadr-tmp",
        ".orvadr-tmp0",
        ".orvadr-tmp" + hex,
        ".orvadr-tmp" + hex + "2147483647",
        ".orvadr-tmp" + hex + "2147483647.1",
        ".orvadr-tmp" + hex + "2147483647.1.",
        ".orvadr-tmp" + dead + ".",
        ".orvadr-tmp" + dead + ".0",
        ".orvadr-tmp" + dead + "x",
        ".orvadr-tmp." + dead,
        ".orvadr-tmp0" + dead,
        ".orvadr-tmpABCDEF01.2147483647.1.0",
        ".orvadr-tmp1234567.2147483647.1.0",
        ".orvadr-tmp" + hex + "0.1.0",
        ".orvadr-tmp" + hex + "-1.1.0",
        ".orvadr-tmp" + hex + "+2147483647.1.0",
        ".orvadr-tmp" + hex + "02147483647.1.0",
        ".orvadr-tmp" + hex + "2147483648.1.0",
        ".orvadr-tmp" + hex + "2147483647.18446744073709551616.0",
        ".orvadr-tmp" + hex + "2147483647.1.4294967296",
        ".orvadr-tmp" + hex + "2147483647..0",
        ".orvadr-tmp" + hex + " 2147483647.1.0",
    };
    for (const std::string& ending : table) {
        EXPECT_FALSE(Goes(path + ending, 100 * Hour)) << ending;
    }
    EXPECT_TRUE(Goes(path + ".orvadr-tmp" + hex + "2147483647.18446744073709551615.4294967295"));
}

TEST_F(LeftOverTest, AFileBesideAnotherPathStays)
{
    const std::string ending = ".orvadr-tmp" + TextOf({domain, Nobodys, 1});
    for (const char* other : {"do", "docs", "doc.pid", "a doc", ""}) {
        EXPECT_FALSE(Goes(dir.File(other + ending))) << other;
    }
    EXPECT_TRUE(Goes(dir.File(Name + ending)));
}

TEST_F(LeftOverTest, AnythingButARegularFileStays)
{
    const std::string target = dir.File("target");
    const std::string name = Temporary({domain, Nobodys, 1});
    const std::vector<Planted> table = {
        {"a link", [&](auto& place) { std::filesystem::create_symlink(target, place); }},
        {"a directory", [](auto& place) { std::filesystem::create_directory(place); }},
        {"a pipe", [](auto& place) { EXPECT_EQ(::mkfifo(place.c_str(), 0600), 0); }},
    };
    for (const Planted& row : table) {
        SCOPED_TRACE(row.what);
        WriteFile(target, "the target's");
        row.plant(name);
        EXPECT_TRUE(ReplaceFile(path, "new"));
        EXPECT_EQ(ReadFile(path), "new");
        EXPECT_EQ(ReadFile(target), "the target's");
        EXPECT_TRUE(std::filesystem::remove(name));
    }
}

TEST_F(LeftOverTest, IsRemovedInTheWorkingDirectoryToo)
{
    CheckInChild([&] {
        ASSERT_EQ(::chdir(dir.Path().c_str()), 0);
        WriteFile(Temporary({domain, Nobodys, 1}), "left over");
        EXPECT_TRUE(ReplaceFile(Name, "new"));
        EXPECT_THAT(NamesIn("."), ElementsAre(Name));
    });
}

TEST_F(LeftOverTest, StaysInADirectoryThatCannotBeListed)
{
    const std::string name = Temporary({domain, Nobodys, 1});
    WriteFile(name, "left over");
    CheckAsOrdinaryUser(dir, [&] {
        ASSERT_EQ(::chmod(dir.Path().c_str(), 0300), 0);
        EXPECT_TRUE(ReplaceFile(path, "new"));
        ASSERT_EQ(::chmod(dir.Path().c_str(), 0700), 0);
        EXPECT_EQ(ReadFile(path), "new");
        EXPECT_EQ(ReadFile(name), "left over");
    });
}

TEST_F(LeftOverTest, ALargeDirectoryIsListedCompletelyOnceASecond)
{
    constexpr unsigned int Looked = 4000;
    constexpr unsigned int More = 100;
    EXPECT_TRUE(ReplaceFile(path, "old"));
    for (unsigned int number = 0; number < Looked + More; ++number) {
        WriteFile(Temporary({domain, Nobodys, 1}, number), "");
    }
    // Among the first names may be those of the directory, its parent and the file.
    const auto left = [this] { return NamesIn(dir.Path()).size() - 1; };
    SetModifyTime(path, std::time(nullptr));
    processes.time = [now = std::time(nullptr)] { return now; };
    EXPECT_TRUE(ReplaceFile(path, "new"));
    EXPECT_GE(left(), More);
    EXPECT_LE(left(), More + 3);
    processes.time = [later = std::time(nullptr) + 10] { return later; };
    EXPECT_TRUE(ReplaceFile(path, "newer"));
    EXPECT_EQ(left(), 0U);
}

// Another machine may take it for a left-over after it has written for more than an hour.
TEST_F(LeftOverTest, AWriterWhoseFileWasRemovedFails)
{
    WriteFile(path, "old");
    faults.fsync = [&](int fd) {
        for (const std::string& name : NamesIn(dir.Path())) {
            if (name != Name) std::filesystem::remove(dir.File(name));
        }
        return RealFsync(fd);
    };
    errno = 0;
    EXPECT_FALSE(ReplaceFile(path, "new"));
    EXPECT_EQ(errno, ENOENT);
    EXPECT_EQ(ReadFile(path), "old");
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name));
}

TEST_F(LeftOverTest, AFileWithTheLongestNameIsReplacedAndItsLeftOversRemoved)
{
    path = dir.File(std::string(NAME_MAX, 'n'));
    const std::string beginning = dir.File(std::string(NAME_MAX - 56, 'n'));
    EXPECT_EQ(ReplaceAndTell(),
              beginning + ".orvadr-tmp" + TextOf({domain, ::getpid(), StartOf(::getpid())}));
    const std::string longest = "ffffffff.2147483647.18446744073709551615.9999";
    WriteFile(beginning + ".orvadr-tmp" + longest, "left over");
    WriteFile(beginning + ".orvadr-tmp" + TextOf({domain, Nobodys, 1}), "left over");
    SetModifyTime(beginning + ".orvadr-tmp" + longest, 1);
    EXPECT_TRUE(ReplaceFile(path, "new"));
    EXPECT_EQ(NamesIn(dir.Path()).size(), 1U);
}

}  // namespace
