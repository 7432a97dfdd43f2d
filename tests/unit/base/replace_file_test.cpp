// What ReplaceFile writes, and what a failure leaves. json_file_test.cpp tests toFile, which uses it.
#include "base/replace_file.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <functional>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "support/fixtures/replace_file_fixture.h"
#include "support/fixtures/special_file.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"

namespace {

using OrvaDRCore::ReplaceFile;
using ::testing::ElementsAre;

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

class ReplaceFileTest : public ReplaceFileFixture {};

// ---------------------------------------------------------------------------------------- the text

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

// --------------------------------------------------------------------------------- permission bits

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

// ---------------------------------------------------------------------------------------- failures

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
