// What docs/cache.md says about the files.
#include <orvadrcore/cache.h>

#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <regex>
#include <sstream>
#include <stdexcept>
#include <string>
#include <vector>

#include "base/json_helpers.h"
#include "support/fixtures/cache_update_fixture.h"
#include "support/fixtures/json_kinds.h"
#include "support/fixtures/test_files.h"
#include "support/processes/stat_field.h"

namespace {

using OrvaDRCore::toString;
using ::testing::ElementsAre;

// The page that describes the files.
class CachePageTest : public CacheUpdateFixture {
  protected:
    // The first fenced block of a language.
    std::string Block(const std::string& language) const
    {
        const std::string fence = "\n```" + language + "\n";
        const std::size_t begin = page.find(fence);
        if (begin == std::string::npos) throw std::runtime_error("no block of " + language);
        const std::size_t end = page.find("\n```\n", begin + fence.size());
        return page.substr(begin + fence.size(), end + 1 - begin - fence.size());
    }

    // The cells of the table whose header begins with this cell, without the blanks and backquotes
    // around them.
    std::vector<std::vector<std::string>> Table(const std::string& firstCell) const
    {
        std::istringstream lines(page.substr(page.find("\n| " + firstCell + " |") + 1));
        std::vector<std::vector<std::string>> rows;
        for (std::string line; std::getline(lines, line) && !line.empty();) {
            std::istringstream cells(line.substr(1));
            rows.emplace_back();
            for (std::string cell; std::getline(cells, cell, '|');) {
                const std::size_t first = std::min(cell.find_first_not_of(" `"), cell.size());
                const std::size_t last = cell.find_last_not_of(" `") + 1;
                rows.back().push_back(cell.substr(first, last - std::min(first, last)));
            }
        }
        if (rows.size() < 3) throw std::runtime_error("no table of " + firstCell);
        rows.erase(rows.begin(), rows.begin() + 2);  // the header and the line below it
        return rows;
    }

    // A path of the page, for the cache of this test.
    std::string Filled(std::string text) const
    {
        text = std::regex_replace(text, std::regex("/DIR/"), "/" + dir.Path() + "/");
        text = std::regex_replace(text, std::regex("DIR/"), dir.Path() + "/");
        return std::regex_replace(text, std::regex("FILE"), "status");
    }

    const std::string page = ReadFile(ORVADR_SOURCE_DIR "/docs/cache.md");
};

TEST_F(CachePageTest, TheExampleIsAFileThatTheLibraryWrites)
{
    const Json::Value example = ParseJson(Block("json"));
    TestCache each = Another(false, 0, example["timeout"].asInt64());
    each.info = [&] { return example["info"]; };
    EXPECT_TRUE(each.UpdateWithData("before", 1, 1 + example["max_updated_time"].asInt64()));
    EXPECT_TRUE(each.UpdateWithData(example["cached_data"],
                                    example["begin_time_to_update"].asInt64(),
                                    example["finish_time_to_update"].asInt64()));
    EXPECT_EQ(ReadFile(path), toString(example));
    EXPECT_EQ(each.GetCachedData(), example["cached_data"]);

    // On the page, spread out, it has the keys in the order of the file.
    std::string spread = Block("json");
    spread.erase(std::remove(spread.begin(), spread.end(), '\n'), spread.end());
    std::size_t at = 0;
    for (const std::string& key : example.getMemberNames()) {
        const std::size_t found = spread.find("  \"" + key + "\": ");
        ASSERT_NE(found, std::string::npos) << key;
        EXPECT_GE(found, at) << key;
        at = found;
    }
}

TEST_F(CachePageTest, TheTableHasAllKeysAndTheirTypes)
{
    EXPECT_TRUE(cache.UpdateWithData("data", 100, 103));
    const Json::Value document = Document();
    std::vector<std::string> keys;
    for (const std::vector<std::string>& row : Table("key")) {
        ASSERT_EQ(row.size(), 4U);
        const std::string& key = row[0];
        const std::string& type = row[1];
        keys.push_back(key);
        ASSERT_TRUE(document.isMember(key)) << key;
        if (type == "integer") {
            EXPECT_EQ(document[key].type(), Json::intValue) << key;
        } else if (type == "real") {
            EXPECT_EQ(document[key].type(), Json::realValue) << key;
        } else {
            EXPECT_EQ(type, "any") << key;
        }
    }
    EXPECT_THAT(keys, ElementsAre("timeout", "info", "cached_data", "begin_time_to_update",
                                  "finish_time_to_update", "updated_time", "max_updated_time"));
    EXPECT_EQ(document.size(), keys.size());
}

TEST_F(CachePageTest, ThePageHasThePathsOfTheFiles)
{
    const auto rows = Table("file");
    ASSERT_EQ(rows.size(), 3U);
    EXPECT_EQ(Filled(rows[0][1]), path);
    EXPECT_EQ(Filled(rows[1][1]), pidPath);
    EXPECT_EQ(Filled(rows[2][1]), lockPath);
    EXPECT_TRUE(waiting.Update());
    ExpectLines({Start(), Finish()});
    for (const auto& row : rows) EXPECT_GT(CountOpened(Filled(row[1])), 0U) << row[1];
}

TEST_F(CachePageTest, ThePageShowsTheFormOfThePidFile)
{
    const std::regex form("([0-9]+)\n([0-9]+)\n");
    EXPECT_TRUE(std::regex_match(Block("text"), form)) << Block("text");

    waiting.produce = [&](Json::Value& data) {
        const std::string written = ReadFile(pidPath);
        std::smatch numbers;
        EXPECT_TRUE(std::regex_match(written, numbers, form)) << written;
        EXPECT_EQ(numbers[1], std::to_string(::getpid()));
        EXPECT_EQ(numbers[2], StatField(::getpid(), 22));
        data = "new";
        return true;
    };
    EXPECT_TRUE(waiting.Update());
    EXPECT_EQ(waiting.CountCalls("GetUpdatedData"), 1U);
    ExpectLines({Start(), Finish()});
}

TEST_F(CachePageTest, ThePageHasTheModeOfTheLockFile)
{
    WriteStale("old");
    FailForks(EAGAIN);  // an ordinary user could open the lock only once
    for (const mode_t mask : {0U, 0077U}) {
        std::filesystem::remove(lockFile);
        const Umask umask(mask);
        EXPECT_FALSE(cache.Update());
        EXPECT_EQ(ModeOf(lockFile), 01204U & ~mask);
        EXPECT_EQ(std::filesystem::file_size(lockFile), 0U);
        EXPECT_EQ(TakeLines().size(), 1U);
    }
    EXPECT_NE(page.find("permission bits are 01204 less the umask"), std::string::npos);
}

}  // namespace
