// Values and records from within: as the texts that stand in statements, and made from rows.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_INTERNALS_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_INTERNALS_H

#include <cstring>
#include <string>

#include <json/value.h>

#include <orvadrcore/sqlite_value.h>

#include "base/json_helpers.h"

namespace OrvaDRCore {

// Whether a SqliteValue that is made of this is valid.
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

// What the library's own sources see of values and records.
struct SqliteInternals {
    // What a value holds: null, a number, a boolean or a text.
    static const Json::Value& Payload(const SqliteValue& value) { return value.value_; }

    // Adds a field as AddValue() does, but makes its value in place, which takes half the time.
    template <class T>
    static void Add(SqliteValueList& record, const std::string& field, const T& value)
    {
        if (field.empty() || !MakesValue(value) ||
            !record.values_.try_emplace(field, value).second) {
            record.AddValue(field, SqliteValue(value));
        }
    }
};

// Appends the literal that SqliteValue::ToFormatedValue() gives.
void AppendLiteral(std::string& text, const SqliteValue& value);

// A record's fields as one text: name, `between`, literal; pairs separated by `separator`.
std::string JoinPairs(const SqliteValueList& record, const char* between, const char* separator);

}  // namespace OrvaDRCore

#endif
