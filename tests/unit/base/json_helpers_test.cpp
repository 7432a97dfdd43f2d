#include "base/json_helpers.h"

#include <gtest/gtest.h>
#include <json/value.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <random>
#include <string>
#include <string_view>
#include <vector>

#include "support/fakes/global_locale.h"
#include "support/fixtures/json_kinds.h"

namespace {

using OrvaDRCore::AsBool;
using OrvaDRCore::AsString;
using OrvaDRCore::Clear;
using OrvaDRCore::FindMember;
using OrvaDRCore::fromString;
using OrvaDRCore::IsReadable;
using OrvaDRCore::MaxLevels;
using OrvaDRCore::NestsAtMost;
using OrvaDRCore::toString;

using namespace std::string_literals;

// A document with every kind of value and every kind of token in it.
const char* const Document =
    R"({"a":[1,-2.5e+3,true,false,null,"t\"\u00e9\\"],"b":{"":{}},"c":[[],[{"d":")"
    "\xc3\xbc"
    R"("}]]})";

void ExpectRead(const std::string& text, const Json::Value& expected)
{
    Json::Value value("earlier");
    bool read = false;
    EXPECT_NO_THROW(read = fromString(value, text)) << text;
    EXPECT_TRUE(read) << text;
    EXPECT_TRUE(Same(value, expected)) << text;
}

void ExpectRefused(const std::string& text)
{
    for (const char* earlier : {"null", R"("earlier")", R"([1,{"earlier":true}])"}) {
        const Json::Value before = ParseJson(earlier);
        Json::Value value = before;
        bool read = true;
        EXPECT_NO_THROW(read = fromString(value, text)) << text;
        EXPECT_FALSE(read) << text;
        EXPECT_TRUE(Same(value, before)) << text;
    }
}

Json::Value ThereAndBack(const Json::Value& value)
{
    Json::Value back;
    EXPECT_TRUE(fromString(back, toString(value))) << toString(value);
    return back;
}

std::uint64_t Bits(double number)
{
    std::uint64_t bits = 0;
    static_assert(sizeof bits == sizeof number);
    std::memcpy(&bits, &number, sizeof bits);
    return bits;
}

std::string Repeat(const std::string& piece, std::size_t times)
{
    std::string text;
    for (std::size_t i = 0; i < times; ++i) text += piece;
    return text;
}

std::string EveryByte()
{
    std::string bytes;
    for (int byte = 0; byte < 256; ++byte) bytes += static_cast<char>(byte);
    return bytes;
}

// All pairs of bytes, and longer sequences that are no UTF-8.
std::vector<std::string> ByteStrings()
{
    std::vector<std::string> strings{
        "",
        EveryByte(),
        "\xe2\x82",          // truncated
        "\xf0\x9f\x98",      // truncated
        "\xe2\x28\xa1",      // without the bytes that the first one announces
        "\xc0\x80",          // overlong
        "\xf0\x80\x80\xaf",  // overlong
        "\xed\xa0\x80",      // half of a surrogate pair
        "\xf4\x90\x80\x80",  // beyond the last character
        "\xff\xff\xff\xff",
        "\xe2\x82\xac \xf0\x9f\x98\x80",  // valid UTF-8
    };
    for (const char first : EveryByte()) {
        for (const char second : EveryByte()) strings.push_back(std::string{first, second});
    }
    return strings;
}

// ------------------------------------------------------------------------------------- fromString

TEST(FromStringTest, ReadsADocumentOfAnyType)
{
    for (const JsonKind& kind : JsonKinds()) ExpectRead(kind.text, kind.value);
    ExpectRead(Document, ParseJson(Document));
}

TEST(FromStringTest, AllowsWhiteSpaceAroundTheDocument)
{
    for (const JsonKind& kind : JsonKinds()) {
        ExpectRead(" \t\r\n" + kind.text + " \t\r\n", kind.value);
    }
}

TEST(FromStringTest, ReplacesEscapesByTheirBytes)
{
    ExpectRead(R"("\u0000\u0041\u00e9\u20ac\ud83d\ude00\"\\\/\b\f\n\r\t")",
               Json::Value("\0A\xc3\xa9\xe2\x82\xac\xf0\x9f\x98\x80\"\\/\b\f\n\r\t"s));
}

TEST(FromStringTest, ATextThatIsNoDocumentLeavesTheValue)
{
    for (const std::string& text : NoJsonTexts()) ExpectRefused(text);
}

