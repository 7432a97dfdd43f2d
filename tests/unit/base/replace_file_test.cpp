// ReplaceFile. json_file_test.cpp tests toFile, which uses it.
#include "base/replace_file.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <climits>
#include <cstdio>
#include <ctime>
#include <filesystem>
#include <functional>
#include <set>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "base/process_status.h"
#include "support/fakes/process_faults.h"
#include "support/fakes/syscall_faults.h"
#include "support/fixtures/log_capture.h"
#include "support/fixtures/special_file.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"
#include "support/processes/child_process.h"

namespace {

using OrvaDRCore::ReadProcessStatus;
using OrvaDRCore::ReplaceFile;
using ::testing::ElementsAre;
using ::testing::MatchesRegex;

constexpr const char* Name = "doc";

// Any temporary file of it.
constexpr const char* TemporaryName = "doc\\.orvadr-tmp[0-9a-f]{8}\\.[0-9]+\\.[0-9]+\\.[0-9]+";

constexpr pid_t Nobodys = INT_MAX;  // no process has this id
constexpr std::time_t Hour = 3600;

// The writer of a temporary file, according to its name.
struct Writer {
    unsigned int domain;
    pid_t pid;
    unsigned long long start;
};

std::string TextOf(const Writer& writer, unsigned int number = 0)
{
    std::array<char, 100> text{};
    (void)std::snprintf(text.data(), text.size(), "%08x.%d.%llu.%u", writer.domain, writer.pid,
                        writer.start, number);
    return text.data();
}

unsigned long long StartOf(pid_t pid)
{
    const auto status = ReadProcessStatus(pid);
    return status ? status->start : 0;
}

// Nothing here logs: the fixture fails on any line.
class ReplaceFileTest : public LoggedTest {
  protected:
    ReplaceFileTest() : LoggedTest("replace_file.cpp") {}

    // Replaces the file and returns the path of the temporary file.
    std::string ReplaceAndTell()
    {
        std::string used;
        faults.rename = [&](const char* from, const char* to) {
            used = from;
            return RealRename(from, to);
        };
        EXPECT_TRUE(ReplaceFile(path, "new"));
        faults.rename = nullptr;
        EXPECT_EQ(ReadFile(path), "new");
        return used;
    }

    // This process as a writer.
    Writer Self()
    {
        const std::string used = ReplaceAndTell();
        std::filesystem::remove(path);
        const auto domain = std::stoul(used.substr(path.size() + 11, 8), nullptr, 16);
        return {static_cast<unsigned int>(domain), ::getpid(), StartOf(::getpid())};
    }

    std::string Temporary(const Writer& writer, unsigned int number = 0) const
    {
        return path + ".orvadr-tmp" + TextOf(writer, number);
    }

    TempDir dir;
    SyscallFaults faults;
    ProcessFaults processes;
    std::string path = dir.File(Name);
};

// Writes three bytes at a time.
ssize_t WriteThreeBytes(int fd, const void* buffer, std::size_t size)
{
    return RealWrite(fd, buffer, std::min<std::size_t>(size, 3));
}

// The first call fails with an error, the others are left to `rest`.
template <class Function>
auto FailingOnce(int error, Function rest)
{
    return [error, rest, first = true](auto... arguments) mutable {
        if (!std::exchange(first, false)) return rest(arguments...);
        errno = error;
        return decltype(rest(arguments...)){-1};
    };
}

TEST_F(ReplaceFileTest, WritesTheTextByteForByte)
{
    const std::vector<std::string> texts = {"", "x", "two\nlines", Bytes("a\0b\xff\0"),
                                            std::string(3'000'000, 'z')};
    for (const std::string& text : texts) {
        EXPECT_TRUE(ReplaceFile(path, text));
        EXPECT_TRUE(ReadFile(path) == text) << text.size() << " bytes";
        EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name));
    }
}

TEST_F(ReplaceFileTest, ReplacesTheOldFileWithoutWritingToIt)
{
    WriteFile(path, "the old text");
    const std::string secondName = dir.File("second name");
    std::filesystem::create_hard_link(path, secondName);
    const ino_t inode = InodeOf(path);

    EXPECT_TRUE(ReplaceFile(path, "new"));

    EXPECT_NE(InodeOf(path), inode);
    EXPECT_EQ(InodeOf(secondName), inode);
    EXPECT_EQ(ReadFile(path), "new");
    EXPECT_EQ(ReadFile(secondName), "the old text");
}

