// JSON values of every kind, texts that are no JSON document, and a comparison, for tests of code
// that must have an answer to each.
#ifndef ORVADRCORE_TESTS_JSON_KINDS_H
#define ORVADRCORE_TESTS_JSON_KINDS_H

#include <gtest/gtest.h>
#include <json/reader.h>
#include <json/value.h>

#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

// The value that a text stands for, read without the code under test.
inline Json::Value ParseJson(const std::string& text)
{
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    Json::Value value;
    std::string errors;
    if (!reader->parse(text.data(), text.data() + text.size(), &value, &errors)) {
        throw std::invalid_argument(text + ": " + errors);
    }
    return value;
}

// The same value of the same JSON type: 3 is not 3.0, and null is not {}.
inline ::testing::AssertionResult Same(const Json::Value& actual, const Json::Value& expected)
{
    if (actual == expected) return ::testing::AssertionSuccess();
    return ::testing::AssertionFailure()
           << "is " << actual.toStyledString() << "expected is " << expected.toStyledString();
}

// A value of so many levels: arrays and objects in turn, and the innermost value.
inline Json::Value Nested(int levels, Json::Value innermost = Json::Value(Json::arrayValue))
{
    for (int level = 1; level < levels; ++level) {
        Json::Value outer;
        if (level % 2 == 0) {
            outer.append(Json::Value()).swap(innermost);
        } else {
            outer["member"].swap(innermost);
        }
        innermost.swap(outer);
    }
    return innermost;
}

// A value, and what the JSON library's conversions make of it.
struct JsonKind {
    std::string text;          // the value as JSON
    bool asBool;               // false where the library has no conversion
    std::optional<int> asInt;  // where isInt says yes
    std::string asString;      // empty where the library has no conversion
    Json::Value value = ParseJson(text);
};

// No object among them has a member that requests or replies give a meaning to.
inline const std::vector<JsonKind>& JsonKinds()
{
    static const std::vector<JsonKind> kinds{
        {"null", false, {}, ""},
        {"true", true, {}, "true"},
        {"false", false, {}, "false"},
        {"0", false, 0, "0"},
        {"1", true, 1, "1"},
        {"-1", true, -1, "-1"},
        {"-7", true, -7, "-7"},
        {"2147483647", true, 2147483647, "2147483647"},
        {"-2147483648", true, -2147483647 - 1, "-2147483648"},
        {"2147483648", true, {}, "2147483648"},
        {"-2147483649", true, {}, "-2147483649"},
        {"4294967295", true, {}, "4294967295"},
        {"4294967296", true, {}, "4294967296"},
        {"9223372036854775807", true, {}, "9223372036854775807"},
        {"-9223372036854775808", true, {}, "-9223372036854775808"},
        {"18446744073709551615", true, {}, "18446744073709551615"},
        {"0.0", false, 0, "0.0"},
        {"3.0", true, 3, "3.0"},
        {"-1.5", true, {}, "-1.5"},
        {"2147483648.0", true, {}, "2147483648.0"},
        {R"("")", false, {}, ""},
        {R"("text")", false, {}, "text"},
        {R"("5")", false, {}, "5"},
        {R"("true")", false, {}, "true"},
        {R"("a\u0000b")", false, {}, std::string("a\0b", 3)},
        {"[]", false, {}, ""},
        {"[1]", false, {}, ""},
        {R"([[["deep"]],{"member":null}])", false, {}, ""},
        {"{}", false, {}, ""},
        {R"({"member":1})", false, {}, ""},
        {R"({"member":{"member":[true,{"":null}]}})", false, {}, ""},
    };
    return kinds;
}

inline bool IsText(const JsonKind& kind)
{
    return kind.text.front() == '"';
}

// Texts that are not one JSON document: empty, broken off, malformed, or with something behind.
inline const std::vector<std::string>& NoJsonTexts()
{
    using namespace std::string_literals;
    static const std::vector<std::string> texts{
        ""s,          " \t\r\n"s,  "{"s,         "["s,           "}"s,           "]"s,
        ","s,         ":"s,        "\""s,        "\"text"s,      "nul"s,         "tru"s,
        "nulll"s,     "True"s,     "text"s,      "{\"a\""s,      "{\"a\":"s,     "{\"a\":1"s,
        "{\"a\":1,"s, "{\"a\":}"s, "{\"a\" 1}"s, "{a:1}"s,       "{'a':1}"s,     "{1:2}"s,
        "{\"a\":1]"s, "[1"s,       "[1,"s,       "[1 2]"s,       "[1}"s,         "'a'"s,
        "NaN"s,       "Infinity"s, "\"\\x\""s,   "\"\\u12\""s,   "\"\\u12g4\""s, "\"\\ud83d\""s,
        "{} x"s,      "{}x"s,      "{} {}"s,     "{}{}"s,        "{}}"s,         "[1]]"s,
        "[1],"s,      "1 2"s,      "1x"s,        "null null"s,   "truefalse"s,   "\"a\"\"b\""s,
        "{} nul"s,    "{} \""s,    "{} @"s,      "\0"s,          "{}\0"s,        "\0{}"s,
        "{}\0{}"s,    "{\0}"s,     "\"a\0b\""s,  "{\"a\0\":1}"s, "\xff\xfe{}"s,  "{}\xef\xbb\xbf"s,
    };
    return texts;
}

#endif
