// fromFile and toFile of json_helpers.cpp.
#include "base/json_helpers.h"

#include <gmock/gmock.h>
#include <signal.h>
#include <sys/stat.h>

#include <filesystem>
#include <functional>
#include <memory>
#include <ostream>
#include <stdexcept>
#include <string>
#include <vector>

#include "support/fakes/syscall_faults.h"
#include "support/fixtures/log_capture.h"
#include "support/fixtures/special_file.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"
#include "support/processes/child_process.h"

namespace {

using OrvaDRCore::fromFile;
using OrvaDRCore::toFile;
using ::testing::ElementsAre;
using ::testing::UnorderedElementsAre;

constexpr const char* Name = "doc";

// Nothing here logs: the fixture fails on any line.
class JsonFileTest : public LoggedTest {
  protected:
    JsonFileTest() : LoggedTest("json_helpers.cpp") {}

    TempDir dir;
    SyscallFaults faults;
    std::string path = dir.File(Name);
};

Json::Value Document(int writer, int round)
{
    Json::Value document;
    document["writer"] = writer;
    document["round"] = round;
    const auto size = static_cast<std::size_t>(writer * 7919 + round * 10473) % 20000;
    document["fill"] = std::string(size, static_cast<char>('a' + writer));
    return document;
}

// Whether a file holds one whole Document().
bool HoldsADocument(const std::string& path)
{
    Json::Value document;
    return fromFile(document, path) &&
           document == Document(document["writer"].asInt(), document["round"].asInt());
}

TEST_F(JsonFileTest, ADocumentCanBeReadAsItWasWritten)
{
    Json::Value object;
    object["text"] = Bytes("zero \0, \xc3\xa4, \xff, \n \" \\ /");
    object["list"].append(1);
    object["list"].append(-2.5);
    object["none"] = Json::nullValue;
    const std::vector<Json::Value> documents = {
        object, Json::nullValue,   true,          42, -1, "text", Json::arrayValue,
        0.1,    Json::objectValue, TenMegabytes()};
    for (const Json::Value& document : documents) {
        Json::Value read("old");
        EXPECT_TRUE(toFile(document, path));
        EXPECT_TRUE(fromFile(read, path));
        EXPECT_TRUE(read == document);
    }
}

TEST_F(JsonFileTest, WritesTheCompactTextWithoutANewline)
{
    Json::Value document;
    document["b"].append(1);
    document["a"] = "\xc3\xa4";
    EXPECT_TRUE(toFile(document, path));
    EXPECT_EQ(ReadFile(path), "{\"a\":\"\xc3\xa4\",\"b\":[1]}");
}

TEST_F(JsonFileTest, WritingReplacesTheFileAndKeepsItsMode)
{
    const Umask umask(0077);
    WriteFile(path, std::string(1000, ' '));
    ASSERT_EQ(::chmod(path.c_str(), 0644), 0);
    const ino_t inode = InodeOf(path);
    EXPECT_TRUE(toFile(1, path));
    EXPECT_EQ(ReadFile(path), "1");
    EXPECT_NE(InodeOf(path), inode);
    EXPECT_EQ(ModeOf(path), 0644U);

    EXPECT_TRUE(toFile(1, dir.File("new")));
    EXPECT_EQ(ModeOf(dir.File("new")), 0600U);
}

TEST_F(JsonFileTest, AFailedWriteLeavesTheOldDocument)
{
    EXPECT_TRUE(toFile("old", path));
    for (const int error : {ENOSPC, EIO}) {
        faults.fsync = Failing(error);
        errno = 0;
        EXPECT_FALSE(toFile("new", path));
        EXPECT_EQ(errno, error);
        EXPECT_EQ(ReadFile(path), "\"old\"");
        EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name));
    }
}

