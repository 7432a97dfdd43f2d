#include <orvadrcore/sqlite_row.h>

#include <limits>

#include "base/log.h"
#include "sqlite/sqlite_internals.h"
#include "sqlite/sqlite_row_reader.h"

namespace OrvaDRCore {

namespace {

enum class Reading { Done, Refused, OutOfMemory };

// What the lines about a refused value say.
template <class T>
struct Kind;
template <>
struct Kind<std::string> {
    static constexpr const char* Function = "GetValue<std::basic_string<char> >";
    static constexpr const char* Word = "string";
};
template <>
struct Kind<int> {
    static constexpr const char* Function = "GetValue<int>";
    static constexpr const char* Word = "int";
};
template <>
struct Kind<unsigned int> {
    static constexpr const char* Function = "GetValue<unsigned int>";
    static constexpr const char* Word = "int";
};
template <>
struct Kind<std::int64_t> {
    static constexpr const char* Function = "GetValue<long int>";
    static constexpr const char* Word = "int";
};
template <>
struct Kind<double> {
    static constexpr const char* Function = "GetValue<double>";
    static constexpr const char* Word = "double";
};
template <>
struct Kind<bool> {
    static constexpr const char* Function = "GetValue<bool>";
    static constexpr const char* Word = "bool";
};

// For the integers and bool.
template <class T>
Reading Read(sqlite3_value* value, T& out)
{
    if (sqlite3_value_type(value) != SQLITE_INTEGER) return Reading::Refused;
    const sqlite3_int64 number = sqlite3_value_int64(value);
    using Limits = std::numeric_limits<T>;
    if (number < Limits::min() || number > Limits::max()) return Reading::Refused;
    out = static_cast<T>(number);
    return Reading::Done;
}

template <>
Reading Read(sqlite3_value* value, double& out)
{
    const int type = sqlite3_value_type(value);
    if (type != SQLITE_FLOAT && type != SQLITE_INTEGER) return Reading::Refused;
    out = sqlite3_value_double(value);
    return Reading::Done;
}

template <>
Reading Read(sqlite3_value* value, std::string& out)
{
    const int type = sqlite3_value_type(value);
    if (type != SQLITE_TEXT && type != SQLITE_BLOB) return Reading::Refused;
    // In this order: reading a text may convert it, which changes its length.
    const void* const bytes =
        type == SQLITE_TEXT ? sqlite3_value_text(value) : sqlite3_value_blob(value);
    const int length = sqlite3_value_bytes(value);
    if (bytes == nullptr && (type == SQLITE_TEXT || length > 0)) return Reading::OutOfMemory;
    if (bytes == nullptr) {
        out.clear();  // an empty blob
    } else {
        out.assign(static_cast<const char*>(bytes), static_cast<std::size_t>(length));
    }
    return Reading::Done;
}

// Null also for a text or blob that SQLite has no memory for.
SqliteValue ToValue(sqlite3_value* value)
{
    const int type = sqlite3_value_type(value);
    if (type == SQLITE_INTEGER) return SqliteValue::Integer(sqlite3_value_int64(value));
    if (type == SQLITE_FLOAT) return SqliteValue::Real(sqlite3_value_double(value));
    std::string bytes;
    if (Read(value, bytes) != Reading::Done) return SqliteValue::Null();
    return type == SQLITE_TEXT ? SqliteValue::Text(bytes) : SqliteValue::Blob(bytes);
}

template <class T>
bool ReadColumn(RowReader& reader, const RowReader::Column& column, T& out)
{
    sqlite3_value* const value = reader.GetValue(column);
    const Reading reading = Read(value, out);
    if (reading == Reading::Done) return true;
    if (reading == Reading::OutOfMemory) {
        reader.NoteOutOfMemory();
        DR_LOG_AS(Kind<T>::Function, Warn, "no memory to read field [%s]", column.name.c_str());
    } else {
        DR_LOG_AS(Kind<T>::Function, Warn, "[%s] is not %s", Shown(ToValue(value)).c_str(),
                  Kind<T>::Word);
    }
    return false;
}

}  // namespace

std::size_t SqliteRow::GetColumnCount() const
{
    return reader_.GetColumns().size();
}

std::string SqliteRow::GetColumnName(std::size_t column) const
{
    const auto& columns = reader_.GetColumns();
    return column < columns.size() ? columns[column].name : std::string();
}

bool SqliteRow::IsNull(const std::string& column) const
{
    const RowReader::Column* const found = reader_.Find(column);
    return found == nullptr || sqlite3_value_type(reader_.GetValue(*found)) == SQLITE_NULL;
}

template <class T>
bool SqliteRow::ReadNamed(const std::string& column, T& out) const
{
    constexpr const char* Function = "GetValue";
    if (column.empty()) {
        DR_LOG_AS(Function, Err, "Invalid field [%s]", column.c_str());
        return false;
    }
    const RowReader::Column* const found = reader_.Find(column);
    if (found == nullptr) {
        DR_LOG_AS(Function, Debug, "field [%s] is not existed", column.c_str());
        return false;
    }
    return ReadColumn(reader_, *found, out);
}

template <class T>
bool SqliteRow::ReadNumbered(std::size_t column, T& out) const
{
    if (column >= reader_.GetColumns().size()) {
        DR_LOG_AS("GetValue", Debug, "field [%zu] is not existed", column);
        return false;
    }
    return ReadColumn(reader_, reader_.GetColumns()[column], out);
}

template <>
bool SqliteRow::GetValue(const std::string& column, std::string& out) const
{
    return ReadNamed(column, out);
}

template <>
bool SqliteRow::GetValue(const std::string& column, int& out) const
{
    return ReadNamed(column, out);
}

template <>
bool SqliteRow::GetValue(const std::string& column, unsigned int& out) const
{
    return ReadNamed(column, out);
}

template <>
bool SqliteRow::GetValue(const std::string& column, std::int64_t& out) const
{
    return ReadNamed(column, out);
}

template <>
bool SqliteRow::GetValue(const std::string& column, double& out) const
{
    return ReadNamed(column, out);
}

template <>
bool SqliteRow::GetValue(const std::string& column, bool& out) const
{
    return ReadNamed(column, out);
}

template <>
bool SqliteRow::GetValue(std::size_t column, std::string& out) const
{
    return ReadNumbered(column, out);
}

template <>
bool SqliteRow::GetValue(std::size_t column, int& out) const
{
    return ReadNumbered(column, out);
}

template <>
bool SqliteRow::GetValue(std::size_t column, unsigned int& out) const
{
    return ReadNumbered(column, out);
}

template <>
bool SqliteRow::GetValue(std::size_t column, std::int64_t& out) const
{
    return ReadNumbered(column, out);
}

template <>
bool SqliteRow::GetValue(std::size_t column, double& out) const
{
    return ReadNumbered(column, out);
}

template <>
bool SqliteRow::GetValue(std::size_t column, bool& out) const
{
    return ReadNumbered(column, out);
}

}  // namespace OrvaDRCore
