#include "text.h"

#include <wchar.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <system_error>
#include <utility>

#include "base/json_helpers.h"

namespace Orvadr {

namespace {

constexpr const char* Replacement = "\xef\xbf\xbd";  // U+FFFD

template <class... Args>
std::string Format(const char* format, Args... args)
{
    std::array<char, 64> text{};
    (void)std::snprintf(text.data(), text.size(), format, args...);
    return text.data();
}

struct Character {
    char32_t code;
    std::size_t bytes;  // 0 if the text does not begin with UTF-8
};

// The smallest character that needs so many bytes. Longer forms of it are not UTF-8.
constexpr std::array<char32_t, 5> Smallest{0, 0, 0x80, 0x800, 0x10000};

std::size_t LengthFor(unsigned char first)
{
    if (first < 0x80) return 1;
    if (first >= 0xf0) return first < 0xf8 ? 4 : 0;
    if (first >= 0xe0) return 3;
    return first >= 0xc0 ? 2 : 0;
}

Character Decode(std::string_view text)
{
    const auto first = static_cast<unsigned char>(text[0]);
    const std::size_t bytes = LengthFor(first);
    if (bytes == 1) return {first, 1};
    if (bytes == 0 || bytes > text.size()) return {0, 0};
    char32_t code = first & (0x7fU >> bytes);
    for (std::size_t at = 1; at < bytes; ++at) {
        const auto byte = static_cast<unsigned char>(text[at]);
        if ((byte & 0xc0U) != 0x80) return {0, 0};
        code = (code << 6U) | (byte & 0x3fU);
    }
    const bool isSurrogate = code >= 0xd800 && code <= 0xdfff;
    if (code < Smallest[bytes] || code > 0x10ffff || isSurrogate) return {0, 0};
    return {code, bytes};
}

// Characters that change the direction of a line, and others that nobody sees.
bool IsInvisible(char32_t code)
{
    return (code >= 0x200b && code <= 0x200f) || (code >= 0x2028 && code <= 0x202e) ||
           (code >= 0x2060 && code <= 0x206f) || code == 0xfeff || code == 0xad;
}

std::string Escape(char32_t code)
{
    switch (code) {
        case '\\': return "\\\\";
        case '\n': return "\\n";
        case '\r': return "\\r";
        case '\t': return "\\t";
        default: break;
    }
    const auto number = static_cast<unsigned int>(code);
    return code < 0x80 ? Format("\\x%02x", number) : Format("\\u{%x}", number);
}

bool MustEscape(char32_t code)
{
    return code == 0 || code == '\\' || IsInvisible(code) ||
           ::wcwidth(static_cast<wchar_t>(code)) < 0;
}

std::string ToUtf8Text(std::string_view text)
{
    std::string result;
    while (!text.empty()) {
        const std::size_t bytes = Decode(text).bytes;
        if (bytes == 0) {
            result += Replacement;
        } else {
            result += text.substr(0, bytes);
        }
        text.remove_prefix(std::max(bytes, std::size_t{1}));
    }
    return result;
}

}  // namespace

std::string Printable(std::string_view text)
{
    std::string result;
    while (!text.empty()) {
        const Character character = Decode(text);
        const std::size_t bytes = std::max(character.bytes, std::size_t{1});
        if (character.bytes == 0) {
            result +=
                Format("\\x%02x", static_cast<unsigned int>(static_cast<unsigned char>(text[0])));
        } else if (MustEscape(character.code)) {
            result += Escape(character.code);
        } else {
            result += text.substr(0, bytes);
        }
        text.remove_prefix(bytes);
    }
    return result;
}

Glyph FirstGlyph(std::string_view text)
{
    const Character character = Decode(text);
    const int columns = ::wcwidth(static_cast<wchar_t>(character.code));
    return {std::max(character.bytes, std::size_t{1}),
            static_cast<std::size_t>(std::max(columns, 0))};
}

std::size_t ColumnsOf(std::string_view text)
{
    std::size_t columns = 0;
    while (!text.empty()) {
        const Glyph glyph = FirstGlyph(text);
        columns += glyph.columns;
        text.remove_prefix(glyph.bytes);
    }
    return columns;
}

Json::Value ToUtf8(const Json::Value& value)
{
    if (value.isString()) return OrvaDRCore::ToJsonText(ToUtf8Text(value.asString()));
    if (!value.isArray() && !value.isObject()) return value;
    Json::Value result(value.type());
    for (auto at = value.begin(); at != value.end(); ++at) {
        Json::Value member = ToUtf8(*at);
        if (value.isArray()) {
            result.append(std::move(member));
        } else {
            result[ToUtf8Text(at.name())] = std::move(member);
        }
    }
    return result;
}

std::string ErrorText(int error)
{
    return std::generic_category().message(error);
}

std::string DurationText(double seconds)
{
    constexpr double Minute = 60;
    constexpr double Hour = 60 * Minute;
    constexpr double Day = 24 * Hour;
    if (seconds < 0) return "-" + DurationText(-seconds);
    const double whole = std::floor(seconds);
    const auto parts = [whole](double unit, double part, const char* format) {
        return Format(format, std::floor(whole / unit), std::floor(std::fmod(whole, unit) / part));
    };
    if (whole < Minute) return Format("%.0fs", whole);
    if (whole < Hour) return parts(Minute, 1, "%.0fm %02.0fs");
    if (whole < Day) return parts(Hour, Minute, "%.0fh %02.0fm");
    return parts(Day, Hour, "%.0fd %02.0fh");
}

std::string SizeText(double bytes)
{
    constexpr std::array<const char*, 5> Units{"kB", "MB", "GB", "TB", "PB"};
    constexpr double Step = 1000;
    constexpr double RoundsUp = 999.95;  // would be shown as 1000.0
    if (bytes < Step) return Format("%.0f B", bytes);
    std::size_t unit = 0;
    for (bytes /= Step; bytes >= RoundsUp && unit + 1 < Units.size(); ++unit) bytes /= Step;
    // "%.1f" would have the decimal point of the locale.
    const double tenths = std::round(bytes * 10);
    return Format("%.0f.%.0f %s", std::floor(tenths / 10), std::fmod(tenths, 10), Units[unit]);
}

std::string SizeCell(const Json::Value& object)
{
    const Json::Value& size = object["size_bytes"];
    return size.isNull() ? "" : SizeText(size.asDouble());
}

std::string TimeText(std::time_t time)
{
    std::tm local{};
    std::array<char, 64> text{};
    if (::localtime_r(&time, &local) == nullptr) return std::to_string(time);
    const std::size_t size = std::strftime(text.data(), text.size(), "%F %T", &local);
    return {text.data(), size};
}

}  // namespace Orvadr
