#include "base/json_helpers.h"

#include <algorithm>
#include <atomic>
#include <charconv>
#include <cmath>
#include <cstring>
#include <locale>
#include <memory>
#include <sstream>

#include <json/reader.h>
#include <json/writer.h>

#include "base/file_io.h"
#include "base/replace_file.h"

namespace OrvaDRCore {

namespace {

void Configure(Json::CharReaderBuilder& builder)
{
    builder["allowComments"] = false;
    builder["allowTrailingCommas"] = false;
    builder["failIfExtra"] = true;
    builder["stackLimit"] = MaxLevels;
}

void Configure(Json::StreamWriterBuilder& builder)
{
    builder["commentStyle"] = "None";
    builder["emitUTF8"] = true;
    builder["indentation"] = "";
}

// The configured builder, which takes longer to make than a small document to read. It is made at
// the first use and stays as it is. Threads that come first at once make one each: a lock might be
// held by another thread in a process that forks.
template <class Builder>
const Builder& Kept()
{
    static std::atomic<const Builder*> kept{nullptr};
    const Builder* builder = kept.load(std::memory_order_acquire);
    if (builder == nullptr) {
        auto made = std::make_unique<Builder>();
        Configure(*made);
        if (kept.compare_exchange_strong(builder, made.get(), std::memory_order_acq_rel)) {
            builder = made.release();
        }
    }
    return *builder;
}

// Whether the program's locale, which the streams of jsoncpp's reader have, writes real numbers as
// JSON does.
bool LocaleHasPoint()
{
    return std::use_facet<std::numpunct<char>>(std::locale()).decimal_point() == '.';
}

// Whether a number may go on with a point after this: jsoncpp reads ".5" after a sign, too.
bool MayStandBeforePoint(char byte)
{
    return (byte >= '0' && byte <= '9') || byte == '-' || byte == '+';
}

// Appends what follows the point of a number, with an exponent that makes up for the point. Answers
// where that ends in `text`.
std::size_t AppendFraction(const std::string& text, std::size_t begin, std::string& result)
{
    const std::size_t end = std::min(text.find_first_not_of("0123456789", begin), text.size());
    result.append(text, begin, end - begin);
    const char* at = &text[end];
    int exponent = 0;
    if (*at == 'e' || *at == 'E') {
        ++at;
        if (*at == '+' && at[1] != '-') ++at;
        const auto [stop, error] = std::from_chars(at, text.data() + text.size(), exponent);
        // Without the point alone a number is still none, or still too large or small for any.
        if (error != std::errc()) return end;
        at = stop;
    }
    result += "e" + std::to_string(exponent - static_cast<long>(end - begin));
    return static_cast<std::size_t>(at - text.data());
}

// The document with its real numbers written without a point, which every locale reads alike: 314e8
// for 3.14e10. What is no document stays none.
std::string WithoutPoints(const std::string& text)
{
    std::string result;
    result.reserve(text.size() + text.size() / 4);
    bool inString = false;
    for (std::size_t at = 0; at < text.size();) {
        const char byte = text[at++];
        if (byte == '"') inString = !inString;
        const char before = at > 1 ? text[at - 2] : '\0';
        if (byte == '.' && !inString && MayStandBeforePoint(before)) {
            at = AppendFraction(text, at, result);
            continue;
        }
        result += byte;
        if (byte == '\\' && inString && at < text.size()) result += text[at++];
    }
    return result;
}

// Reads a whole document. False, and `value` as it was, when the reader does not take it.
bool Parse(Json::Value& value, const std::string& text)
{
    const std::unique_ptr<Json::CharReader> reader(Kept<Json::CharReaderBuilder>().newCharReader());

    // A document that breaks off leaves its first members behind in the reader's output.
    Json::Value document;
    try {
        if (!reader->parse(text.data(), text.data() + text.size(), &document, nullptr))
            return false;
    } catch (const Json::Exception&) {
        return false;
    }
    value.swap(document);
    return true;
}

enum class Reals { Any, Finite };

// Whether a value has so many levels at most, and none but such real numbers.
bool Holds(const Json::Value& value, int levels, Reals reals)
{
    if (levels <= 0) return false;
    switch (value.type()) {
        case Json::realValue: return reals == Reals::Any || !std::isinf(value.asDouble());
        case Json::arrayValue:
        case Json::objectValue:
            for (const Json::Value& member : value) {
                if (!Holds(member, levels - 1, reals)) return false;
            }
            return true;
        default: return true;
    }
}

}  // namespace

// jsoncpp keeps a text behind its length, both in memory whose size must be a positive int.
bool FitsJsonText(std::size_t length)
{
    return length <= static_cast<std::size_t>(Json::Value::maxInt) - sizeof(unsigned int) - 1;
}

// jsoncpp keeps the length of a name in 30 bits.
bool FitsJsonName(std::size_t length)
{
    return length < std::size_t{1} << 30U;
}

Json::Value ToJsonText(std::string_view text)
{
    if (!FitsJsonText(text.size())) return {};
    return {text.data(), text.data() + text.size()};
}

bool fromString(Json::Value& value, const std::string& text)
{
    if (!FitsJsonText(text.size())) return false;
    // The reader takes a zero byte for the end of the text and would pass over what follows it. No
    // JSON document holds one: in strings it is written \u0000.
    if (text.find('\0') != std::string::npos) return false;
    return LocaleHasPoint() ? Parse(value, text) : Parse(value, WithoutPoints(text));
}

std::string toString(const Json::Value& value)
{
    const auto& builder = Kept<Json::StreamWriterBuilder>();
    const std::unique_ptr<Json::StreamWriter> writer(builder.newStreamWriter());
    std::ostringstream text;
    text.exceptions(std::ios::badbit);  // or a text for which memory is short comes out cut off
    writer->write(value, &text);
    return text.str();
}

bool NestsAtMost(const Json::Value& value, int levels)
{
    return Holds(value, levels, Reals::Any);
}

bool IsReadable(const Json::Value& value, int levelsAbove)
{
    return Holds(value, MaxLevels - levelsAbove, Reals::Finite);
}

bool fromFile(Json::Value& value, const std::string& path)
{
    std::string text;
    return ReadRegularFile(path, text) && fromString(value, text);
}

bool toFile(const Json::Value& value, const std::string& path)
{
    return ReplaceFile(path, toString(value));
}

const Json::Value* FindMember(const Json::Value& object, const char* key)
{
    if (key == nullptr || !object.isObject()) return nullptr;
    const std::size_t length = std::strlen(key);
    return FitsJsonName(length) ? object.find(key, key + length) : nullptr;
}

bool AsBool(const Json::Value& value)
{
    return value.isConvertibleTo(Json::booleanValue) && value.asBool();
}

std::string AsString(const Json::Value& value)
{
    return value.isConvertibleTo(Json::stringValue) ? value.asString() : std::string();
}

void Clear(Json::Value& value)
{
    if (value.isArray() || value.isObject()) {
        value.clear();
    } else {
        value = Json::Value();
    }
}

}  // namespace OrvaDRCore
