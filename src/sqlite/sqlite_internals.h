// The inside of values and records: how they are written into statements and made from rows.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_INTERNALS_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_INTERNALS_H

#include <cstdint>
#include <string>
#include <string_view>
#include <utility>

#include <orvadrcore/sqlite_value.h>

namespace OrvaDRCore {

// Access for the library's own sources.
struct SqliteInternals {
    using Kind = SqliteValue::Kind;

    static Kind KindOf(const SqliteValue& value) { return value.kind_; }
    static bool IsValid(const SqliteValue& value)  // as the public one, but inline
    {
        return value.valid_ && value.kind_ != Kind::Nothing;
    }

    // What a value of the kind holds: an integer or a boolean, a real, a text or a blob.
    static std::int64_t IntegerOf(const SqliteValue& value) { return value.number_.integer; }
    static double RealOf(const SqliteValue& value) { return value.number_.real; }
    static const std::string& BytesOf(const SqliteValue& value) { return value.bytes_; }

    // Moves what a value holds. Like an assignment, it does not take over whether it is valid.
    static void Move(SqliteValue& to, SqliteValue& from) noexcept
    {
        to.number_ = from.number_;
        to.bytes_.swap(from.bytes_);
        to.kind_ = std::exchange(from.kind_, Kind::Nothing);
    }

    // Makes room for the fields of a record.
    static void Reserve(SqliteValueList& record, std::size_t fields)
    {
        record.values_.reserve(fields);
    }

    // Adds a field like AddValue(), but faster. Its name must come after those that the record has,
    // and a value made from `value` must be valid.
    template <class T>
    static void Append(SqliteValueList& record, const std::string& field, const T& value)
    {
        record.values_.emplace_back(field, value);
    }
};

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

// Appends name, `between` and literal of each field, with `separator` between fields.
void AppendPairs(std::string& text, const SqliteValueList& record, const char* between,
                 const char* separator);

// Returns `text` with room for a usual statement, so that it is rarely reallocated while it grows.
std::string BeginStatement(const char* text);

// Appends "INSERT INTO table " or "INSERT OR REPLACE INTO table ".
void AppendInsertInto(std::string& text, const std::string& table, bool replacable);

// Appends "(a,b) VALUES (", which follows that.
void AppendColumns(std::string& text, const SqliteValueList& record);

// Appends the keyword and its clause, unless the clause is empty.
void AppendClause(std::string& text, const char* keyword, const std::string& clause);

}  // namespace OrvaDRCore

#endif
