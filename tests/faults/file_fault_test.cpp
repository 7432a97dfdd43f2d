// File and the JSON files, with every call failing once.
#include <fcntl.h>
#include <orvadrcore/file.h>
#include <unistd.h>

#include <cstdint>
#include <filesystem>
#include <map>
#include <new>
#include <string>

#include "base/file_io.h"
#include "base/json_helpers.h"
#include "fault.h"
#include "support/fakes/allocation_faults.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"

using OrvaDRCore::File;
using OrvaDRCore::fromFile;
using OrvaDRCore::fromString;
using OrvaDRCore::toFile;
using OrvaDRCore::toString;

namespace {

// Too long for a std::string without an allocation.
const char* const Old = R"({"name":"the document that was there before"})";
const char* const New = R"({"name":"the document that takes its place"})";

Json::Value Document(const std::string& text)
{
    Json::Value value;
    EXPECT_TRUE(fromString(value, text));
    return value;
}

// A directory with a file in it.
struct Place {
    explicit Place(const std::string& content) { WriteFile(path, content); }

    TempDir dir;
    std::string path = dir.File("document.json");
};

// Replaces the file with a fault and again without. Afterwards the directory holds the old or the
// new file and nothing else.
void ExpectReplacement(const Place& place)
{
    const Json::Value value = Document(New);
    const Outcome outcome = WithFault([&] { return toFile(value, place.path); });
    EXPECT_EQ(ReadFile(place.path), outcome.succeeded ? New : Old);
    EXPECT_TRUE(toFile(value, place.path));
    EXPECT_EQ(ReadFile(place.path), New);
    EXPECT_EQ(NamesIn(place.dir.Path()).size(), 1U) << "a temporary file is left";
}

// Lets the first `count` allocations succeed.
class ShortMemory {
  public:
    explicit ShortMemory(int count)
    {
        left = count;
        AskBeforeAllocating([] { return left-- <= 0; });
    }
    ShortMemory(const ShortMemory&) = delete;
    ShortMemory& operator=(const ShortMemory&) = delete;
    ~ShortMemory() { AskBeforeAllocating(nullptr); }

  private:
    static inline int left = 0;
};

}  // namespace

// A 32-bit machine cannot hold it. The memory of a few megabytes stands in for that.
TEST(FileFaults, AFileLargerThanTheMemoryLeavesTheResultAsItWas)
{
    const Place place("a=1\nb=2\n");
    Lengthen(place.path, std::int64_t{3} << 30U);
    std::map<std::string, int> pairs{{"old", 1}};
    Json::Value value("old");
    {
        const ShortMemory memory(14);
        EXPECT_THROW(File::Read(place.path, pairs), std::bad_alloc);
    }
    {
        const ShortMemory memory(14);
        EXPECT_THROW(File::Read(place.path, value), std::bad_alloc);
    }
    EXPECT_EQ(pairs, (std::map<std::string, int>{{"old", 1}}));
    EXPECT_EQ(value, "old");
}

TEST(FileFaults, ToFile)
{
    EveryCallFails("toFile", [] {
        const Place place(Old);
        ExpectReplacement(place);
    });
}

TEST(FileFaults, ToFileBesideALeftoverTemporaryFile)
{
    EveryCallFails("toFile beside a left-over", [] {
        const Place place(Old);
        DieWriting([&] { toFile(Document(Old), place.path); });
        EXPECT_EQ(NamesIn(place.dir.Path()).size(), 2U);
        ExpectReplacement(place);
    });
}

TEST(FileFaults, FromFile)
{
    EveryCallFails("fromFile", [] {
        const Place place(New);
        const Json::Value old = Document(Old);
        Json::Value value = old;
        const Outcome outcome = WithFault([&] { return fromFile(value, place.path); });
        EXPECT_EQ(toString(value), outcome.succeeded ? New : Old);
        EXPECT_TRUE(fromFile(value, place.path));
        EXPECT_EQ(toString(value), New);
    });
}

TEST(FileFaults, ReadByPath)
{
    EveryCallFails("File::Read(path)", [] {
        const Place place(New);
        Json::Value value = Document(Old);
        const Outcome outcome = WithFault([&] { return File::Read(place.path, value); });
        // Without the file, reading succeeds and reads nothing.
        EXPECT_TRUE(toString(value) == Old || (outcome.succeeded && toString(value) == New));
        EXPECT_TRUE(File::Read(place.path, value));
        EXPECT_EQ(toString(value), New);
    });
}

TEST(FileFaults, ReadByDescriptor)
{
    EveryCallFails("File::Read(fd)", [] {
        const Place place(New);
        Json::Value value = Document(Old);
        const int fd = OpenFile(place.path, O_RDONLY);
        const Outcome outcome = WithFault([&] { return File::Read(fd, value); });
        EXPECT_EQ(toString(value), outcome.succeeded ? New : Old);
        // The descriptor stays open when no stream can be made from it.
        if (IsDescriptorOpen(fd)) {
            outcome.ExpectLogged();
            ::close(fd);
        }
        EXPECT_TRUE(File::Read(OpenFile(place.path, O_RDONLY), value));
        EXPECT_EQ(toString(value), New);
    });
}