TEST(FromStringTest, RefusesEveryPrefixOfAnObjectOrArray)
{
    const std::string object = Document;
    for (const std::string& document : {object, "[" + object + "]"}) {
        ExpectRead(document, ParseJson(document));
        for (std::size_t length = 0; length < document.size(); ++length) {
            ExpectRefused(document.substr(0, length));
            ExpectRefused(document.substr(0, length) + "\n");
        }
    }
}

TEST(FromStringTest, RefusesTextAfterTheDocument)
{
    const std::vector<std::string> tails{
        " x",    " nul", "]",    "}",      ",",     ":",       " 1",    " -",
        " null", "\"",   "'",    " \"a\"", " {}",   " []",     "\n{",   "\n" + EveryByte(),
        "@",     "\x01", "\xff", "\0"s,    "\0\0"s, "\n\0 x"s, "\0{}"s,
    };
    for (const JsonKind& kind : JsonKinds()) {
        for (const std::string& tail : tails) ExpectRefused(kind.text + tail);
    }
}

TEST(FromStringTest, RefusesACommentAfterTheDocument)
{
    ExpectRefused("{} // comment");
    ExpectRefused("{} /* comment */");
    ExpectRefused("[1]/**/\n");
}

TEST(FromStringTest, RefusesACommaAfterTheLastMember)
{
    ExpectRefused("[1,]");
    ExpectRefused(R"({"a":1,})");
}

TEST(FromStringTest, RefusesAZeroByteAnywhere)
{
    const std::string document = Document;
    for (std::size_t at = 0; at <= document.size(); ++at) {
        std::string text = document;
        text.insert(at, 1, '\0');
        ExpectRefused(text);
    }
}

TEST(FromStringTest, RefusesNestingBeyondTheLimit)
{
    struct Nest {
        const char* open;
        const char* close;
        std::size_t levels;  // added by one repetition
    };
    for (const Nest& nest : {Nest{"[", "]", 1}, Nest{R"({"a":)", "}", 1},
                             Nest{R"([{"a":)", "}]", 2}, Nest{"[0,", "]", 1}}) {
        const auto text = [&](std::size_t depth) {
            const std::size_t times =
                (depth - 1) / nest.levels;  // the innermost value is one more level
            return Repeat(nest.open, times) + "[]" + Repeat(nest.close, times);
        };
        for (const std::size_t depth : {std::size_t{999}, std::size_t{1}}) {
            ExpectRead(text(depth), ParseJson(text(depth)));
        }
        ExpectRefused(text(1003));
        ExpectRefused(text(100001));
        ExpectRefused(Repeat(nest.open, 100000));
    }
    ExpectRead(Repeat("[", 1000) + Repeat("]", 1000),
               ParseJson(Repeat("[", 1000) + Repeat("]", 1000)));
    ExpectRefused(Repeat("[", 1001) + Repeat("]", 1001));
}

// --------------------------------------------------------------------------------------- toString

TEST(ToStringTest, WritesOneLineWithoutBlanksOrANewline)
{
    struct Row {
        const char* text;
        const char* written;
    };
    for (const Row& row : {
             Row{"null", "null"},
             Row{" true", "true"},
             Row{"-7", "-7"},
             Row{"3.0", "3.0"},
             Row{"[ ]", "[]"},
             Row{"{ }", "{}"},
             Row{"[ 1 , [ 2 ] , { } ]", "[1,[2],{}]"},
             Row{"{ \"b\" : 1 ,\n \"a\" : { \"c\" : null } }", R"({"a":{"c":null},"b":1})"},
             Row{R"("a b\n\t\"\\/")", R"("a b\n\t\"\\/")"},
         }) {
        EXPECT_EQ(toString(ParseJson(row.text)), row.written);
    }
}

TEST(ToStringTest, WritesALongDocumentOnOneLine)
{
    Json::Value list(Json::arrayValue);
    std::string expected;
    for (int number = 0; number < 1000; ++number) {
        Json::Value entry;
        entry["number"] = number;
        entry["text"] = std::string(100, 'x');
        list.append(entry);
        expected += (number > 0 ? "," : "") + R"({"number":)"s + std::to_string(number) +
                    R"(,"text":")" + std::string(100, 'x') + "\"}";
    }
    EXPECT_EQ(toString(list), "[" + expected + "]");
}

