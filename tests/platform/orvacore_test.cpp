#include <orvacore/orvacore.h>

#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/resource.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdlib>
#include <stdexcept>
#include <string>
#include <vector>

#include "caller.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_process.h"

namespace {

// The output of a program, and the result of closing its stream.
struct Outcome {
    std::string output;
    int closed;
};

bool operator==(const Outcome& one, const Outcome& other)
{
    return one.output == other.output && one.closed == other.closed;
}

std::ostream& operator<<(std::ostream& out, const Outcome& outcome)
{
    return out << '"' << outcome.output << "\" and " << outcome.closed;
}

std::string ReadAll(FILE* stream)
{
    std::string text;
    std::array<char, 4096> buffer{};
    std::size_t count = 0;
    while ((count = std::fread(buffer.data(), 1, buffer.size(), stream)) > 0) {
        text.append(buffer.data(), count);
    }
    return text;
}

// Runs a program to its end.
template <class... Arguments>
Outcome RunToEnd(const char* path, Arguments... arguments)
{
    FILE* stream = CoreLibPopen(path, "r", arguments..., nullptr);
    if (stream == nullptr) throw std::runtime_error("the program was not started");
    const std::string output = ReadAll(stream);
    return {output, CoreLibPclose(stream)};
}

// For the body of a ChildProcess, which reports by its exit code.
void Require(bool fact)
{
    if (!fact) throw std::runtime_error("not so");
}

// Fails when a case leaves a descriptor or a process behind.
class OrvaCoreTest : public ::testing::Test {
  protected:
    void TearDown() override
    {
        EXPECT_EQ(CountDescriptors(), descriptors_);
        EXPECT_FALSE(HasChildren());
    }

