#include "cache/cache_document.h"

#include <gtest/gtest.h>

#include <string>

#include <json/writer.h>  // for the messages of failed checks

#include "base/json_helpers.h"

namespace {

using OrvaDRCore::CacheFacts;

std::optional<CacheFacts> FactsOf(const std::string& text)
{
    Json::Value document;
    EXPECT_TRUE(OrvaDRCore::fromString(document, text)) << text;
    return OrvaDRCore::ReadCacheFacts(document);
}

TEST(CacheDocumentTest, ReadsWhatARefreshHasWritten)
{
    const auto facts = FactsOf(R"({"begin_time_to_update":100,"cached_data":null,
        "finish_time_to_update":103,"info":{"name":"x"},"max_updated_time":9,"timeout":60,
        "updated_time":3.0})");
    ASSERT_TRUE(facts);
    EXPECT_EQ(facts->timeout, 60);
    EXPECT_EQ(facts->info["name"], "x");
    EXPECT_EQ(facts->begin, 100);
    EXPECT_EQ(facts->finish, 103);
    EXPECT_EQ(facts->lastRefresh, 3.0);
    EXPECT_EQ(facts->longestRefresh, 9);
}

TEST(CacheDocumentTest, KnowsNoLastRefreshWithoutTimes)
{
    const auto facts = FactsOf(R"({"begin_time_to_update":0,"cached_data":1,
        "finish_time_to_update":0,"info":1,"max_updated_time":9,"timeout":0,"updated_time":0.0})");
    ASSERT_TRUE(facts);
    EXPECT_EQ(facts->timeout, 0);
    EXPECT_FALSE(facts->begin || facts->finish || facts->lastRefresh);
    EXPECT_EQ(facts->longestRefresh, 9);
}

TEST(CacheDocumentTest, TakesWhatHasAnotherTypeForAbsent)
{
    const auto facts = FactsOf(R"({"begin_time_to_update":"x","cached_data":1,
        "finish_time_to_update":[],"max_updated_time":9.0,"timeout":18446744073709551615,
        "updated_time":{}})");
    ASSERT_TRUE(facts);
    EXPECT_FALSE(facts->timeout || facts->begin || facts->finish || facts->lastRefresh);
    EXPECT_TRUE(facts->info.isNull());
    EXPECT_EQ(facts->longestRefresh, 0);
}

TEST(CacheDocumentTest, TakesNoOtherDocumentForOneOfACache)
{
    for (const char* text : {"null", "1", "\"cached_data\"", "[]", "{}", "{\"timeout\":60}"}) {
        EXPECT_FALSE(FactsOf(text)) << text;
    }
}

}  // namespace
