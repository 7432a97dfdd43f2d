// The text of toString(), compared with that of jsoncpp's own writer.
#include <gtest/gtest.h>
#include <json/value.h>

#include <cstdint>
#include <cstring>
#include <limits>
#include <random>
#include <string>
#include <vector>

#include "base/json_helpers.h"
#include "support/fakes/global_locale.h"
#include "support/fixtures/json_kinds.h"
#include "support/fixtures/jsoncpp_text.h"

namespace {

using OrvaDRCore::toString;

using namespace std::string_literals;

void ExpectAsJsoncppWrites(const Json::Value& value)
{
    const std::string text = toString(value);
    const std::string expected = JsoncppText(value);
    EXPECT_TRUE(text == expected) << text.substr(0, 1000) << "\ninstead of\n"
                                  << expected.substr(0, 1000);
}

// As a value, as a name, and next to others.
void ExpectTextAsJsoncppWrites(const std::string& text)
{
    Json::Value document;
    document[text] = text;
    document["list"].append("before");
    document["list"].append(text);
    document["list"].append("behind");
    ExpectAsJsoncppWrites(document);
    ExpectAsJsoncppWrites(text);
}

// A value of any kind, made from random numbers.
class RandomValues {
  public:
    Json::Value Value(int levels)
    {
        switch (Below(levels > 0 ? 12 : 8)) {
            case 0: return {};
            case 1: return Below(2) == 0;
            case 2: return Json::Int64{static_cast<std::int64_t>(bits_())};
            case 3: return Json::UInt64{bits_()};
            case 4: return Real();
            case 5: return static_cast<int>(Below(1000)) - 500;
            case 6:
            case 7: return Text();
            case 8:
            case 9: return Array(levels - 1);
            default: return Object(levels - 1);
        }
    }

  private:
    std::uint64_t Below(std::uint64_t count) { return bits_() % count; }

    double Real()
    {
        const std::uint64_t pattern = bits_();
        double number = 0;
        std::memcpy(&number, &pattern, sizeof number);
        return number;
    }

    // Mostly bytes of any value, and those that are escaped.
    std::string Text()
    {
        std::string text;
        for (std::uint64_t length = Below(24); length > 0; --length) {
            const bool isAny = Below(3) > 0;
            text += isAny ? static_cast<char>(Below(256))
                          : "ab/\"\\\n\t\x7f"s[static_cast<std::size_t>(Below(8))];
        }
        return text;
    }

    // Some elements may never have been set.
    Json::Value Array(int levels)
    {
        Json::Value array(Json::arrayValue);
        const std::uint64_t step = 1 + Below(8) / 7;
        for (std::uint64_t count = Below(40), index = 0; index < count; index += step) {
            array[static_cast<Json::ArrayIndex>(index)] = Value(levels);
        }
        return array;
    }

    Json::Value Object(int levels)
    {
        Json::Value object(Json::objectValue);
        for (std::uint64_t count = Below(8); count > 0; --count) object[Text()] = Value(levels);
        return object;
    }

