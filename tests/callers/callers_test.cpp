// Callers link with the library and get the same from it, whichever sizes of files and times they choose.
#include "callers/caller.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <regex>

#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"

namespace {

using ::testing::AnyOf;
using ::testing::Contains;
using ::testing::HasSubstr;

TEST(CallersTest, OneHas64BitTimesAndTheOtherWhatTheMachineHas)
{
    EXPECT_EQ(WideCaller.sizeOfTime, 8U);
    EXPECT_EQ(WideCaller.sizeOfOffset, 8U);
    EXPECT_THAT(UsualCaller.sizeOfTime, AnyOf(sizeof(long), 8U));
    EXPECT_THAT(UsualCaller.sizeOfOffset, AnyOf(sizeof(long), 8U));
}

TEST(CallersTest, BothHaveTheSameClasses)
{
    EXPECT_EQ(UsualCaller.layouts(), WideCaller.layouts());
}

TEST(CallersTest, BothGetTheSameResults)
{
    const TempDir usual;
    const TempDir wide;
    const std::vector<std::string> results = UsualCaller.results(usual.Path());
    EXPECT_EQ(results, WideCaller.results(wide.Path()));
    EXPECT_THAT(results, Contains("id 1 4294967297"));
    EXPECT_THAT(results, Contains(HasSubstr("\"finish_time_to_update\" : 2208991800")));
}

TEST(CallersTest, EachReadsWhatTheOtherHasWritten)
{
    const TempDir dir;
    const std::vector<std::string> first = UsualCaller.results(dir.Path());
    const std::vector<std::string> second = WideCaller.results(dir.Path());
    EXPECT_THAT(first, Contains("inserted 1"));
    EXPECT_THAT(second, Contains(HasSubstr("\"year\" : 2040")));
}

TEST(CallersTest, NoPublicHeaderNamesATypeWhoseSizeTheyChoose)
{
    const std::regex types(
        R"(\b(time_t|off_t|ino_t|timespec|timeval|struct (stat|dirent|flock))\b)");
    const std::filesystem::path headers = ORVADR_SOURCE_DIR "/include/orvadrcore";
    for (const auto& header : std::filesystem::directory_iterator(headers)) {
        const std::string path = header.path().string();
        EXPECT_FALSE(std::regex_search(ReadFile(path), types)) << path;
    }
}

}  // namespace
