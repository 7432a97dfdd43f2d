// orvadr error
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <orvadrcore/errors.h>

#include "orvadr.h"

namespace {

using OrvaDRCore::ERR;
using ::testing::HasSubstr;
using ::testing::StartsWith;

constexpr const char* NoSuchNode = "ERR_NODE_NOT_EXIST";

TEST(ErrorCommandTest, ShowsTheMeaningOfACode)
{
    const ProgramResult result = RunOrvadr({"error", "507"});
    EXPECT_EQ(result.code, AllWell);
    EXPECT_EQ(result.out,
              "CODE  NAME                MEANING\n"
              "507   ERR_NODE_NOT_EXIST  no such node\n");
    EXPECT_EQ(result.err, "");
}

TEST(ErrorCommandTest, ShowsSeveralByCodeAndByName)
{
    const Answer answer = Ask({"error", "404", NoSuchNode, "err_node_exist"});
    EXPECT_EQ(answer.code, AllWell);
    ASSERT_EQ(answer.objects.size(), 3U);
    EXPECT_EQ(answer.objects[0]["code"], 404);
    EXPECT_EQ(answer.objects[0]["name"], "ERR_DATABASE_OPERATION");
    EXPECT_EQ(answer.objects[0]["meaning"], "SQLite refused or failed");
    EXPECT_EQ(answer.objects[1]["code"], 507);
    EXPECT_EQ(answer.objects[2]["name"], "ERR_NODE_EXIST");
}

TEST(ErrorCommandTest, ShowsAllThatHaveAName)
{
    const Answer answer = Ask({"error"});
    EXPECT_EQ(answer.code, AllWell);
    std::vector<int> codes;
    for (int code = -1; code <= 10'000; ++code) {
        if (ERR::ToString(code) != ERR::ToString(0)) codes.push_back(code);
    }
    std::vector<int> shown;
    for (const Json::Value& object : answer.objects) {
        shown.push_back(object["code"].asInt());
        EXPECT_EQ(object["name"], ERR::ToString(shown.back()));
        EXPECT_NE(object["meaning"], "");
    }
    EXPECT_EQ(shown, codes);
}

TEST(ErrorCommandTest, TellsThatThereIsNoSuchCode)
{
    const Answer answer = Ask({"error", "117"});
    EXPECT_EQ(answer.code, NotWell);
    EXPECT_EQ(answer.Only()["code"], 117);
    EXPECT_TRUE(answer.Only()["name"].isNull());
    EXPECT_TRUE(answer.Only()["meaning"].isNull());
    EXPECT_EQ(answer.err, "orvadr: there is no error 117\n");
}

TEST(ErrorCommandTest, TellsThatThereIsNoSuchName)
{
    for (const char* name : {"ERR_NODE", "404x", "99999999999999999999", "[404]", "\x1b[31m"}) {
        const Answer answer = Ask({"error", name, "404"});
        EXPECT_EQ(answer.code, NotWell) << name;
        ASSERT_EQ(answer.objects.size(), 2U) << name;
        EXPECT_TRUE(answer.objects[0]["code"].isNull());
        EXPECT_EQ(answer.objects[0]["name"], name);
        EXPECT_EQ(answer.objects[1]["code"], 404);
    }
}

TEST(ErrorCommandTest, ShowsWhatIsUnknownInTheTable)
{
    const ProgramResult result = RunOrvadr({"error", "117", "a\tb"});
    EXPECT_EQ(result.code, NotWell);
    EXPECT_EQ(result.out,
              "CODE  NAME  MEANING\n"
              "117   -     -\n"
              "-     a\\tb  -\n");
    EXPECT_EQ(result.err, "orvadr: there is no error 117\norvadr: there is no error a\\tb\n");
}

TEST(CommandLineTest, RefusesWrongUsage)
{
    const std::vector<Words> lines{
        {}, {"no-such-command"}, {"--json"}, {"error", "--no-such"}, {"error", ""}};
    for (const Words& line : lines) {
        const ProgramResult result = RunOrvadr(line);
        EXPECT_EQ(result.code, WrongUsage);
        EXPECT_EQ(result.out, "");
        EXPECT_THAT(result.err, HasSubstr("--help"));
    }
}

TEST(CommandLineTest, ShowsHelpAndVersion)
{
    EXPECT_EQ(RunOrvadr({"--version"}).out, "orvadr " ORVADR_VERSION "\n");
    for (const Words& line : {Words{"--help"}, Words{"error", "--help"}}) {
        const ProgramResult result = RunOrvadr(line);
        EXPECT_EQ(result.code, AllWell);
        EXPECT_THAT(result.out, HasSubstr("Usage: orvadr"));
        EXPECT_THAT(result.out, HasSubstr("Exit codes:"));
        EXPECT_EQ(result.err, "");
    }
}

TEST(CommandLineTest, TakesTheFlagForJsonBeforeAndAfterTheCommand)
{
    const std::string expected =
        "[{\"code\":507,\"meaning\":\"no such node\",\"name\":\"ERR_NODE_NOT_EXIST\"}]\n";
    EXPECT_EQ(RunOrvadr({"--json", "error", "507"}).out, expected);
    EXPECT_EQ(RunOrvadr({"error", "--json", "507"}).out, expected);
    EXPECT_EQ(RunOrvadr({"error", "507", "--json"}).out, expected);
}

TEST(CommandLineTest, TellsThatItsOutputCannotBeWritten)
{
    const ProgramResult result = RunProgram({"/bin/sh", "-c", ORVADR_PROGRAM " error >/dev/full"});
    EXPECT_EQ(result.code, NotSeen);
    EXPECT_THAT(result.err, StartsWith("orvadr: cannot write to standard output: "));
}

}  // namespace