    std::mt19937_64 bits_{2022};  // NOLINT: the same values on every run
};

// ------------------------------------------------------------------------------------------ texts

TEST(JsonWritingTest, WritesEveryByteAsJsoncppDoes)
{
    std::string all;
    for (int byte = 0; byte < 256; ++byte) {
        const char character = static_cast<char>(byte);
        all += character;
        ExpectTextAsJsoncppWrites(std::string(1, character));
        ExpectTextAsJsoncppWrites("before"s + character + "behind");
        ExpectTextAsJsoncppWrites(std::string(3, character));
    }
    ExpectTextAsJsoncppWrites(all);
    ExpectTextAsJsoncppWrites("");
}

TEST(JsonWritingTest, WritesEveryPairOfBytesAsJsoncppDoes)
{
    Json::Value texts(Json::arrayValue);
    for (int first = 0; first < 256; ++first) {
        for (int second = 0; second < 256; ++second) {
            texts.append(std::string{static_cast<char>(first), static_cast<char>(second)});
        }
    }
    ExpectAsJsoncppWrites(texts);
}

TEST(JsonWritingTest, WritesInvalidUtf8AsJsoncppDoes)
{
    for (const char* text : {"\xe2\x82", "\xf0\x9f\x98", "\xe2\x28\xa1", "\xc0\x80", "\xed\xa0\x80",
                             "\xf4\x90\x80\x80", "\xff\xff", "\xe2\x82\xac \xf0\x9f\x98\x80"}) {
        ExpectTextAsJsoncppWrites(text);
        ExpectTextAsJsoncppWrites("\x1b["s + text + "\n\"");
    }
}

TEST(JsonWritingTest, EscapesControlCharacters)
{
    EXPECT_EQ(toString("\0\x1b\x1f\x7f"s), "\"\\u0000\\u001b\\u001f\x7f\"");
    EXPECT_EQ(toString("\b\f\n\r\t\"\\/"), R"("\b\f\n\r\t\"\\/")");
}

TEST(JsonWritingTest, WritesTextsThatTheCallerOwnsAsJsoncppDoes)
{
    ExpectAsJsoncppWrites(Json::Value(Json::StaticString("a \"text\"")));
    ExpectAsJsoncppWrites(Json::Value(Json::StaticString("")));
    ExpectAsJsoncppWrites(Json::Value(Json::stringValue));
    // A null pointer gives no text at all, not even quotes.
    const Json::Value null{Json::StaticString(nullptr)};
    Json::Value list;
    list.append(null);
    ExpectAsJsoncppWrites(list);
    list.append(null);
    list.append(1);
    Json::Value document;
    document["list"] = list;
    document["member"] = null;
    for (const Json::Value& value : {null, list, document}) ExpectAsJsoncppWrites(value);
}

// ---------------------------------------------------------------------------------------- numbers

TEST(JsonWritingTest, WritesNumbersAtTheirLimitsAsJsoncppDoes)
{
    using Int64 = std::numeric_limits<std::int64_t>;
    using Real = std::numeric_limits<double>;
    for (const std::int64_t number :
         {Int64::min(), Int64::min() + 1, std::int64_t{-1}, std::int64_t{0}, std::int64_t{9},
          std::int64_t{10}, std::int64_t{1} << 31, Int64::max() - 1, Int64::max()}) {
        ExpectAsJsoncppWrites(Json::Int64{number});
        ExpectAsJsoncppWrites(Json::UInt64{static_cast<std::uint64_t>(number)});
    }
    for (const double number :
         {0.0, 0.1, 1.0, 1.0 / 3, 123456789.0, 1e15, 1e16, 1e17, 1e300, 1e-300, 9007199254740993.0,
          Real::min(), Real::max(), Real::epsilon(), Real::denorm_min(), Real::infinity(),
          Real::quiet_NaN()}) {
        ExpectAsJsoncppWrites(number);
        ExpectAsJsoncppWrites(-number);
        const GlobalLocale locale(new CommaDecimals);
        ExpectAsJsoncppWrites(number);
    }
    EXPECT_EQ(toString(Real::infinity()) + toString(-Real::infinity()), "1e+9999-1e+9999");
    EXPECT_EQ(toString(-0.0) + toString(5e-324) + toString(1e300),
              "-0.04.9406564584124654e-3241.0000000000000001e+300");
}

// -------------------------------------------------------------------------------------- documents

TEST(JsonWritingTest, WritesDocumentsOfAllKindsAsJsoncppDoes)
{
    for (const JsonKind& kind : JsonKinds()) ExpectAsJsoncppWrites(kind.value);
    RandomValues values;
    for (int count = 0; count < 2000; ++count) ExpectAsJsoncppWrites(values.Value(4));
}

TEST(JsonWritingTest, WritesElementsThatWereNeverSetAsNull)
{
    Json::Value sparse;
    sparse[2] = "two";
    sparse[5].append(1);
    EXPECT_EQ(toString(sparse), R"([null,null,"two",null,null,[1]])");
    ExpectAsJsoncppWrites(sparse);
    sparse.resize(9);
    ExpectAsJsoncppWrites(sparse);
}

TEST(JsonWritingTest, OmitsCommentsEverywhere)
{
    Json::Value value;
    value["list"].append(1).setComment(std::string("// before"), Json::commentBefore);
    value["list"].setComment(std::string("// same line"), Json::commentAfterOnSameLine);
    value["member"] = "m";
    value["member"].setComment(std::string("/* behind */"), Json::commentAfter);
    EXPECT_EQ(toString(value), R"({"list":[1],"member":"m"})");
    ExpectAsJsoncppWrites(value);
    ExpectAsJsoncppWrites(ParseJson("// one\n{\"a\": /* two */ 1, // three\n\"b\":[]}"));
}

TEST(JsonWritingTest, WritesDeepDocumentsAsJsoncppDoes)
{
    for (const Json::Value& innermost :
         {Json::Value(Json::arrayValue), Json::Value(Json::objectValue), Json::Value("\x01")}) {
        ExpectAsJsoncppWrites(Nested(10'000, innermost));
    }
}

}  // namespace