TEST(ToStringTest, OmitsCommentsOfAValue)
{
    Json::Value value(1);
    value.setComment(std::string("// before"), Json::commentBefore);
    value.setComment(std::string("// behind"), Json::commentAfterOnSameLine);
    EXPECT_EQ(toString(value), "1");
}

TEST(ToStringTest, DoesNotEscapeBytesAbove0x7f)
{
    const std::string high = EveryByte().substr(0x80);
    Json::Value value;
    value[high] = high;
    EXPECT_EQ(toString(value), "{\"" + high + "\":\"" + high + "\"}");
}

TEST(ToStringTest, WritesNoControlCharacter)
{
    Json::Value value;
    value[EveryByte()] = EveryByte();
    for (const char byte : toString(value)) EXPECT_GE(static_cast<unsigned char>(byte), 0x20);
}

// ------------------------------------------------------------------------------------- round trip

TEST(JsonRoundTripTest, PreservesEveryType)
{
    for (const JsonKind& kind : JsonKinds()) {
        EXPECT_TRUE(Same(ThereAndBack(kind.value), kind.value)) << kind.text;
    }
    EXPECT_TRUE(Same(ThereAndBack(ParseJson(Document)), ParseJson(Document)));
}

TEST(JsonRoundTripTest, PreservesEveryByteStringAsAText)
{
    const std::vector<std::string> strings = ByteStrings();
    Json::Value value(Json::arrayValue);
    for (const std::string& bytes : strings) value.append(bytes);
    const Json::Value back = ThereAndBack(value);
    ASSERT_EQ(back.size(), strings.size());
    for (Json::ArrayIndex i = 0; i < back.size(); ++i) EXPECT_EQ(back[i].asString(), strings[i]);
}

TEST(JsonRoundTripTest, PreservesEveryByteStringAsAKey)
{
    const std::vector<std::string> strings = ByteStrings();
    Json::Value value;
    for (const std::string& bytes : strings) value[bytes] = bytes;
    const Json::Value back = ThereAndBack(value);
    EXPECT_EQ(back.size(), value.size());
    for (const std::string& bytes : strings) EXPECT_TRUE(Same(back[bytes], Json::Value(bytes)));
}

TEST(JsonRoundTripTest, PreservesIntegersAtTheirLimits)
{
    using Int64Limits = std::numeric_limits<std::int64_t>;
    using IntLimits = std::numeric_limits<int>;
    for (const std::int64_t number :
         {Int64Limits::min(), Int64Limits::min() + 1, std::int64_t{IntLimits::min()} - 1,
          std::int64_t{IntLimits::min()}, std::int64_t{-1}, std::int64_t{0}, std::int64_t{1},
          std::int64_t{IntLimits::max()}, std::int64_t{IntLimits::max()} + 1,
          (std::int64_t{1} << 53) + 1, Int64Limits::max()}) {
        const Json::Value back = ThereAndBack(Json::Value(Json::Int64{number}));
        EXPECT_EQ(toString(back), std::to_string(number));
        ASSERT_TRUE(back.isInt64()) << number;
        EXPECT_NE(back.type(), Json::realValue) << number;
        EXPECT_EQ(back.asInt64(), number);
    }
    for (const std::uint64_t number :
         {std::uint64_t{0}, std::uint64_t{std::numeric_limits<unsigned int>::max()},
          std::uint64_t{std::numeric_limits<unsigned int>::max()} + 1,
          std::uint64_t{Int64Limits::max()}, std::uint64_t{Int64Limits::max()} + 1,
          std::numeric_limits<std::uint64_t>::max() - 1,
          std::numeric_limits<std::uint64_t>::max()}) {
        const Json::Value back = ThereAndBack(Json::Value(Json::UInt64{number}));
        EXPECT_EQ(toString(back), std::to_string(number));
        ASSERT_TRUE(back.isUInt64()) << number;
        EXPECT_EQ(back.asUInt64(), number);
    }
}

// Numbers of all sizes, the same in each run.
std::vector<double> RealNumbers()
{
    using Limits = std::numeric_limits<double>;
    std::vector<double> numbers{0.0,
                                -0.0,
                                0.1,
                                1.0 / 3,
                                3.0,
                                -3.0,
                                2147483648.0,
                                1e22,
                                1e23,
                                9007199254740993.0,
                                Limits::max(),
                                Limits::lowest(),
                                Limits::min(),
                                Limits::epsilon(),
                                Limits::denorm_min(),
                                -Limits::denorm_min(),
                                1 + Limits::epsilon()};
    std::mt19937_64 bits(1);  // NOLINT: the same numbers on every run
    while (numbers.size() < 2000) {
        const std::uint64_t pattern = bits();
        double number = 0;
        std::memcpy(&number, &pattern, sizeof number);
        if (std::isfinite(number)) numbers.push_back(number);
    }
    return numbers;
}

