// JSON documents on one line each, as requests come in and replies go out.
#ifndef NODE_REGISTRY_JSON_LINE_H
#define NODE_REGISTRY_JSON_LINE_H

#include <string>

#include <json/value.h>

namespace NodeRegistry {

// Parses a line that is one whole JSON object. False, `ret_object` untouched, for anything else: no
// JSON, another type, a key given twice, text behind the object, nesting deeper than the reader's
// limit, a zero byte.
bool ParseLine(const std::string& line, Json::Value& ret_object);

// A document without line breaks and without blanks between its parts; text in UTF-8 stays as it
// stands.
std::string ToLine(const Json::Value& value);

}  // namespace NodeRegistry

#endif
