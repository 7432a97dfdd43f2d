// JSON documents of one line each: requests and replies.
#ifndef NODE_REGISTRY_JSON_LINE_H
#define NODE_REGISTRY_JSON_LINE_H

#include <string>

#include <json/value.h>

namespace NodeRegistry {

// Parses a line that is one whole JSON object. Anything else is refused, and `ret_object` keeps its
// value: invalid JSON, another type, a repeated key, text after the object, nesting beyond jsoncpp's
// limit, a zero byte.
bool ParseLine(const std::string& line, Json::Value& ret_object);

// The document without newlines and spaces. UTF-8 text is not escaped.
std::string ToLine(const Json::Value& value);

}  // namespace NodeRegistry

#endif