void ExpectRealNumbersBack()
{
    const std::vector<double> numbers = RealNumbers();
    Json::Value value(Json::arrayValue);
    for (const double number : numbers) value.append(number);

    const Json::Value back = ThereAndBack(value);
    ASSERT_EQ(back.size(), numbers.size());
    for (Json::ArrayIndex i = 0; i < back.size(); ++i) {
        EXPECT_EQ(back[i].type(), Json::realValue) << numbers[i];
        EXPECT_EQ(Bits(back[i].asDouble()), Bits(numbers[i])) << numbers[i];
    }
}

TEST(JsonRoundTripTest, PreservesRealNumbersToTheLastBit)
{
    ExpectRealNumbersBack();
}

TEST(JsonRoundTripTest, PreservesRealNumbersWithADecimalComma)
{
    const GlobalLocale locale(new CommaDecimals);
    ExpectRealNumbersBack();
}

// A locale changes neither what is a document nor what it holds.
TEST(FromStringTest, ReadsTheSameInEveryLocale)
{
    std::vector<std::string> texts = {
        "1.5",
        "-1.5",
        "0.1",
        "1.234",
        "1.234.567",
        "1,5",
        "1.",
        "1.e5",
        "-.5",
        "+.5",
        "+1.5",
        "+-.5",
        "--.5",
        ".5",
        "-.",
        ".",
        "1..5",
        "1.5.",
        "1.5e",
        "1.5e+",
        "1.5e+-3",
        "1.5e--3",
        "1.5e++3",
        "1.5e 5",
        "1.5e5",
        "1.5E5",
        "1.5e+5",
        "1.5e-5",
        "1.5e5.5",
        "1.5e5e5",
        "00.5",
        "1.50",
        "-0.0",
        "1.5x",
        "1.5 ",
        " 1.5",
        "1.5e400",
        "1.5e-400",
        "1.5e99999999999999999999",
        "1.5e-99999999999999999999",
        "0.0e99999999999999999999",
        "1.7976931348623157e308",
        "1.7976931348623159e308",
        "5.0e-324",
        "[1.5,2.5]",
        "[1.5.5]",
        "[.5]",
        "[1.5",
        R"({"a":1.5})",
        R"("1.5")",
        R"("a\"1.5")",
        R"("\\",1.5)",
        R"(["\\",1.5])",
        R"(["\"",1.5])",
        R"({"1.5":1})",
        R"("1.5)",
        R"("1.5\)",
        R"(["1.5\",1.5])",
        "1.5\"",
        Document,
    };
    for (const std::string& text : NoJsonTexts()) texts.push_back(text);
    for (const JsonKind& kind : JsonKinds()) texts.push_back(kind.text);
    for (const std::string& text : texts) {
        Json::Value expected("earlier");
        const bool isDocument = fromString(expected, text);
        const GlobalLocale locale(new CommaDecimals);
        Json::Value value("earlier");
        EXPECT_EQ(fromString(value, text), isDocument) << text;
        EXPECT_TRUE(Same(value, expected)) << text;
    }
}

// ---------------------------------------------------------------------------- members, conversion

// Whether the value can be read again: tries it.
bool ComesBack(const Json::Value& value)
{
    Json::Value back;
    return fromString(back, toString(value));
}

TEST(IsReadableTest, RefusesWhatNestsTooDeep)
{
    for (const Json::Value& innermost :
         {Json::Value(Json::arrayValue), Json::Value(Json::objectValue), Json::Value(1)}) {
        for (int levels = 990; levels <= 1010; ++levels) {
            const Json::Value value = Nested(levels, innermost);
            EXPECT_EQ(IsReadable(value), ComesBack(value)) << levels;
            EXPECT_EQ(IsReadable(value), levels <= MaxLevels) << levels;
            Json::Value document;
            document["member"].append(value);
            EXPECT_EQ(IsReadable(value, 2), ComesBack(document)) << levels;
            EXPECT_EQ(IsReadable(value, 2), IsReadable(document)) << levels;
        }
    }
}

