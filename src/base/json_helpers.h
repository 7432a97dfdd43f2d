// What Json::Value lacks or throws at. jsoncpp throws when a value is used as a type that it is
// not; here, and nowhere else, those exceptions end: a value of the wrong kind counts as absent.
#ifndef ORVADRCORE_SRC_BASE_JSON_HELPERS_H
#define ORVADRCORE_SRC_BASE_JSON_HELPERS_H

#include <cstddef>
#include <string>
#include <string_view>

#include <json/value.h>

namespace OrvaDRCore {

// How deep a document may nest to be read. A scalar and an empty array have one level.
constexpr int MaxLevels = 1000;

// Whether a JSON value can hold a text, or an object the name of a member, of so many bytes. jsoncpp
// throws at texts from 2 GiB on, and from 4 GiB on it cuts them, as it cuts names from 1 GiB on.
bool FitsJsonText(std::size_t length);
bool FitsJsonName(std::size_t length);

// The text as a JSON value; null for one that is too long.
Json::Value ToJsonText(std::string_view text);

// Parses `text`, which must be one whole JSON document of any type, into `value`. A text that does
// not parse, that goes on after its document, that nests deeper than MaxLevels or that is so long
// that it may hold a text which no value can gives false and leaves `value` as it was.
bool fromString(Json::Value& value, const std::string& text);

// The document on one line, without blanks or a final newline. Bytes above 0x7f stand as they are,
// so that every byte string survives the way through toString and fromString.
std::string toString(const Json::Value& value);

// Whether a value has so many levels or fewer. It is followed no deeper than that.
bool NestsAtMost(const Json::Value& value, int levels);

// Whether fromString() reads what toString() writes of a value that stands below `levelsAbove`
// others: it may not nest too deep, nor hold an infinity, which is written as 1e+9999. Not a number
// is written as null, and so can be read.
bool IsReadable(const Json::Value& value, int levelsAbove = 0);

// Parses a whole regular file. False when it cannot be read to its end, does not parse or is no
// regular file: a pipe, a device or a socket is not waited for. `value` is as it was then.
bool fromFile(Json::Value& value, const std::string& path);

// Replaces a file by the document, whole: see ReplaceFile. False with errno set; the old file is as
// it was then.
bool toFile(const Json::Value& value, const std::string& path);

// The member `key` of an object; null when it is absent, when `object` is no object and when `key`
// is null. The pointer is good until `object` changes.
const Json::Value* FindMember(const Json::Value& object, const char* key);

// The library's own conversions, with false and the empty text where it has none.
bool AsBool(const Json::Value& value);
std::string AsString(const Json::Value& value);

// Empties an array or an object, which keeps its type; any other value becomes null.
void Clear(Json::Value& value);

}  // namespace OrvaDRCore

#endif
