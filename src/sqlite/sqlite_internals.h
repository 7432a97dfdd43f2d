// The inside of values and records: how they are written into statements and made from rows.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_INTERNALS_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_INTERNALS_H

#include <cstring>
#include <string>
#include <string_view>

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

inline bool MakesValue(const SqliteValue& value)
{
    return value.IsValid();
}

template <class Number>
bool MakesValue(Number /*number*/)
{
    return true;
}

// Access for the library's own sources.
struct SqliteInternals {
    using Kind = SqliteValue::Kind;

    // Null, a number, a boolean, or a text, which holds the bytes of a blob, too.
    static const Json::Value& Payload(const SqliteValue& value) { return value.value_; }
    static Kind KindOf(const SqliteValue& value) { return value.kind_; }
    static bool IsValid(const SqliteValue& value)  // as the public one, but inline
    {
        return value.valid_ && value.kind_ != Kind::Nothing;
    }

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

// The bytes of a payload that is a text.
inline std::string_view BytesOf(const Json::Value& payload)
{
    const char* begin = nullptr;
    const char* end = nullptr;
    payload.getString(&begin, &end);
    return {begin, static_cast<std::size_t>(end - begin)};
}

// How many bytes the literal of a blob has.
constexpr std::size_t LengthOfBlobLiteral(std::size_t length)
{
    return 2 * length + 3;
}

// Appends a text with every quote doubled.
void AppendEscaped(std::string& text, std::string_view unescaped);

// Whether SQLite stores NULL for a value: for Null() and for a number that is not a number.
bool IsStoredAsNull(const SqliteValue& value);

// Appends what SqliteValue::ToFormatedValue() returns.
void AppendLiteral(std::string& text, const SqliteValue& value);

// How a value that is refused is shown in the log: as JSON, a blob by its literal.
std::string Shown(const SqliteValue& value);

// The fields as one text: name, `between` and literal of each, with `separator` between fields.
std::string JoinPairs(const SqliteValueList& record, const char* between, const char* separator);

}  // namespace OrvaDRCore

#endif
