// File::Replace. How a file is replaced is tested in replace_file_test.cpp.
#include <gmock/gmock.h>
#include <orvadrcore/file.h>
#include <sys/stat.h>

#include <filesystem>
#include <functional>
#include <limits>
#include <string>
#include <utility>
#include <vector>

#include "base/json_helpers.h"
#include "support/fakes/syscall_faults.h"
#include "support/fixtures/json_kinds.h"
#include "support/fixtures/log_capture.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"

namespace {

using OrvaDRCore::File;
using OrvaDRCore::toString;
using ::testing::ElementsAre;

constexpr const char* NullText = nullptr;

class FileReplaceTest : public LoggedTest {
  protected:
    FileReplaceTest() : LoggedTest("file.cpp") {}

    // The file holds this text, with nothing beside it.
    void ExpectFile(const std::string& text)
    {
        EXPECT_EQ(ReadFile(path), text);
        EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("doc"));
    }

    // Replaces the file in both ways, which fail with this line and leave it as it is.
    void ExpectFailure(const std::string& at, const std::string& message)
    {
        WriteFile(path, "old");
        EXPECT_FALSE(File::Replace(at, Json::Value("new")));
        ExpectLines({Err("Replace", message)});
        EXPECT_FALSE(File::Replace(at, "new"));
        ExpectLines({Err("Replace", message)});
        EXPECT_EQ(ReadFile(path), "old");
    }

    TempDir dir;
    SyscallFaults faults;
    std::string path = dir.File("doc");
};

TEST_F(FileReplaceTest, ADocumentIsWrittenOnOneLineWithoutANewline)
{
    EXPECT_TRUE(File::Replace(path, ParseJson(R"({"b":[1,2],"a":"x\ny"})")));
    ExpectFile(R"({"a":"x\ny","b":[1,2]})");
}

TEST_F(FileReplaceTest, ADocumentOfEveryKindIsReadBack)
{
    for (const JsonKind& kind : JsonKinds()) {
        Json::Value read("old");
        EXPECT_TRUE(File::Replace(path, kind.value)) << kind.text;
        EXPECT_TRUE(File::Read(path, read)) << kind.text;
        EXPECT_TRUE(Same(read, kind.value)) << kind.text;
    }
    ExpectFile(toString(JsonKinds().back().value));
}

TEST_F(FileReplaceTest, ATextIsWrittenByteForByte)
{
    for (const std::string& text :
         {Bytes("a\0b\n\xff"), std::string(), std::string("no newline"), TenMegabytes()}) {
        EXPECT_TRUE(File::Replace(path, text));
        ExpectFile(text);
    }
}

TEST_F(FileReplaceTest, ALiteralAndABufferAreTextsAndNoDocuments)
{
    EXPECT_TRUE(File::Replace(path, "5001"));
    ExpectFile("5001");
    EXPECT_TRUE(File::Replace(path, ""));
    ExpectFile("");
    char buffer[] = "port=5001";
    char* const pointer = buffer;
    EXPECT_TRUE(File::Replace(path, buffer));
    ExpectFile("port=5001");
    EXPECT_TRUE(File::Replace(path, pointer + 5));
    ExpectFile("5001");
}

TEST_F(FileReplaceTest, NumbersAndBooleansAreDocuments)
{
    EXPECT_TRUE(File::Replace(path, 5001));
    ExpectFile("5001");
    EXPECT_TRUE(File::Replace(path, true));
    ExpectFile("true");
    EXPECT_TRUE(File::Replace(path, Json::Value("5001")));
    ExpectFile("\"5001\"");
}

// A literal 0 is a null pointer, too; that call is ambiguous.
template <class T, class = void>
constexpr bool IsAccepted = false;
template <class T>
constexpr bool IsAccepted<T, std::void_t<decltype(File::Replace("", std::declval<T>()))>> = true;
static_assert(IsAccepted<int> && IsAccepted<const char*> && IsAccepted<std::string>);
static_assert(!IsAccepted<std::nullptr_t>);

TEST_F(FileReplaceTest, ANullTextIsRefused)
{
    WriteFile(path, "old");
    EXPECT_FALSE(File::Replace(path, NullText));
    ExpectLines({Err("Replace", "Null text for [" + path + "]")});
    ExpectFile("old");
}

TEST_F(FileReplaceTest, TheNewFileKeepsTheBitsOfTheOldOne)
{
    WriteFile(path, "old");
    std::filesystem::permissions(path, std::filesystem::perms{0640});
    const ino_t before = InodeOf(path);
    EXPECT_TRUE(File::Replace(path, "new"));
    EXPECT_EQ(ModeOf(path), 0640U);
    EXPECT_NE(InodeOf(path), before);

    const Umask mask(027);
    const std::string other = dir.File("other");
    EXPECT_TRUE(File::Replace(other, "new"));
    EXPECT_EQ(ModeOf(other), 0640U);
}

TEST_F(FileReplaceTest, WhatReadWouldRefuseDoesNotReplaceAGoodFile)
{
    WriteFile(path, "old");
    const double infinity = std::numeric_limits<double>::infinity();
    for (const Json::Value& value :
         {Json::Value(infinity), Nested(3, Json::Value(-infinity)), Nested(1001)}) {
        EXPECT_FALSE(File::Replace(path, value));
        ExpectLines({Err("Replace", "Value for [" + path + "] cannot be read back")});
        ExpectFile("old");
    }
    EXPECT_TRUE(File::Replace(path, Nested(1000)));
    Json::Value read;
    EXPECT_TRUE(File::Read(path, read));
    EXPECT_TRUE(Same(read, Nested(1000)));
}

TEST_F(FileReplaceTest, AnEmptyPathIsRefused)
{
    ExpectFailure("", "Empty path to write.");
}

TEST_F(FileReplaceTest, APathWhereNoFileCanBeIsRefused)
{
    const std::string missing = dir.File("missing/doc");
    ExpectFailure(missing,
                  "Failed to replace [" + missing + "], errno=[No such file or directory]");
    ExpectFailure(dir.Path(), "Failed to replace [" + dir.Path() + "], errno=[Is a directory]");
}

TEST_F(FileReplaceTest, AFailureOfTheDiskLeavesTheOldFileAndNothingBesideIt)
{
    const std::string failed = "Failed to replace [" + path + "], errno=[";
    WriteFile(path, "old");
    faults.write = Failing(ENOSPC);
    EXPECT_FALSE(File::Replace(path, "new"));
    ExpectLines({Err("Replace", failed + "No space left on device]")});
    faults.Clear();
    ExpectFile("old");

    faults.fsync = Failing(EIO);
    EXPECT_FALSE(File::Replace(path, Json::Value("new")));
    ExpectLines({Err("Replace", failed + "Input/output error]")});
    ExpectFile("old");
}

TEST_F(FileReplaceTest, ASymbolicLinkIsReplacedAndNotWrittenThrough)
{
    const std::string target = dir.File("target");
    WriteFile(target, "old");
    std::filesystem::create_symlink(target, path);
    EXPECT_TRUE(File::Replace(path, "new"));
    EXPECT_FALSE(std::filesystem::is_symlink(path));
    EXPECT_EQ(ReadFile(path), "new");
    EXPECT_EQ(ReadFile(target), "old");
}

}  // namespace
