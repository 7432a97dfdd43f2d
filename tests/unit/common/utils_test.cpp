#include <orvadrcore/utils.h>

#include <gmock/gmock.h>
#include <sys/wait.h>

#include <cerrno>
#include <chrono>
#include <climits>
#include <cstdlib>
#include <limits>
#include <set>
#include <utility>

#include "base/json_helpers.h"
#include "support/fakes/pauses.h"
#include "support/fakes/syscall_faults.h"
#include "support/fixtures/log_capture.h"

namespace {

// While it lives, starting a program runs another command instead, and notes what was asked for.
class ProgramStandIn {
  public:
    // Starting a program fails with `error`.
    explicit ProgramStandIn(int error)
    {
        faults_.spawn = [this, error](const SpawnCall& call) {
            asked_ = call.Arguments();
            return error;
        };
    }
    explicit ProgramStandIn(std::vector<std::string> command)
    {
        faults_.spawn = [this, command](SpawnCall call) mutable {
            asked_ = call.Arguments();
            std::vector<char*> texts;
            texts.reserve(command.size() + 1);
            for (std::string& text : command) texts.push_back(text.data());
            texts.push_back(nullptr);
            call.path = texts[0];
            call.arguments = texts.data();
            return RealSpawn(call);
        };
    }

    // The last program that was asked for, and its arguments.
    const std::vector<std::string>& Asked() const { return asked_; }

