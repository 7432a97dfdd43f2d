// jsoncpp without its exceptions. It throws when a value is used as another type than its own; here a
// value of the wrong type counts as absent. No other file catches these exceptions.
#ifndef ORVADRCORE_SRC_BASE_JSON_HELPERS_H
#define ORVADRCORE_SRC_BASE_JSON_HELPERS_H

#include <cstddef>
#include <string>
#include <string_view>

#include <json/value.h>

namespace OrvaDRCore {

// The deepest document that can be read. A scalar and an empty array have one level.
constexpr int MaxLevels = 1000;

// Whether a JSON value can hold a text, or an object a member's name, of this many bytes. jsoncpp
// throws for texts of 2 GiB or more, and truncates texts of 4 GiB and names of 1 GiB. On 32-bit
// machines a std::string may hold less: 1 GiB with g++ 12.
bool FitsJsonText(std::size_t length);
bool FitsJsonName(std::size_t length);

// The text as a JSON value; null if it is too long.
Json::Value ToJsonText(std::string_view text);

// Parses `text`, which must be one whole JSON document of any type. False, with `value` as it was, if
// it does not parse, continues after the document, nests deeper than MaxLevels, or is so long that a
// text in it might not fit a value.
bool fromString(Json::Value& value, const std::string& text);

// The document on one line, without blanks or a final newline. Bytes above 0x7f are not escaped, so
// that every byte string survives toString() and fromString(). To the byte what jsoncpp's
// StreamWriter writes without indentation and comments and with "emitUTF8".
std::string toString(const Json::Value& value);

// Whether a value has this many levels or fewer. Looks no deeper than that.
bool NestsAtMost(const Json::Value& value, int levels);

// Whether fromString() can read what toString() writes, with the value `levelsAbove` levels down in a
// document: it may not nest too deep, nor hold an infinity, which is written as 1e+9999.
// (Not-a-number is written as null, which can be read.)
bool IsReadable(const Json::Value& value, int levelsAbove = 0);

// Parses a whole regular file. False, with `value` as it was, if it cannot be read to its end, does
// not parse or is no regular file; a pipe is not waited for.
bool fromFile(Json::Value& value, const std::string& path);

// Replaces a file by the document: see ReplaceFile().
bool toFile(const Json::Value& value, const std::string& path);

// The member `key` of an object; null if it is absent, if `object` is no object, or if `key` is null.
// The pointer is good until `object` changes.
const Json::Value* FindMember(const Json::Value& object, const char* key);

// jsoncpp's conversions; false and the empty text for values that it cannot convert.
bool AsBool(const Json::Value& value);
std::string AsString(const Json::Value& value);

// Empties an array or an object, which keeps its type; any other value becomes null.
void Clear(Json::Value& value);

}  // namespace OrvaDRCore

#endif
