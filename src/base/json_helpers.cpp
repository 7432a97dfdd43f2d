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

// The configured builder. Making one takes longer than reading a small document, so it is made once.
// There is no lock, because another thread might hold it during a fork: threads that come first at
// the same time make one each.
template <class Builder>
const Builder& SharedBuilder()
{
    static std::atomic<const Builder*> shared{nullptr};
    const Builder* builder = shared.load(std::memory_order_acquire);
    if (builder == nullptr) {
        auto made = std::make_unique<Builder>();
        Configure(*made);
        if (shared.compare_exchange_strong(builder, made.get(), std::memory_order_acq_rel)) {
            builder = made.release();
        }
    }
    return *builder;
}

// Whether the program's locale writes real numbers as JSON does. jsoncpp's reader uses it.
bool LocaleHasPoint()
{
    return std::use_facet<std::numpunct<char>>(std::locale()).decimal_point() == '.';
}

// Whether this byte can come before the point of a number: jsoncpp also reads "-.5".
bool MayStandBeforePoint(char byte)
{
    return (byte >= '0' && byte <= '9') || byte == '-' || byte == '+';
}

// Appends the digits after the point of a number, which begin at `begin`, and an exponent that makes
// up for the missing point. Returns where the number ends in `text`.
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
        // None, or a huge one. Without its point the number is as invalid, large or small as before.
        if (error != std::errc()) return end;
        at = stop;
    }
    result += "e" + std::to_string(exponent - static_cast<long>(end - begin));
    return static_cast<std::size_t>(at - text.data());
}

// The document with its real numbers written without a point, which all locales read alike: 314e8
// for 3.14e10. A text that is no valid document does not become one.
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

bool Parse(Json::Value& value, const std::string& text)
{
    const std::unique_ptr<Json::CharReader> reader(
        SharedBuilder<Json::CharReaderBuilder>().newCharReader());

    // Not into `value`: of a document that breaks off, the reader leaves the first members.
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

// What jsoncpp's own writer makes of a value.
std::string WriteByStream(const Json::Value& value)
{
    const std::unique_ptr<Json::StreamWriter> writer(
        SharedBuilder<Json::StreamWriterBuilder>().newStreamWriter());
    std::ostringstream text;
    text.exceptions(std::ios::badbit);  // or bad_alloc truncates the text
    writer->write(value, &text);
    return text.str();
}

bool NeedsEscape(char byte)
{
    return static_cast<unsigned char>(byte) < ' ' || byte == '"' || byte == '\\';
}

// The escape of two characters, for the bytes that have one; otherwise null.
const char* ShortEscape(char byte)
{
    switch (byte) {
        case '"': return "\\\"";
        case '\\': return "\\\\";
        case '\b': return "\\b";
        case '\f': return "\\f";
        case '\n': return "\\n";
        case '\r': return "\\r";
        case '\t': return "\\t";
        default: return nullptr;
    }
}

// Appends a text in quotes.
void AppendText(std::string& json, const char* begin, const char* end)
{
    const std::size_t start = json.size();
    json += '"';
    for (const char* at = begin;; ++at) {
        const char* const stop = std::find_if(at, end, NeedsEscape);
        json.append(at, static_cast<std::size_t>(stop - at));
        if (stop == end) break;
        const char* const escape = ShortEscape(*stop);
        if (escape == nullptr) {
            // How other control characters are escaped depends on jsoncpp's version.
            json.replace(start, std::string::npos, WriteByStream(Json::Value(begin, end)));
            return;
        }
        json += escape;
        at = stop;
    }
    json += '"';
}

// Appends a value that is neither an array nor an object. A function of its own, because its texts
// would take stack on every level of a deep document.
[[gnu::noinline]] void AppendScalar(std::string& json, const Json::Value& value)
{
    const char* begin = nullptr;
    const char* end = nullptr;
    switch (value.type()) {
        case Json::intValue: json += Json::valueToString(value.asLargestInt()); break;
        case Json::uintValue: json += Json::valueToString(value.asLargestUInt()); break;
        case Json::realValue: json += Json::valueToString(value.asDouble()); break;
        case Json::booleanValue: json += value.asBool() ? "true" : "false"; break;
        case Json::stringValue:
            // Without a text, which a null StaticString gives, jsoncpp writes nothing.
            if (value.getString(&begin, &end)) AppendText(json, begin, end);
            break;
        default: json += "null";
    }
}

void AppendJson(std::string& json, const Json::Value& value);

// Ends an array or an object, each element of which ends with a comma.
void Close(std::string& json, char bracket)
{
    if (json.back() == ',') {
        json.back() = bracket;
    } else {
        json += bracket;
    }
}

void AppendArray(std::string& json, const Json::Value& array)
{
    json += '[';
    Json::ArrayIndex index = 0;
    const auto end = array.end();
    for (auto element = array.begin(); element != end; ++element, ++index) {
        for (; index < element.index(); ++index) json += "null,";  // elements that were never set
        AppendJson(json, *element);
        json += ',';
    }
    Close(json, ']');
}

void AppendObject(std::string& json, const Json::Value& object)
{
    json += '{';
    const auto end = object.end();
    for (auto member = object.begin(); member != end; ++member) {
        const char* nameEnd = nullptr;
        const char* const name = member.memberName(&nameEnd);
        AppendText(json, name, nameEnd);
        json += ':';
        AppendJson(json, *member);
        json += ',';
    }
    Close(json, '}');
}

// Appends what jsoncpp's writer would write, without its streams, copies of names and copies of
// elements.
void AppendJson(std::string& json, const Json::Value& value)
{
    switch (value.type()) {
        case Json::arrayValue: return AppendArray(json, value);
        case Json::objectValue: return AppendObject(json, value);
        default: return AppendScalar(json, value);
    }
}

enum class Reals { Any, Finite };

// Whether a value has this many levels at most, and only real numbers of this kind.
bool StaysWithin(const Json::Value& value, int levels, Reals reals)
{
    if (levels <= 0) return false;
    switch (value.type()) {
        case Json::realValue: return reals == Reals::Any || !std::isinf(value.asDouble());
        case Json::arrayValue:
        case Json::objectValue:
            for (const Json::Value& member : value) {
                if (!StaysWithin(member, levels - 1, reals)) return false;
            }
            return true;
        default: return true;
    }
}

}  // namespace

// jsoncpp stores the length, the text and a zero byte in one block, whose size must fit an int.
bool FitsJsonText(std::size_t length)
{
    constexpr auto Most = static_cast<std::size_t>(Json::Value::maxInt) - sizeof(unsigned int) - 1;
    return length <= std::min(Most, std::string().max_size());
}

// jsoncpp stores the length of a name in 30 bits.
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
    // The reader takes a zero byte for the end of the text and would ignore what follows. No JSON
    // document holds one: in strings it is written \u0000.
    if (text.find('\0') != std::string::npos) return false;
    return LocaleHasPoint() ? Parse(value, text) : Parse(value, WithoutPoints(text));
}

std::string toString(const Json::Value& value)
{
    std::string json;
    AppendJson(json, value);
    return json;
}

bool NestsAtMost(const Json::Value& value, int levels)
{
    return StaysWithin(value, levels, Reals::Any);
}

bool IsReadable(const Json::Value& value, int levelsAbove)
{
    return StaysWithin(value, MaxLevels - levelsAbove, Reals::Finite);
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