TEST_F(ReplaceFileTest, KeepsTheOldFileUntilTheNewOneIsOnDisk)
{
    WriteFile(path, "old");
    std::vector<std::string> steps;
    ino_t flushed = 0;
    faults.write = [&](int fd, const void* buffer, std::size_t size) {
        steps.push_back("write, " + ReadFile(path));
        return WriteThreeBytes(fd, buffer, size);
    };
    faults.fsync = [&](int fd) {
        steps.push_back("flush, " + ReadFile(path));
        struct stat status {};
        EXPECT_EQ(::fstat(fd, &status), 0);
        flushed = status.st_ino;
        return RealFsync(fd);
    };
    faults.rename = [&](const char* from, const char* to) {
        steps.push_back("rename, " + ReadFile(path));
        return RealRename(from, to);
    };
    EXPECT_TRUE(ReplaceFile(path, "newer"));
    EXPECT_THAT(steps, ElementsAre("write, old", "write, old", "flush, old", "rename, old"));
    EXPECT_EQ(ReadFile(path), "newer");
    EXPECT_EQ(InodeOf(path), flushed);
}

TEST_F(ReplaceFileTest, ContinuesAfterShortWritesAndInterruptions)
{
    WriteFile(path, "old");
    faults.write = FailingOnce(EINTR, WriteThreeBytes);
    EXPECT_TRUE(ReplaceFile(path, "0123456789"));
    EXPECT_EQ(ReadFile(path), "0123456789");
}

TEST_F(ReplaceFileTest, ANewFileGetsMode0666LessTheUmask)
{
    for (const mode_t mask : {0U, 0022U, 0077U, 0777U}) {
        const Umask umask(mask);
        EXPECT_TRUE(ReplaceFile(path, "text"));
        EXPECT_EQ(ModeOf(path), 0666U & ~mask);
        std::filesystem::remove(path);
    }
}

TEST_F(ReplaceFileTest, KeepsTheBitsOfTheOldFileWhateverTheUmask)
{
    // Also for an ordinary user, for whom the kernel clears the set-user-id bit of a written file.
    const auto check = [&] {
        for (const mode_t mask : {0U, 0022U, 0077U, 0777U}) {
            for (const mode_t mode : {0600U, 0644U, 0444U, 0666U, 0777U, 01640U, 04755U, 0U}) {
                const std::string place =
                    dir.File(std::to_string(mask) + " " + std::to_string(mode));
                WriteFile(place, "old");
                ASSERT_EQ(::chmod(place.c_str(), mode), 0);
                const Umask umask(mask);
                EXPECT_TRUE(ReplaceFile(place, "new"));
                EXPECT_EQ(ModeOf(place), mode) << std::oct << "umask " << mask;
            }
        }
    };
    check();
    for (const std::string& name : NamesIn(dir.Path())) std::filesystem::remove(dir.File(name));
    CheckAsOrdinaryUser(dir, check);
}

TEST_F(ReplaceFileTest, KeepsOnlyTheBitsOfARegularFile)
{
    const Umask umask(0022);
    for (const SpecialFile::Kind kind : SpecialFile::Kinds()) {
        if (kind == SpecialFile::Kind::Directory) continue;  // a file cannot replace it
        const SpecialFile special(kind, path, "text");
        EXPECT_TRUE(ReplaceFile(path, "new")) << kind;
        EXPECT_EQ(ReadFile(path), "new");
        EXPECT_EQ(ModeOf(path), 0644U) << kind;
    }
}

TEST_F(ReplaceFileTest, AGivenModeOverridesTheUmaskAndTheOldBits)
{
    for (const mode_t mask : {0U, 0077U}) {
        for (const mode_t mode : {0600U, 0644U, 0666U, 04755U, 0U}) {
            const Umask umask(mask);
            std::filesystem::remove(path);
            EXPECT_TRUE(ReplaceFile(path, "new file", mode));
            EXPECT_EQ(ModeOf(path), mode);
            ASSERT_EQ(::chmod(path.c_str(), 0640), 0);
            EXPECT_TRUE(ReplaceFile(path, "over an old one", mode));
            EXPECT_EQ(ModeOf(path), mode);
        }
    }
}

TEST_F(ReplaceFileTest, ASecretIsNeverReadableByOthers)
{
    WriteFile(path, "old secret");
    ASSERT_EQ(::chmod(path.c_str(), 0600), 0);
    const Umask umask(0);
    std::vector<mode_t> modes;
    const auto note = [&](int fd) {
        struct stat status {};
        EXPECT_EQ(::fstat(fd, &status), 0);
        modes.push_back(status.st_mode & 07777);
    };
    faults.open = [&](const char* name, int flags, mode_t mode) {
        const int fd = RealOpen(name, flags, mode);
        if ((flags & O_CREAT) != 0) note(fd);
        return fd;
    };
    faults.write = [&](int fd, const void* buffer, std::size_t size) {
        note(fd);
        return RealWrite(fd, buffer, size);
    };
    EXPECT_TRUE(ReplaceFile(path, "new secret"));
    EXPECT_THAT(modes, ElementsAre(0600, 0600));
}