TEST(FileFaults, WriteByPath)
{
    EveryCallFails("File::Write(path)", [] {
        const Place place(Old);
        const Json::Value value = Document(New);
        const Outcome outcome = WithFault([&] { return File::Write(place.path, value); });
        outcome.ExpectLogged();
        if (outcome.succeeded) {
            EXPECT_EQ(ReadFile(place.path), New + std::string("\n"));
        }
        EXPECT_TRUE(File::Write(place.path, value));
        EXPECT_EQ(ReadFile(place.path), New + std::string("\n"));
    });
}

TEST(FileFaults, WriteByDescriptor)
{
    EveryCallFails("File::Write(fd)", [] {
        const Place place("");
        const Json::Value value = Document(New);
        const int fd = OpenFile(place.path, O_WRONLY);
        const Outcome outcome = WithFault([&] { return File::Write(fd, value); });
        outcome.ExpectLogged();
        if (outcome.succeeded) {
            EXPECT_EQ(ReadFile(place.path), New);
        }
        if (IsDescriptorOpen(fd)) {
            EXPECT_FALSE(outcome.succeeded);
            ::close(fd);
        }
        EXPECT_TRUE(File::Write(OpenFile(place.path, O_WRONLY), value));
        EXPECT_EQ(ReadFile(place.path), New);
    });
}

// Replaces the file with a fault and again without. Afterwards it is the old or the new one, with
// nothing beside it.
template <class Content>
void ExpectReplaced(const Content& content)
{
    const Place place(Old);
    const Outcome outcome = WithFault([&] { return File::Replace(place.path, content); });
    outcome.ExpectLogged();
    EXPECT_EQ(ReadFile(place.path), outcome.succeeded ? New : Old);
    EXPECT_TRUE(File::Replace(place.path, content));
    EXPECT_EQ(ReadFile(place.path), New);
    EXPECT_EQ(NamesIn(place.dir.Path()).size(), 1U) << "a temporary file is left";
}

TEST(FileFaults, ReplaceByDocument)
{
    EveryCallFails("File::Replace(value)", [] { ExpectReplaced(Document(New)); });
}

TEST(FileFaults, ReplaceByText)
{
    EveryCallFails("File::Replace(text)", [] { ExpectReplaced(New); });
}

// Reads a file that holds two pairs and a bad line.
void ReadTwoPairs(const std::string& operation, const std::string& text)
{
    EveryCallFails(operation, [&text] {
        const Place place(text);
        using Pairs = std::map<std::string, int>;
        const Pairs old{{"old", 1}};
        const Pairs all{{"a", 1}, {"port", 5001}};
        Pairs pairs = old;
        int count = 0;
        const Outcome outcome = WithFault([&] {
            count = File::Read(place.path, pairs);
            return count >= 0;
        });
        outcome.ExpectLogged();
        if (outcome.succeeded) {
            // A read error counts as the end of the file, and ENOENT as a missing file.
            EXPECT_TRUE(pairs == all || (count == 0 && (pairs.empty() || pairs == old)));
        } else if (!outcome.threw) {
            EXPECT_EQ(pairs, old);
        }
        EXPECT_EQ(File::Read(place.path, pairs), 2);
        EXPECT_EQ(pairs, all);
    });
}

TEST(FileFaults, ReadPairs)
{
    ReadTwoPairs("File::Read(map)", "port=5001\na name that is long enough=1\nnone\n");
}

TEST(FileFaults, ReadPairsOfALargeFile)
{
    ReadTwoPairs("File::Read(map), a large file",
                 "port=5001\na name=1" + std::string(10'000, ' ') + "\nnone\nport=1\n");
}

TEST(FileFaults, CreateDir)
{
    EveryCallFails("File::CreateDir", [] {
        const TempDir dir;
        const std::string path = dir.File("a directory with a long name/in another one");
        const Outcome outcome = WithFault([&] { return File::CreateDir(path, 0700); });
        outcome.ExpectLogged();
        if (outcome.succeeded) {
            EXPECT_EQ(ModeOf(path), 0700U);
        }
        EXPECT_TRUE(File::CreateDir(path, 0700));
        EXPECT_EQ(ModeOf(path), 0700U);
    });
}

TEST(FileFaults, CreateDirThatExists)
{
    EveryCallFails("File::CreateDir of one that is there", [] {
        const TempDir dir;
        const Outcome outcome = WithFault([&] { return File::CreateDir(dir.Path(), 0755); });
        EXPECT_TRUE(outcome.succeeded);
        EXPECT_EQ(ModeOf(dir.Path()), 0700U);
    });
}

TEST(FileFaults, RemoveDir)
{
    EveryCallFails("File::RemoveDir", [] {
        const Place place(Old);
        const std::string& path = place.dir.Path();
        // A missing directory counts as removed.
        WithFault([&] { return File::RemoveDir(path); });
        EXPECT_TRUE(File::RemoveDir(path));
        EXPECT_FALSE(std::filesystem::exists(path));
    });
}