TEST(IsReadableTest, RefusesADeepMemberAtAnyPlace)
{
    for (const int levels : {MaxLevels - 1, MaxLevels}) {
        Json::Value list;
        Json::Value object;
        for (int number = 0; number < 3; ++number) {
            list.append(number);
            object[std::to_string(number)] = number;
        }
        list[1] = Nested(levels);
        object["1"] = Nested(levels);
        EXPECT_EQ(IsReadable(list), levels < MaxLevels);
        EXPECT_EQ(IsReadable(list), ComesBack(list));
        EXPECT_EQ(IsReadable(object), levels < MaxLevels);
        EXPECT_EQ(IsReadable(object), ComesBack(object));
    }
}

TEST(IsReadableTest, RefusesInfinitiesAndAcceptsAllOtherNumbers)
{
    using Limits = std::numeric_limits<double>;
    const std::vector<double> numbers = {0.0,
                                         -0.0,
                                         1.5,
                                         Limits::max(),
                                         Limits::lowest(),
                                         Limits::min(),
                                         Limits::denorm_min(),
                                         Limits::quiet_NaN(),
                                         Limits::infinity(),
                                         -Limits::infinity()};
    for (const double number : numbers) {
        Json::Value list;
        list.append(1);
        list.append(number);
        Json::Value object;
        object["a"]["b"] = number;
        for (const Json::Value& value : {Json::Value(number), list, object}) {
            EXPECT_EQ(IsReadable(value), !std::isinf(number)) << number;
            EXPECT_EQ(IsReadable(value), ComesBack(value)) << number;
        }
    }
    EXPECT_EQ(toString(Limits::quiet_NaN()), "null");
}

TEST(IsReadableTest, AcceptsAllOtherTypes)
{
    for (const JsonKind& kind : JsonKinds()) EXPECT_TRUE(IsReadable(kind.value)) << kind.text;
    EXPECT_TRUE(IsReadable("Infinity"));
    EXPECT_TRUE(IsReadable("1e+9999"));
}

TEST(NestsAtMostTest, CountsTheLevelsOfTheDeepestMember)
{
    for (const JsonKind& kind : JsonKinds()) {
        EXPECT_FALSE(NestsAtMost(kind.value, 0)) << kind.text;
        const bool hasMembers = kind.value.begin() != kind.value.end();
        EXPECT_EQ(NestsAtMost(kind.value, 1), !hasMembers) << kind.text;
    }
    EXPECT_TRUE(NestsAtMost(std::numeric_limits<double>::infinity(), 1));
    for (const int levels : {1, 2, 3, 5000}) {
        Json::Value value = Nested(levels);
        EXPECT_TRUE(NestsAtMost(value, levels));
        EXPECT_FALSE(NestsAtMost(value, levels - 1));
        EXPECT_FALSE(NestsAtMost(value, -1));
    }
}

