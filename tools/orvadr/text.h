// Texts for people and for JSON. Names on disk and of processes may be any bytes; a terminal must not
// obey them, and JSON must be UTF-8.
#ifndef ORVADR_TEXT_H
#define ORVADR_TEXT_H

#include <cstddef>
#include <ctime>
#include <string>
#include <string_view>

#include <json/value.h>

namespace Orvadr {

// The text on one line: control characters, backslashes and bytes that are not UTF-8 are escaped, as
// \n, \\ and \x1b, and invisible characters as \u{202e}.
std::string Printable(std::string_view text);

// The first character of a printable text: its bytes and the columns that it takes on a terminal.
struct Glyph {
    std::size_t bytes;
    std::size_t columns;
};
Glyph FirstGlyph(std::string_view text);

// The columns that a printable text takes on a terminal.
std::size_t ColumnsOf(std::string_view text);

// The value with all its texts and names in UTF-8: each wrong byte becomes U+FFFD.
Json::Value ToUtf8(const Json::Value& value);

// What a value of errno means.
std::string ErrorText(int error);

// "45s", "12m 05s", "2h 14m", "3d 04h", with a minus in front if negative.
std::string DurationText(double seconds);

// "512 B", "1.2 kB", "3.4 MB".
std::string SizeText(double bytes);

// The `size_bytes` of an object, or nothing.
std::string SizeCell(const Json::Value& object);

// Local time, as "2026-11-22 03:02:11".
std::string TimeText(std::time_t time);

}  // namespace Orvadr

#endif