TEST_F(ReplaceFileTest, ReplacesAFileWithoutWritePermission)
{
    CheckAsOrdinaryUser(dir, [&] {
        WriteFile(path, "old");
        ASSERT_EQ(::chmod(path.c_str(), 0444), 0);
        EXPECT_TRUE(ReplaceFile(path, "new"));
        EXPECT_EQ(ReadFile(path), "new");
    });
}

TEST_F(ReplaceFileTest, ReplacesASymbolicLinkWithoutFollowingIt)
{
    const std::string target = dir.File("target");
    const auto check = [&] {
        EXPECT_TRUE(ReplaceFile(path, "new"));
        EXPECT_FALSE(std::filesystem::is_symlink(path));
        EXPECT_EQ(ReadFile(path), "new");
    };
    std::filesystem::create_symlink(target, path);
    check();
    EXPECT_FALSE(std::filesystem::exists(target));

    WriteFile(target, "the target's");
    std::filesystem::remove(path);
    std::filesystem::create_symlink(target, path);
    check();
    EXPECT_EQ(ReadFile(target), "the target's");
}

// -------------------------------------------------------------------- ReplaceFile: temporary files

TEST_F(ReplaceFileTest, ATemporaryFileIsNamedAfterItsWriter)
{
    const Writer self = Self();
    EXPECT_NE(self.domain, 0U);
    EXPECT_EQ(ReplaceAndTell(), Temporary(self));
    CheckInChild([&] {
        const pid_t pid = ::getpid();
        EXPECT_EQ(ReplaceAndTell(), Temporary({self.domain, pid, StartOf(pid)}));
    });
}

struct Planted {
    const char* what;
    std::function<void(const std::string& name)> plant;
};

TEST_F(ReplaceFileTest, NeverWritesThroughWhatHasTheTemporaryName)
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

TEST_F(ReplaceFileTest, FailsWhenEveryTemporaryNameIsTaken)
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

TEST_F(ReplaceFileTest, ManyThreadsMayReplaceOneFile)
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

// Locks fail on some file systems, and on others each machine has locks of its own.
TEST_F(ReplaceFileTest, TakesNoLock)
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

// ------------------------------------------------------------------------- ReplaceFile: left-overs

TEST_F(ReplaceFileTest, TheNextWriterRemovesTheFileOfOneKilledAtAnyStep)
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

TEST_F(ReplaceFileTest, AStoppedWriterKeepsItsFileAndCompletesLater)
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

