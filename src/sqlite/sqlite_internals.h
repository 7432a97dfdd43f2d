// The inside of values and records: how they are written into statements and made from rows.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_INTERNALS_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_INTERNALS_H

#include <cstring>
#include <string>

#include <json/value.h>

#include <orvadrcore/sqlite_value.h>

#include "base/json_helpers.h"

namespace OrvaDRCore {

// Whether a SqliteValue built from this is valid.
inline bool MakesValue(const std::string& text)
{
    return FitsJsonText(text.size());
}

inline bool MakesValue(const char* text)
{
    return text != nullptr && FitsJsonText(std::strlen(text));
}

template <class Number>
bool MakesValue(Number /*number*/)
{
    return true;
}

// Access for the library's own sources.
struct SqliteInternals {
    // Null, a number, a boolean or a text.
    static const Json::Value& Payload(const SqliteValue& value) { return value.value_; }

    // Adds a field like AddValue(), but builds its value in place, which takes half the time.
    template <class T>
    static void Add(SqliteValueList& record, const std::string& field, const T& value)
    {
        if (field.empty() || !MakesValue(value) ||
            !record.values_.try_emplace(field, value).second) {
            record.AddValue(field, SqliteValue(value));
        }
    }
};

// Appends what SqliteValue::ToFormatedValue() returns.
void AppendLiteral(std::string& text, const SqliteValue& value);

// The fields as one text: name, `between` and literal of each, with `separator` between fields.
std::string JoinPairs(const SqliteValueList& record, const char* between, const char* separator);

}  // namespace OrvaDRCore

#endif
