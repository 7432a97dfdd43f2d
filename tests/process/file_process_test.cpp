// Reading pipes, slow writers and unintended contents. All reading happens in a child process,
// which must end normally.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <fstream>
#include <functional>
#include <map>
#include <ostream>
#include <string>
#include <vector>

#include <json/value.h>
#include <orvadrcore/file.h>

#include "support/fixtures/process_test.h"
#include "support/processes/child_process.h"
#include "support/processes/shared_memory.h"

namespace {

using OrvaDRCore::File;

constexpr std::size_t TenMegabytes = 10'000'000;
constexpr std::size_t ManyBrackets = 100'000;

// What the five ways to read return for a content.
constexpr int Readers = 5;
struct Results {
    bool document;        // File::Read of a path
    bool streamDocument;  // File::Read of a descriptor
    int texts;            // File::Read of key=value pairs, by type
    int integers;
    int numbers;
};

bool operator==(const Results& a, const Results& b)
{
    return a.document == b.document && a.streamDocument == b.streamDocument && a.texts == b.texts &&
           a.integers == b.integers && a.numbers == b.numbers;
}

std::ostream& operator<<(std::ostream& out, const Results& results)
{
    return out << results.document << " " << results.streamDocument << " " << results.texts << " "
               << results.integers << " " << results.numbers;
}

template <class V>
int CountPairs(const std::string& path)
{
    std::map<std::string, V> pairs;
    return File::Read(path, pairs);
}

class FileProcessTest : public ProcessTest {
  protected:
    // Reads the same content in all five ways. `path` returns where the next one finds it.
    void ExpectResults(const std::function<std::string()>& path, const Results& expected)
    {
        const SharedMemory<Results> results;
        ChildProcess reader([&](ChildProcess::Link& /*link*/) {
            Json::Value value;
            results->document = File::Read(path(), value);
            results->streamDocument = File::Read(::open(path().c_str(), O_RDONLY), value);
            results->texts = CountPairs<std::string>(path());
            results->integers = CountPairs<int>(path());
            results->numbers = CountPairs<double>(path());
        });
        EXPECT_EQ(reader.Join(), 0);
        EXPECT_EQ(*results, expected);
    }
};

struct Case {
    const char* name;
    std::string content;
    Results results;
};

std::vector<Case> Cases()
{
    const std::string nul(1, '\0');
    const std::string quoted = "\"" + std::string(TenMegabytes, 'x') + "\"";
    const std::string open(ManyBrackets, '[');
    const std::string closed = open + std::string(ManyBrackets, ']');
    return {
        {"nothing", "", {false, false, 0, 0, 0}},
        {"a NUL byte", nul, {false, false, 0, 0, 0}},
        {"a NUL byte after a document", R"({"a":1})" + nul, {false, true, 0, 0, 0}},
        {"a NUL byte in a string", "\"a" + nul + "b\"", {false, false, 0, 0, 0}},
        {"NUL bytes in a pair", "a" + nul + "=1" + nul + "\n", {false, false, 1, 1, 1}},
        {"CRLF", "{\r\n\"a\":\r\n1}\r\n", {true, true, 0, 0, 0}},
        {"CRLF after pairs", "a=1\r\nb=2\r\n\r\n", {false, false, 2, 2, 2}},
        {"a long string", quoted, {true, true, 0, 0, 0}},
        {"a long value", "a=" + quoted, {false, false, 1, 1, 1}},
        {"a long key", quoted + "=1", {false, false, 1, 1, 1}},
        {"a long number", "a=" + std::string(TenMegabytes, '9'), {false, false, 1, 1, 1}},
        {"open brackets", open, {false, false, 0, 0, 0}},
        {"brackets in brackets", closed, {false, false, 0, 0, 0}},
        {"brackets in a pair", "a=" + closed, {false, false, 1, 1, 1}},
    };
}

TEST_F(FileProcessTest, ReadersCopeWithAnyContentOfAFile)
{
    const std::string path = dir.File("file");
    for (const Case& row : Cases()) {
        SCOPED_TRACE(row.name);
        std::ofstream(path, std::ios::trunc) << row.content;
        ExpectResults([&]() -> const std::string& { return path; }, row.results);
    }
}

TEST_F(FileProcessTest, ReadersCopeWithAnyContentOfAPipe)
{
    // One pipe for each reader. In a single pipe a reader could meet the writer for the next one.
    std::vector<std::string> pipes;
    for (int i = 0; i < Readers; ++i) {
        pipes.push_back(dir.File("pipe" + std::to_string(i)));
        ASSERT_EQ(::mkfifo(pipes.back().c_str(), 0600), 0);
    }
    for (const Case& row : Cases()) {
        SCOPED_TRACE(row.name);
        ChildProcess writer([&](ChildProcess::Link& /*link*/) {
            for (const std::string& pipe : pipes) std::ofstream(pipe) << row.content;
        });
        auto next = pipes.begin();
        ExpectResults([&] { return *next++; }, row.results);
        EXPECT_EQ(writer.Join(), 0);
    }
}

}  // namespace