  private:
    SyscallFaults faults_;
    std::vector<std::string> asked_;
};

using OrvaDRCore::Container;
using OrvaDRCore::GenerateUUID;
using OrvaDRCore::RandomSleepInMSec;
using OrvaDRCore::toString;
using OrvaDRCore::Validator;
using ::testing::AllOf;
using ::testing::AnyOf;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::Ge;
using ::testing::IsEmpty;
using ::testing::Le;
using ::testing::MatchesRegex;

class UtilsTest : public LoggedTest {
  protected:
    UtilsTest() : LoggedTest("utils.cpp") {}
};

// A literal as text, zero bytes included.
template <std::size_t Size>
std::string Bytes(const char (&literal)[Size])
{
    return {literal, Size - 1};
}

TEST_F(UtilsTest, AUuidHasTheUsualForm)
{
    EXPECT_THAT(GenerateUUID(), MatchesRegex("[0-9a-f]{8}(-[0-9a-f]{4}){3}-[0-9a-f]{12}"));
}

TEST_F(UtilsTest, TwoUuidsDiffer)
{
    EXPECT_NE(GenerateUUID(), GenerateUUID());
}

TEST_F(UtilsTest, TheUuidComesFromUuidgenWithoutArguments)
{
    const ProgramStandIn program({"/bin/true"});
    GenerateUUID();
    EXPECT_THAT(program.Asked(), ElementsAre("/usr/bin/uuidgen"));
}

TEST_F(UtilsTest, AUuidProgramThatCannotBeStartedIsLogged)
{
    for (const int error : {ENOENT, EACCES, ENOMEM}) {
        const ProgramStandIn program(error);
        EXPECT_EQ(GenerateUUID(), "");
        ExpectLines({Err("GenerateUUID", "Failed to exec the command [/usr/bin/uuidgen].")});
    }
}

TEST_F(UtilsTest, TheUuidIsTheTrimmedFirstLine)
{
    struct Row {
        std::vector<std::string> command;
        const char* uuid;
    };
    const std::vector<Row> rows{
        {{"/usr/bin/printf", "a-b\\n"}, "a-b"},
        {{"/usr/bin/printf", " \\t a b \\r\\n"}, "a b"},
        {{"/usr/bin/printf", "first\\nsecond\\n"}, "first"},
        {{"/usr/bin/printf", "no end of line"}, "no end of line"},
        {{"/usr/bin/printf", "\\nsecond\\n"}, ""},
        {{"/usr/bin/printf", " \\t\\n"}, ""},
        {{"/bin/true"}, ""},
        {{"/bin/false"}, ""},
        {{"/bin/sh", "-c", "echo kept; exit 3"}, "kept"},
    };
    for (const Row& row : rows) {
        const ProgramStandIn program(row.command);
        EXPECT_EQ(GenerateUUID(), row.uuid) << row.command.back();
    }
}

TEST_F(UtilsTest, ALineCutOffByAReadErrorIsNoUuid)
{
    for (const std::size_t readable : {0U, 1U, 10U, 36U}) {
        SyscallFaults faults;
        bool failed = false;
        faults.read = [&](int fd, void* buffer, std::size_t size) -> ssize_t {
            // Only the program's output is read in large blocks.
            if (size < 100) return RealRead(fd, buffer, size);
            if (failed || readable == 0) return Failing(EIO)();
            failed = true;
            return RealRead(fd, buffer, readable);
        };
        EXPECT_EQ(GenerateUUID(), "") << readable;
    }
}

TEST_F(UtilsTest, TheUuidProgramIsReaped)
{
    GenerateUUID();
    EXPECT_EQ(::waitpid(-1, nullptr, WNOHANG), -1);
    EXPECT_EQ(errno, ECHILD);
}

TEST_F(UtilsTest, ARandomPauseLiesBetweenItsBounds)
{
    Pauses pauses;
    for (int count = 0; count < 100; ++count) EXPECT_TRUE(RandomSleepInMSec(500, 1000));
    EXPECT_EQ(pauses.Taken().size(), 100U);
    EXPECT_THAT(pauses.Taken(), Each(AllOf(Ge(500'000U), Le(1'000'000U))));
}

TEST_F(UtilsTest, BothBoundsOfARandomPauseOccur)
{
    Pauses pauses;
    for (int count = 0; count < 200; ++count) EXPECT_TRUE(RandomSleepInMSec(200, 201));
    const std::set<unsigned int> drawn(pauses.Taken().begin(), pauses.Taken().end());
    EXPECT_THAT(drawn, ElementsAre(200'000U, 201'000U));
}

TEST_F(UtilsTest, ARandomPauseTakesItsTime)
{
    const auto begin = std::chrono::steady_clock::now();
    EXPECT_TRUE(RandomSleepInMSec(10, 20));
    EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(10));
}

// The contract counts microseconds in 32 bits.
TEST_F(UtilsTest, APauseOfMoreThanAnHourWrapsAround)
{
    Pauses pauses;
    EXPECT_TRUE(RandomSleepInMSec(4'295'200, 4'295'201));
    ASSERT_EQ(pauses.Taken().size(), 1U);
    EXPECT_THAT(pauses.Taken()[0], AnyOf(232'704U, 233'704U));
}

TEST_F(UtilsTest, BadBoundsAreRefusedAtOnce)
{
    struct Row {
        unsigned int min;
        unsigned int max;
        const char* message;
    };
    const std::vector<Row> rows{
        {0, 10, "Invalid period [0 - 10] to sleep"},
        {10, 0, "Invalid period [10 - 0] to sleep"},
        {0, 0, "Invalid period [0 - 0] to sleep"},
        {10, 10, "Invalid period [10 - 10] to sleep"},  // equal bounds are refused, too
        {20, 10, "Invalid period [20 - 10] to sleep"},
        {0, UINT_MAX, "Invalid period [0 - 4294967295] to sleep"},
        {1000, 1000, "Invalid period [1000 - 1000] to sleep"},
        {2000, 1000, "Invalid period [2000 - 1000] to sleep"},
        {UINT_MAX, 1000, "Invalid period [4294967295 - 1000] to sleep"},
    };
    Pauses pauses;
    for (const Row& row : rows) {
        EXPECT_FALSE(RandomSleepInMSec(row.min, row.max)) << row.message;
        ExpectLines({Err("RandomSleepInMSec", row.message)});
    }
    EXPECT_THAT(pauses.Taken(), IsEmpty());
}

TEST_F(UtilsTest, AnEmptyVectorIsAnEmptyArray)
{
    EXPECT_EQ(toString(Container::ToJsonArray<std::string>({})), "[]");
    EXPECT_EQ(toString(Container::ToJsonArray<int>({})), "[]");
    EXPECT_EQ(toString(Container::ToJsonArray<bool>({})), "[]");
    EXPECT_EQ(toString(Container::ToJsonArray<double>({})), "[]");
}

TEST_F(UtilsTest, ArrayElementsKeepOrderAndType)
{
    EXPECT_EQ(toString(Container::ToJsonArray<std::string>({"b", "", "a", "b"})),
              R"(["b","","a","b"])");
    EXPECT_EQ(toString(Container::ToJsonArray<int>({3, -1, INT_MIN, INT_MAX})),
              "[3,-1,-2147483648,2147483647]");
    EXPECT_EQ(toString(Container::ToJsonArray<bool>({true, false, true})), "[true,false,true]");
    EXPECT_EQ(toString(Container::ToJsonArray<double>({1.5, -2.0})), "[1.5,-2.0]");
}

TEST_F(UtilsTest, AnEmptyVectorIsAnEmptyText)
{
    EXPECT_EQ(Container::ToString<std::string>({}, ","), "");
    EXPECT_EQ(Container::ToString<int>({}, ","), "");
    EXPECT_EQ(Container::ToString<bool>({}, ","), "");
    EXPECT_EQ(Container::ToString<double>({}, ","), "");
}

TEST_F(UtilsTest, SeparatorsStandBetweenTexts)
{
    struct Row {
        std::vector<std::string> texts;
        const char* separator;
        const char* joined;
    };
    const std::vector<Row> rows{
        {{"a"}, ",", "a"},          {{"a", "b", "c"}, ",", "a,b,c"},
        {{"a", "b"}, ", ", "a, b"}, {{"a", "b"}, "", "ab"},
        {{"", "b"}, ",", "b"},  // no separator while the result is empty
        {{"", "", "b"}, ",", "b"},  {{""}, ",", ""},
        {{"", ""}, ",", ""},        {{"a", "", "b"}, ",", "a,,b"},
        {{"a", ""}, ",", "a,"},     {{"", "a", ""}, ",", "a,"},
    };
    for (const Row& row : rows)
        EXPECT_EQ(Container::ToString(row.texts, row.separator), row.joined);
}

// Characters, not digits: the contract says so.
TEST_F(UtilsTest, AnIntBecomesTheCharacterOfItsLowBits)
{
    EXPECT_EQ(Container::ToString<int>({65, 66}, ","), "A,B");
    EXPECT_EQ(Container::ToString<int>({256 + 65}, ","), "A");
    EXPECT_EQ(Container::ToString<int>({-1, -191}, ","), "\xff,A");
    EXPECT_EQ(Container::ToString<int>({INT_MAX, INT_MIN}, ","), Bytes("\xff,\0"));
    EXPECT_EQ(Container::ToString<int>({0, 0}, ","), Bytes("\0,\0"));
}

TEST_F(UtilsTest, ABoolBecomesTheCharacterOneOrZero)
{
    EXPECT_EQ(Container::ToString<bool>({true, false}, ","), Bytes("\1,\0"));
    EXPECT_EQ(Container::ToString<bool>({false, true}, ""), Bytes("\0\1"));
}

TEST_F(UtilsTest, ADoubleBecomesTheCharacterOfItsIntegerPart)
{
    struct Row {
        double number;
        char character;
    };
    constexpr double Infinity = std::numeric_limits<double>::infinity();
    const std::vector<Row> rows{
        {65.0, 'A'},
        {65.9, 'A'},
        {321.0, 'A'},
        {4294967296.0 + 65.0, 'A'},
        {9007199254740992.0, '\0'},
        {255.9, '\xff'},
        {256.0, '\0'},
        {0.0, '\0'},
        {0.9, '\0'},
        {-0.0, '\0'},
        {-0.9, '\0'},
        {-1.0, '\0'},
        {-65.0, '\0'},
        {1e300, '\0'},
        {-1e300, '\0'},
        {Infinity, '\0'},
        {-Infinity, '\0'},
        {std::numeric_limits<double>::quiet_NaN(), '\0'},
    };
    for (const Row& row : rows) {
        EXPECT_EQ(Container::ToString<double>({row.number}, ","), std::string(1, row.character))
            << row.number;
    }
    EXPECT_EQ(Container::ToString<double>({0.0, 66.0}, ","), Bytes("\0,B"));
}

TEST_F(UtilsTest, AVolumePathBeginsWithSlashVolume)
{
    for (const char* path : {"/volume", "/volume1", "/volume1/x", "/volumeUSB", "/volume/"}) {
        EXPECT_TRUE(Validator::IsVolPath(path)) << path;
    }
    for (const char* path : {"", "/", "/volum", "volume1", "/Volume1", " /volume1", "//volume1",
                             "/vol", "/mnt/volume1"}) {
        EXPECT_FALSE(Validator::IsVolPath(path)) << path;
    }
}

}  // namespace