class LeftOverTest : public ReplaceFileTest {
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

TEST_F(LeftOverTest, AFileOfADeadProcessIsRemovedAndOfALivingOneKept)
{
    const ChildProcess living([](ChildProcess::Link& link) { link.Await(); });
    ChildProcess zombie([](ChildProcess::Link& /*link*/) {});
    siginfo_t ended{};
    ASSERT_EQ(::waitid(P_PID, static_cast<id_t>(zombie.Pid()), &ended, WEXITED | WNOWAIT), 0);
    const unsigned long long start = StartOf(living.Pid());

    EXPECT_TRUE(GoesOf({domain, Nobodys, 1}));
    EXPECT_TRUE(GoesOf({domain, Nobodys, 0}));
    EXPECT_TRUE(GoesOf({domain, zombie.Pid(), StartOf(zombie.Pid())}));
    EXPECT_TRUE(GoesOf({domain, living.Pid(), start + 1}));  // an earlier process had the id
    for (const std::time_t age : {0L, 100 * Hour}) {
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

// ----------------------------------------------------------------------- ReplaceFile: the new file

TEST_F(ReplaceFileTest, ReturnsTheStatusOfItsOwnFileEvenIfThatWasReplaced)
{
    struct stat made {};
    ino_t inode = 0;
    faults.rename = [&](const char* from, const char* to) {
        inode = InodeOf(from);
        const int result = RealRename(from, to);
        WriteFile(dir.File("another"), "another's");
        EXPECT_EQ(RealRename(dir.File("another").c_str(), to), 0);
        return result;
    };
    EXPECT_TRUE(ReplaceFile(path, "new", 0640, &made));
    EXPECT_EQ(made.st_ino, inode);
    EXPECT_EQ(made.st_size, 3);
    EXPECT_EQ(made.st_mode & 07777, 0640U);
    EXPECT_NE(InodeOf(path), inode);
}

// --------------------------------------------------------------------------- ReplaceFile: failures

struct Fault {
    const char* what;
    int error;
    std::function<void(SyscallFaults&)> provoke;
};

std::vector<Fault> Faults()
{
    return {
        {"no descriptor is free", EMFILE, [](auto& faults) { faults.open = Failing(EMFILE); }},
        {"the disk is full", ENOSPC, [](auto& faults) { faults.write = Failing(ENOSPC); }},
        {"the disk fills up halfway", ENOSPC,
         [](auto& faults) {
             faults.write = [](int fd, const void* buffer, std::size_t size) -> ssize_t {
                 return size > 3 ? WriteThreeBytes(fd, buffer, size) : Failing(ENOSPC)();
             };
         }},
        {"the bits cannot be set", EPERM, [](auto& faults) { faults.fchmod = Failing(EPERM); }},
        {"the disk does not take it", EIO, [](auto& faults) { faults.fsync = Failing(EIO); }},
        {"the name cannot be taken", EROFS, [](auto& faults) { faults.rename = Failing(EROFS); }},
    };
}

TEST_F(ReplaceFileTest, AFailureLeavesTheOldFileAndNoTemporaryOne)
{
    WriteFile(path, "old");
    ASSERT_EQ(::chmod(path.c_str(), 0640), 0);
    const ino_t inode = InodeOf(path);
    for (const Fault& row : Faults()) {
        SCOPED_TRACE(row.what);
        const std::size_t descriptors = CountDescriptors();
        row.provoke(faults);
        errno = 0;
        const bool replaced = ReplaceFile(path, "the new text");
        const int error = errno;
        faults.Clear();

        EXPECT_FALSE(replaced);
        EXPECT_EQ(error, row.error);
        EXPECT_EQ(ReadFile(path), "old");
        EXPECT_EQ(InodeOf(path), inode);
        EXPECT_EQ(ModeOf(path), 0640U);
        EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name));
        EXPECT_EQ(CountDescriptors(), descriptors);
    }
    EXPECT_TRUE(ReplaceFile(path, "the new text"));
    EXPECT_EQ(ReadFile(path), "the new text");
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

// Each writer begins while the one before it writes.
TEST_F(ReplaceFileTest, ManyThreadsMayReplaceAFileWithTheLongestName)
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

TEST_F(ReplaceFileTest, ANameWithRoomForTheLongestEndingIsNotShortened)
{
    path = dir.File(std::string(199, 'n'));
    EXPECT_EQ(ReplaceAndTell().substr(0, path.size() + 11), path + ".orvadr-tmp");
}

TEST_F(ReplaceFileTest, AFailureMakesNoFileWhereNoneWas)
{
    faults.write = Failing(ENOSPC);
    EXPECT_FALSE(ReplaceFile(path, "text"));
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre());
}

TEST_F(ReplaceFileTest, ErrnoIsOfTheFailureEvenIfTheCleanupFails)
{
    faults.rename = [](const char* from, const char* /*to*/) {
        EXPECT_EQ(::unlink(from), 0);
        return Failing(EROFS)();
    };
    errno = 0;
    EXPECT_FALSE(ReplaceFile(path, "text"));
    EXPECT_EQ(errno, EROFS);
}

TEST_F(ReplaceFileTest, RefusesAPathWhereNoFileCanBe)
{
    std::filesystem::create_directory(dir.File("dir"));
    WriteFile(dir.File("file"), "a file");
    WriteFile(dir.File(std::string(250, 'n')), "old");
    const std::set<std::string> names = NamesIn(dir.Path());
    struct Row {
        std::string name;
        int error;
    };
    const std::vector<Row> table = {
        {"missing/doc", ENOENT},
        {"dir", EISDIR},
        {"file/doc", ENOTDIR},
        {std::string(300, 'n'), ENAMETOOLONG},
    };
    for (const Row& row : table) {
        errno = 0;
        EXPECT_FALSE(ReplaceFile(dir.File(row.name), "new")) << row.name;
        EXPECT_EQ(errno, row.error) << row.name;
        EXPECT_EQ(NamesIn(dir.Path()), names);
    }
    EXPECT_THAT(NamesIn(dir.File("dir")), ElementsAre());
    EXPECT_EQ(ReadFile(dir.File("file")), "a file");
    EXPECT_EQ(ReadFile(dir.File(std::string(250, 'n'))), "old");
}

TEST_F(ReplaceFileTest, RefusesAnEmptyPath)
{
    CheckInChild([&] {
        ASSERT_EQ(::chdir(dir.Path().c_str()), 0);
        errno = 0;
        EXPECT_FALSE(ReplaceFile("", "text"));
        EXPECT_EQ(errno, ENOENT);
        EXPECT_THAT(NamesIn("."), ElementsAre());
    });
}

TEST_F(ReplaceFileTest, FailsInADirectoryThatCannotBeWritten)
{
    CheckAsOrdinaryUser(dir, [&] {
        WriteFile(path, "old");
        ASSERT_EQ(::chmod(dir.Path().c_str(), 0500), 0);
        errno = 0;
        EXPECT_FALSE(ReplaceFile(path, "new"));
        EXPECT_EQ(errno, EACCES);
        EXPECT_EQ(ReadFile(path), "old");
        EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name));
        ASSERT_EQ(::chmod(dir.Path().c_str(), 0700), 0);
    });
}

}  // namespace
