// Readers of files that meet pipes, slow writers and contents that nobody meant to write. Each
// reads in a process of its own, which has to end as it should.
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

// What the readers say of a content.
constexpr int Readers = 5;
struct Answers {
    bool document;        // File::Read of a path
    bool streamDocument;  // File::Read of a descriptor
    int texts;            // of pairs
    int integers;
    int numbers;
};

bool operator==(const Answers& a, const Answers& b)
{
    return a.document == b.document && a.streamDocument == b.streamDocument && a.texts == b.texts &&
           a.integers == b.integers && a.numbers == b.numbers;
}

std::ostream& operator<<(std::ostream& out, const Answers& answers)
{
    return out << answers.document << " " << answers.streamDocument << " " << answers.texts << " "
               << answers.integers << " " << answers.numbers;
}

template <class V>
int CountPairs(const std::string& path)
{
    std::map<std::string, V> pairs;
    return File::Read(path, pairs);
}

class FileProcessTest : public ProcessTest {
  protected:
    // Lets all readers read the same content. `path` says where the next one finds it.
    void ExpectAnswers(const std::function<std::string()>& path, const Answers& expected)
    {
        const SharedMemory<Answers> answers;
        ChildProcess reader([&](ChildProcess::Link& /*link*/) {
            Json::Value value;
            answers->document = File::Read(path(), value);
            answers->streamDocument = File::Read(::open(path().c_str(), O_RDONLY), value);
            answers->texts = CountPairs<std::string>(path());
            answers->integers = CountPairs<int>(path());
            answers->numbers = CountPairs<double>(path());
        });
        EXPECT_EQ(reader.Join(), 0);
        EXPECT_EQ(*answers, expected);
    }
};

struct Case {
    const char* name;
    std::string content;
    Answers answers;
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
        {"a NUL byte behind a document", R"({"a":1})" + nul, {false, true, 0, 0, 0}},
        {"a NUL byte in a string", "\"a" + nul + "b\"", {false, false, 0, 0, 0}},
        {"NUL bytes in a pair", "a" + nul + "=1" + nul + "\n", {false, false, 1, 1, 1}},
        {"CRLF", "{\r\n\"a\":\r\n1}\r\n", {true, true, 0, 0, 0}},
        {"CRLF behind pairs", "a=1\r\nb=2\r\n\r\n", {false, false, 2, 2, 2}},
        {"a long string", quoted, {true, true, 0, 0, 0}},
        {"a long value", "a=" + quoted, {false, false, 1, 1, 1}},
        {"a long key", quoted + "=1", {false, false, 1, 1, 1}},
        {"a long number", "a=" + std::string(TenMegabytes, '9'), {false, false, 1, 1, 1}},
        {"open brackets", open, {false, false, 0, 0, 0}},
        {"brackets in brackets", closed, {false, false, 0, 0, 0}},
        {"brackets in a pair", "a=" + closed, {false, false, 1, 1, 1}},
    };
}

TEST_F(FileProcessTest, ReadersAnswerWhateverAFileHolds)
{
    const std::string path = dir.File("file");
    for (const Case& row : Cases()) {
        SCOPED_TRACE(row.name);
        std::ofstream(path, std::ios::trunc) << row.content;
        ExpectAnswers([&]() -> const std::string& { return path; }, row.answers);
    }
}

TEST_F(FileProcessTest, ReadersAnswerWhateverComesThroughAPipe)
{
    // One for each reader: who reads a pipe to its end must not meet the writer of the next.
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
        ExpectAnswers([&] { return *next++; }, row.answers);
        EXPECT_EQ(writer.Join(), 0);
    }
}

}  // namespace