TEST_F(JsonFileTest, ATextThatIsNoDocumentLeavesTheValue)
{
    const std::string deep = std::string(100'000, '[') + std::string(100'000, ']');
    const std::vector<std::string> texts = {
        "", "\n", "{", "{}{}", "1\n2", "{\"a\":}", "text", Bytes("1\0"), Bytes("\"a\0b\""), deep};
    for (const std::string& text : texts) {
        WriteFile(path, text);
        Json::Value value("old");
        EXPECT_FALSE(fromFile(value, path)) << text.substr(0, 20);
        EXPECT_EQ(value, "old");
    }
}

TEST_F(JsonFileTest, APrefixOfADocumentIsRefused)
{
    const std::string text = R"({"a":[1,{"b":"c d"},null],"e":{"f":-1.5e3,"g":true}})";
    for (std::size_t size = 0; size < text.size(); ++size) {
        WriteFile(path, text.substr(0, size));
        Json::Value value("old");
        EXPECT_FALSE(fromFile(value, path)) << text.substr(0, size);
        EXPECT_EQ(value, "old");
    }
    WriteFile(path, text);
    Json::Value value;
    EXPECT_TRUE(fromFile(value, path));
    EXPECT_EQ(value["e"]["g"], true);
}

TEST_F(JsonFileTest, AllowsBlanksAndNewlinesAroundTheDocument)
{
    for (const char* text : {"[1,\n 2]\n", "\r\n[1,\r\n2]\r\n", "\t[1,2] \n\n\n"}) {
        WriteFile(path, text);
        Json::Value value;
        EXPECT_TRUE(fromFile(value, path)) << text;
        EXPECT_EQ(value[1], 2);
    }
}

TEST_F(JsonFileTest, AFileThatCannotBeReadLeavesTheValue)
{
    Json::Value value("old");
    EXPECT_FALSE(fromFile(value, path));
    EXPECT_FALSE(fromFile(value, dir.Path()));
    EXPECT_FALSE(fromFile(value, ""));

    WriteFile(path, "1 ");
    faults.open = Failing(EACCES);
    EXPECT_FALSE(fromFile(value, path));
    faults.open = nullptr;

    // What was read before a failure may look like a document.
    int calls = 0;
    faults.read = [&](int fd, void* buffer, std::size_t /*size*/) -> ssize_t {
        return ++calls == 1 ? RealRead(fd, buffer, 1) : Failing(EIO)();
    };
    EXPECT_FALSE(fromFile(value, path));
    EXPECT_EQ(calls, 2);
    EXPECT_EQ(value, "old");
}

TEST_F(JsonFileTest, RefusesAFileOfThreeGigabytesWithoutReadingIt)
{
    WriteFile(path, "{}");
    Lengthen(path, std::int64_t{3} << 30U);
    faults.read = Failing(EIO);
    Json::Value value("old");
    errno = 0;
    EXPECT_FALSE(fromFile(value, path));
    EXPECT_EQ(errno, EFBIG);
    EXPECT_EQ(value, "old");
}

TEST_F(JsonFileTest, RefusesWhatIsNoRegularFileWithoutWaiting)
{
    for (const SpecialFile::Kind kind : SpecialFile::Kinds()) {
        const SpecialFile special(kind, path, "1");
        CheckInChild([&] {
            Json::Value value("old");
            EXPECT_FALSE(fromFile(value, path)) << kind;
            EXPECT_EQ(value, "old");
        });
    }
}

TEST_F(JsonFileTest, LeavesNoDescriptorOpen)
{
    const std::size_t before = CountDescriptors();
    Json::Value value;
    EXPECT_TRUE(toFile(1, path));
    EXPECT_TRUE(fromFile(value, path));
    WriteFile(path, "no document");
    EXPECT_FALSE(fromFile(value, path));
    EXPECT_FALSE(fromFile(value, dir.Path()));
    EXPECT_EQ(CountDescriptors(), before);
}

// How the locks of a file system may behave.
struct Locks {
    const char* name;
    std::function<int(int, int, void*)> fcntl;
};

std::ostream& operator<<(std::ostream& out, const Locks& locks)
{
    return out << locks.name;
}

class ManyWritersTest : public JsonFileTest, public ::testing::WithParamInterface<Locks> {};

INSTANTIATE_TEST_SUITE_P(
    Locks, ManyWritersTest,
    ::testing::Values(Locks{"Work", nullptr},
                      Locks{"AreOfEachMachineAlone", [](int, int, void*) { return 0; }},
                      Locks{"FailSometimes",
                            [calls = 0](int fd, int command, void* argument) mutable {
                                return ++calls % 4 == 0 ? Failing(ENOLCK)()
                                                        : RealFcntl(fd, command, argument);
                            }}),
    [](const auto& parameter) { return std::string(parameter.param.name); });

TEST_P(ManyWritersTest, ReadersSeeWholeDocuments)
{
    constexpr int Writers = 8;
    constexpr int Rounds = 50;
    constexpr int Readers = 4;
    const std::string stop = dir.File("stop");
    ASSERT_TRUE(toFile(Document(0, 0), path));
    faults.fcntl = GetParam().fcntl;

    using Processes = std::vector<std::unique_ptr<ChildProcess>>;
    Processes readers;
    for (int reader = 0; reader < Readers; ++reader) {
        readers.push_back(std::make_unique<ChildProcess>([&](ChildProcess::Link& link) {
            link.Tell();
            do {
                if (!HoldsADocument(path)) throw std::runtime_error("no whole document");
            } while (!std::filesystem::exists(stop));
        }));
        ASSERT_TRUE(readers.back()->Await());
    }
    Processes writers;
    for (int writer = 0; writer < Writers; ++writer) {
        writers.push_back(std::make_unique<ChildProcess>([&, writer](ChildProcess::Link&) {
            for (int round = 0; round < Rounds; ++round) {
                if (!toFile(Document(writer, round), path)) throw std::runtime_error("not written");
            }
        }));
    }
    for (const auto& writer : writers) EXPECT_EQ(writer->Join(), 0);
    WriteFile(stop, "");
    for (const auto& reader : readers) EXPECT_EQ(reader->Join(), 0);

    EXPECT_TRUE(HoldsADocument(path));
    EXPECT_THAT(NamesIn(dir.Path()), UnorderedElementsAre(Name, "stop"));
}

TEST_F(JsonFileTest, AKilledWriterLeavesAWholeDocument)
{
    constexpr int Kills = 20;
    for (int kill = 0; kill < Kills; ++kill) {
        ChildProcess writer([&](ChildProcess::Link& link) {
            for (int round = 0; toFile(Document(1, round), path); ++round) link.Tell();
        });
        for (int round = 0; round <= kill; ++round) ASSERT_TRUE(writer.Await());
        writer.Kill(SIGKILL);
        EXPECT_EQ(writer.Join(), 128 + SIGKILL);
        EXPECT_TRUE(HoldsADocument(path));
    }
    EXPECT_TRUE(toFile(Document(0, 0), path));
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre(Name));
}

}  // namespace