// The limits are those of jsoncpp; tests/huge has texts of that length.
TEST(JsonLengthTest, AcceptsTextsAndNamesUpToTheirLimits)
{
    constexpr std::size_t Huge = std::numeric_limits<std::size_t>::max();
    // On 32-bit machines a std::string holds less than jsoncpp's 2 GiB.
    const std::size_t longest = std::min<std::size_t>(std::string().max_size(), 2'147'483'642);
    EXPECT_TRUE(OrvaDRCore::FitsJsonText(0) && OrvaDRCore::FitsJsonText(longest));
    EXPECT_FALSE(OrvaDRCore::FitsJsonText(longest + 1) || OrvaDRCore::FitsJsonText(Huge));
    EXPECT_TRUE(OrvaDRCore::FitsJsonName(0) && OrvaDRCore::FitsJsonName((1U << 30U) - 1));
    EXPECT_FALSE(OrvaDRCore::FitsJsonName(1U << 30U) || OrvaDRCore::FitsJsonName(Huge));
}

TEST(JsonLengthTest, KeepsEveryByteOfAText)
{
    using namespace std::string_view_literals;
    for (const std::string_view text : {""sv, "abc"sv, "a\0b"sv, "\xff"sv}) {
        EXPECT_EQ(OrvaDRCore::ToJsonText(text).asString(), text);
    }
}

TEST(FindMemberTest, FindsNothingInAValueThatIsNoObject)
{
    for (const JsonKind& kind : JsonKinds()) {
        if (kind.value.isObject()) continue;
        for (const char* key : {"member", "", "0"}) {
            const Json::Value* member = &kind.value;
            EXPECT_NO_THROW(member = FindMember(kind.value, key)) << kind.text;
            EXPECT_EQ(member, nullptr) << kind.text;
        }
    }
}

TEST(FindMemberTest, FindsTheMemberItselfWhateverItsType)
{
    for (const JsonKind& kind : JsonKinds()) {
        Json::Value object;
        object["key"] = kind.value;
        object[""] = kind.value;
        const Json::Value& same = object;
        EXPECT_EQ(FindMember(object, "key"), &same["key"]) << kind.text;
        EXPECT_EQ(FindMember(object, ""), &same[""]) << kind.text;
        EXPECT_EQ(FindMember(object, "ke"), nullptr) << kind.text;
        EXPECT_EQ(FindMember(object, "keys"), nullptr) << kind.text;
        EXPECT_EQ(FindMember(object, "Key"), nullptr) << kind.text;
    }
}

TEST(FindMemberTest, FindsNothingForANullKey)
{
    for (const JsonKind& kind : JsonKinds()) {
        EXPECT_EQ(FindMember(kind.value, nullptr), nullptr) << kind.text;
    }
    EXPECT_EQ(FindMember(ParseJson(R"({"":1})"), nullptr), nullptr);
}

TEST(FindMemberTest, IgnoresAKeyThatGoesOnAfterAZeroByte)
{
    const Json::Value object = ParseJson(R"({"key\u0000":1,"\u0000":2})");
    EXPECT_EQ(FindMember(object, "key"), nullptr);
    EXPECT_EQ(FindMember(object, ""), nullptr);
}

// The rows of JsonKinds(), which many tests use, compared with jsoncpp.
TEST(JsonKindsTest, TheRowsAgreeWithJsoncpp)
{
    for (const JsonKind& kind : JsonKinds()) {
        SCOPED_TRACE(kind.text);
        bool asBool = false;
        std::string asString;
        try {
            asBool = kind.value.asBool();
        } catch (const Json::Exception&) {
            asBool = false;
        }
        try {
            asString = kind.value.asString();
        } catch (const Json::Exception&) {
            asString.clear();
        }
        EXPECT_EQ(asBool, kind.asBool);
        EXPECT_EQ(asString, kind.asString);
        EXPECT_EQ(kind.value.isInt(), kind.asInt.has_value());
        if (kind.asInt) {
            EXPECT_EQ(kind.value.asInt(), *kind.asInt);
        }
        EXPECT_EQ(kind.value.isString(), IsText(kind));
    }
}

TEST(AsBoolTest, ConvertsAsJsoncppDoesOrToFalse)
{
    for (const JsonKind& kind : JsonKinds()) {
        bool answer = !kind.asBool;
        EXPECT_NO_THROW(answer = AsBool(kind.value)) << kind.text;
        EXPECT_EQ(answer, kind.asBool) << kind.text;
    }
    EXPECT_TRUE(AsBool(Json::Value(7U)));
    EXPECT_TRUE(AsBool(Json::Value(std::numeric_limits<double>::infinity())));
    EXPECT_FALSE(AsBool(Json::Value(std::numeric_limits<double>::quiet_NaN())));
    EXPECT_FALSE(AsBool(Json::Value(-0.0)));
}

TEST(AsStringTest, ConvertsAsJsoncppDoesOrToTheEmptyText)
{
    for (const JsonKind& kind : JsonKinds()) {
        std::string answer = "earlier";
        EXPECT_NO_THROW(answer = AsString(kind.value)) << kind.text;
        EXPECT_EQ(answer, kind.asString) << kind.text;
    }
    EXPECT_EQ(AsString(Json::Value(7U)), "7");
    const double infinity = std::numeric_limits<double>::infinity();
    EXPECT_EQ(AsString(Json::Value(infinity)), Json::Value(infinity).asString());
}

TEST(ClearTest, EmptiesObjectsAndArraysAndSetsAllElseToNull)
{
    for (const JsonKind& kind : JsonKinds()) {
        Json::Value expected;
        if (kind.text.front() == '[') expected = Json::Value(Json::arrayValue);
        if (kind.text.front() == '{') expected = Json::Value(Json::objectValue);
        Json::Value value = kind.value;
        EXPECT_NO_THROW(Clear(value)) << kind.text;
        EXPECT_TRUE(Same(value, expected)) << kind.text;
    }
}

}  // namespace
