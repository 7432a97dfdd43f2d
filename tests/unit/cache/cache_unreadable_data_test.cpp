// UpdateWithData refuses data that Load could not read again.
#include <orvadrcore/cache.h>

#include <ctime>
#include <limits>
#include <string>

#include "base/json_helpers.h"
#include "support/fixtures/cache_update_fixture.h"
#include "support/fixtures/json_kinds.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"

namespace {

using OrvaDRCore::toString;

class UnreadableDataTest : public CacheUpdateFixture {
  protected:
    UnreadableDataTest() { WriteCache("old", std::time(nullptr) - 10); }

    // Whether the data is written and can be loaded by another object. If not, nothing has changed.
    bool IsWritten(const Json::Value& data)
    {
        const std::string before = ReadFile(path);
        EXPECT_EQ(cache.GetCachedData(), "old");
        const bool written = cache.UpdateWithData(data, 100, 103);
        ExpectPauses(0, 0);
        if (written) {
            EXPECT_TRUE(Same(Another(false).GetCachedData(), data));
            EXPECT_TRUE(Same(Document()["info"], cache.info()));
        } else {
            ExpectLines({Debug("UpdateWithData", "[" + toString(data) +
                                                     "] is not valid to update for cache [" +
                                                     toString(cache.info()) + "]")});
            EXPECT_EQ(ReadFile(path), before);
            ForgetOpened();
            EXPECT_EQ(cache.GetCachedData(), "old");
            EXPECT_EQ(CountOpened(path), 0U);
        }
        WriteCache("old", std::time(nullptr) - 10);
        return written;
    }
};

// The document around the value is one level.
TEST_F(UnreadableDataTest, NestingTooDeepIsRefused)
{
    for (const Json::Value& innermost : {Json::Value(Json::arrayValue), Json::Value(1)}) {
        EXPECT_TRUE(IsWritten(Nested(998, innermost)));
        EXPECT_TRUE(IsWritten(Nested(999, innermost)));
        EXPECT_FALSE(IsWritten(Nested(1000, innermost)));
        EXPECT_FALSE(IsWritten(Nested(1001, innermost)));
        EXPECT_FALSE(IsWritten(Nested(5000, innermost)));

        cache.info = [&] { return Nested(999, innermost); };
        EXPECT_TRUE(IsWritten("data"));
        cache.info = [&] { return Nested(1000, innermost); };
        EXPECT_FALSE(IsWritten("data"));
        cache.info = [] { return Json::Value("test cache"); };
    }
}

TEST_F(UnreadableDataTest, AnInfinityIsRefused)
{
    constexpr double Infinity = std::numeric_limits<double>::infinity();
    for (const double number : {Infinity, -Infinity}) {
        Json::Value data;
        data["list"].append(1);
        data["list"].append(number);
        EXPECT_FALSE(IsWritten(number));
        EXPECT_FALSE(IsWritten(data));
        cache.info = [&] { return data; };
        EXPECT_FALSE(IsWritten("data"));
        cache.info = [] { return Json::Value("test cache"); };
    }
    EXPECT_TRUE(IsWritten(std::numeric_limits<double>::max()));
}

TEST_F(UnreadableDataTest, NotANumberIsWrittenAsNull)
{
    Json::Value data;
    data["a"] = std::numeric_limits<double>::quiet_NaN();
    EXPECT_TRUE(cache.UpdateWithData(data));
    EXPECT_TRUE(Same(Another(false).GetCachedData(), ParseJson(R"({"a":null})")));
}

TEST_F(UnreadableDataTest, ProducedDataThatIsRefusedIsNotProducedAgain)
{
    TestCache each = Another(true, 3);
    each.produce = [](Json::Value& data) {
        data = std::numeric_limits<double>::infinity();
        return true;
    };
    const std::string before = ReadFile(path);
    EXPECT_FALSE(each.Update());
    EXPECT_EQ(each.CountCalls("GetUpdatedData"), 1U);
    ExpectPauses(0, 0);
    ExpectLines(
        {Start(),
         Debug("UpdateWithData", R"([1e+9999] is not valid to update for cache ["test cache"])"),
         Finish()});
    EXPECT_EQ(ReadFile(path), before);
}

// Copying it, or making its text, would overflow the stack.
TEST_F(UnreadableDataTest, AValueThatWouldOverflowTheStackIsLoggedWithoutItsText)
{
    CheckInChild([this] {
        // Destroying it would, too.
        static const Json::Value& data = *new Json::Value(Nested(1'000'000));
        const auto refused = Debug("UpdateWithData",
                                   "[(nested too deep)] is not valid to update "
                                   R"(for cache ["test cache"])");
        EXPECT_FALSE(cache.UpdateWithData(data));
        ExpectLines({refused});
        cache.isValid = [](const Json::Value& /*data*/) { return false; };
        EXPECT_FALSE(cache.UpdateWithData(data));
        ExpectLines({refused});
        EXPECT_EQ(Document()["cached_data"], "old");
    });
}

}  // namespace