  private:
    std::size_t descriptors_ = CountDescriptors();
};

TEST_F(OrvaCoreTest, TheOutputIsReadToItsEnd)
{
    EXPECT_EQ(RunToEnd("/bin/echo"), (Outcome{"\n", 0}));
    EXPECT_EQ(RunToEnd("/bin/echo", "one", "two"), (Outcome{"one two\n", 0}));
    EXPECT_EQ(RunToEnd("/bin/true"), (Outcome{"", 0}));
    EXPECT_EQ(RunToEnd("/usr/bin/head", "-c", "1000000", "/dev/zero"),
              (Outcome{std::string(1'000'000, '\0'), 0}));
}

TEST_F(OrvaCoreTest, PassesArgumentsUnchanged)
{
    EXPECT_EQ(
        RunToEnd("/usr/bin/printf", "[%s]", "$HOME;*", "", "a  b", "`id`", "'\"\\", ">x", "\n"),
        (Outcome{"[$HOME;*][][a  b][`id`]['\"\\][>x][\n]", 0}));
}

TEST_F(OrvaCoreTest, TheFirstArgumentIsThePath)
{
    const char text[] = "/bin/cat\0/proc/self/cmdline";
    EXPECT_EQ(RunToEnd("/bin/cat", "/proc/self/cmdline"), (Outcome{{text, sizeof text}, 0}));
}

TEST_F(OrvaCoreTest, RefusesMoreThanFifteenArguments)
{
    EXPECT_EQ(RunToEnd("/bin/echo", "1", "2", "3", "4", "5", "6", "7", "8", "9", "10", "11", "12",
                       "13", "14", "15"),
              (Outcome{"1 2 3 4 5 6 7 8 9 10 11 12 13 14 15\n", 0}));
    errno = 0;
    EXPECT_EQ(CoreLibPopen("/bin/echo", "r", "1", "2", "3", "4", "5", "6", "7", "8", "9", "10",
                           "11", "12", "13", "14", "15", "16", nullptr),
              nullptr);
    EXPECT_EQ(errno, EINVAL);
}

TEST_F(OrvaCoreTest, RefusesOtherModesThanReading)
{
    for (const char* mode : {"", "w", "re", "r+", "R", "rw"}) {
        errno = 0;
        EXPECT_EQ(CoreLibPopen("/bin/true", mode, nullptr), nullptr) << mode;
        EXPECT_EQ(errno, EINVAL) << mode;
    }
}

TEST_F(OrvaCoreTest, AProgramThatCannotBeStartedHasNoStream)
{
    const TempDir directory;
    const std::string notExecutable = directory.File("plain");
    WriteFile(notExecutable, "#!/bin/sh\n");

    struct Row {
        const char* path;
        int error;
    };
    const std::vector<Row> rows{
        {"/no/such/program", ENOENT},
        {"", ENOENT},
        {"echo", ENOENT},  // no search in PATH
        {"/", EACCES},
        {notExecutable.c_str(), EACCES},
        {nullptr, EINVAL},
    };
    for (const Row& row : rows) {
        errno = 0;
        EXPECT_EQ(CoreLibPopen(row.path, "r", nullptr), nullptr);
        EXPECT_EQ(errno, row.error) << (row.path != nullptr ? row.path : "null");
    }
}

TEST_F(OrvaCoreTest, WithoutFreeDescriptorsThereIsNoStream)
{
    for (const rlim_t spare : {0U, 1U}) {
        ChildProcess child([spare](ChildProcess::Link&) {
            const int free = ::open("/dev/null", O_RDONLY | O_CLOEXEC);
            ::close(free);
            const rlim_t most = static_cast<rlim_t>(free) + spare;
            rlimit limit{};
            Require(::getrlimit(RLIMIT_NOFILE, &limit) == 0);
            limit.rlim_cur = most;
            Require(::setrlimit(RLIMIT_NOFILE, &limit) == 0);
            Require(CoreLibPopen("/bin/true", "r", nullptr) == nullptr);
            Require(errno == EMFILE);
            Require(!HasChildren());
        });
        EXPECT_EQ(child.Join(), 0) << spare;
    }
}

TEST_F(OrvaCoreTest, PassesTheEnvironment)
{
    EXPECT_EQ(RunToEnd("/usr/bin/printenv", "ORVACORE_TEST"), (Outcome{"", -1}));
    ChildProcess child([](ChildProcess::Link&) {
        // NOLINTNEXTLINE(concurrency-mt-unsafe): the child has no other thread
        Require(::setenv("ORVACORE_TEST", "one $two", 1) == 0);
        Require(RunToEnd("/usr/bin/printenv", "ORVACORE_TEST") == Outcome{"one $two\n", 0});
    });
    EXPECT_EQ(child.Join(), 0);
}

TEST_F(OrvaCoreTest, PassesNoDescriptorAboveTwo)
{
    std::array<int, 2> pipe{};
    ASSERT_EQ(::pipe(pipe.data()), 0);
    const int high = ::fcntl(pipe[0], F_DUPFD, 200);
    ASSERT_GE(high, 200);
    FILE* other = CoreLibPopen("/bin/echo", "r", "other", nullptr);
    ASSERT_NE(other, nullptr);

    const Outcome outcome = RunToEnd("/bin/ls", "/proc/self/fd");
    // ls opens its directory as the lowest free descriptor, which is 3 if none was inherited.
    EXPECT_EQ(outcome, (Outcome{"0\n1\n2\n3\n", 0}));

    EXPECT_EQ(ReadAll(other), "other\n");
    EXPECT_EQ(CoreLibPclose(other), 0);
    for (const int descriptor : {pipe[0], pipe[1], high}) ::close(descriptor);
}

TEST_F(OrvaCoreTest, StandardInputAndErrorAreTheCallers)
{
    const TempDir directory;
    const std::string inputFile = directory.File("input");
    const std::string errorFile = directory.File("error");
    WriteFile(inputFile, "input");
    ChildProcess child([&](ChildProcess::Link&) {
        Require(::dup2(::open(inputFile.c_str(), O_RDONLY), STDIN_FILENO) == STDIN_FILENO);
        Require(::dup2(::creat(errorFile.c_str(), 0600), STDERR_FILENO) == STDERR_FILENO);
        Require(RunToEnd("/bin/sh", "-c", "cat; echo error >&2") == Outcome{"input", 0});
    });
    EXPECT_EQ(child.Join(), 0);
    EXPECT_EQ(ReadFile(errorFile), "error\n");
}

TEST_F(OrvaCoreTest, ACallerMayHaveClosedItsStandardDescriptors)
{
    for (unsigned int closed = 0; closed < 8; ++closed) {
        ChildProcess child([closed](ChildProcess::Link&) {
            for (const int descriptor : {0, 1, 2}) {
                if ((closed >> descriptor & 1U) != 0) ::close(descriptor);
            }
            const std::size_t before = CountDescriptors();
            Require(RunToEnd("/bin/echo", "hello") == Outcome{"hello\n", 0});
            Require(CountDescriptors() == before);
            Require(!HasChildren());
        });
        EXPECT_EQ(child.Join(), 0) << closed;
    }
}

TEST_F(OrvaCoreTest, ClosingReportsAProgramThatFailed)
{
    EXPECT_EQ(RunToEnd("/bin/false"), (Outcome{"", -1}));
    EXPECT_EQ(RunToEnd("/bin/sh", "-c", "echo text; exit 3"), (Outcome{"text\n", -1}));
    EXPECT_EQ(RunToEnd("/bin/sh", "-c", "kill -KILL $$"), (Outcome{"", -1}));
}

TEST_F(OrvaCoreTest, AStreamMayBeClosedBeforeItsEnd)
{
    FILE* stream = CoreLibPopen("/usr/bin/yes", "r", nullptr);
    ASSERT_NE(stream, nullptr);
    EXPECT_EQ(std::fgetc(stream), 'y');
    EXPECT_EQ(CoreLibPclose(stream), -1);  // the broken pipe ended it
}

TEST_F(OrvaCoreTest, TheOutputMayEndBeforeTheProgram)
{
    EXPECT_EQ(RunToEnd("/bin/sh", "-c", "echo text; exec 1>&-; exit 3"), (Outcome{"text\n", -1}));
}

TEST_F(OrvaCoreTest, TwoProgramsRunAtOnce)
{
    FILE* first = CoreLibPopen("/bin/sh", "r", "-c", "echo first; exit 1", nullptr);
    FILE* second = CoreLibPopen("/bin/echo", "r", "second", nullptr);
    ASSERT_NE(first, nullptr);
    ASSERT_NE(second, nullptr);
    EXPECT_EQ(ReadAll(second), "second\n");
    EXPECT_EQ(ReadAll(first), "first\n");
    EXPECT_EQ(CoreLibPclose(first), -1);
    EXPECT_EQ(CoreLibPclose(second), 0);
}

TEST_F(OrvaCoreTest, ACallerMayIgnoreItsChildren)
{
    ChildProcess child([](ChildProcess::Link&) {
        Require(::signal(SIGCHLD, SIG_IGN) != SIG_ERR);
        Require(RunToEnd("/bin/echo", "hello") == Outcome{"hello\n", 0});
        Require(RunToEnd("/bin/false") == Outcome{"", -1});
        Require(!HasChildren());
    });
    EXPECT_EQ(child.Join(), 0);
}

volatile sig_atomic_t signalsSeen = 0;

TEST_F(OrvaCoreTest, SignalsInterruptNeitherReadingNorClosing)
{
    struct sigaction action {};
    action.sa_handler = [](int) { signalsSeen = signalsSeen + 1; };  // without SA_RESTART
    struct sigaction before {};
    ASSERT_EQ(::sigaction(SIGUSR1, &action, &before), 0);
    constexpr const char* Script =
        "signal() { i=0; while [ $i -lt 200 ]; do kill -USR1 $0; i=$((i+1)); done; };"
        "signal; echo text; exec 1>&-; signal";
    const std::string self = std::to_string(::getpid());
    EXPECT_EQ(RunToEnd("/bin/sh", "-c", Script, self.c_str()), (Outcome{"text\n", 0}));
    EXPECT_GT(signalsSeen, 0);
    ::sigaction(SIGUSR1, &before, nullptr);
}

struct Trimming {
    const char* text;
    const char* leading;
    const char* trailing;
    const char* trimmed;
};

TEST(OrvaCoreTrimTest, CutsBothEnds)
{
    const std::vector<Trimming> rows{
        {"abc", nullptr, nullptr, "abc"},
        {"  abc  ", nullptr, nullptr, "abc"},
        {" \t\n\v\f\rabc \t\n\v\f\r", nullptr, nullptr, "abc"},
        {"  a \n b  ", nullptr, nullptr, "a \n b"},
        {"a", nullptr, nullptr, "a"},
        {"", nullptr, nullptr, ""},
        {" ", nullptr, nullptr, ""},
        {" \r\n", nullptr, nullptr, ""},
        {"\xc2\xa0 x \xa0", nullptr, nullptr, "\xc2\xa0 x \xa0"},
        {"xxabcyy", "x", "y", "abc"},
        {"xyabcxy", "x", "y", "yabcx"},
        {"xyabcxy", "yx", "xy", "abc"},
        {"xxx", "x", "", ""},
        {"xxx", "", "x", ""},
        {"xxx", "x", "x", ""},
        {"  abc  ", "", nullptr, "  abc"},
        {"  abc  ", nullptr, "", "abc  "},
        {"  abc  ", "", "", "  abc  "},
        {"  abc  ", "x", "x", "  abc  "},
    };
    for (const Trimming& row : rows) {
        std::string text = row.text;
        EXPECT_EQ(CoreLibStrTrim(text.data(), row.leading, row.trailing), text.data());
        EXPECT_STREQ(text.c_str(), row.trimmed) << '"' << row.text << '"';
    }
}

TEST(OrvaCoreTrimTest, ReturnsANullText)
{
    EXPECT_EQ(CoreLibStrTrim(nullptr, nullptr, nullptr), nullptr);
    EXPECT_EQ(CoreLibStrTrim(nullptr, "x", "y"), nullptr);
}

}  // namespace
