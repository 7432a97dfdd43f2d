#include <orvadrcore/sqlite_value.h>

#include <cstring>
#include <limits>
#include <utility>

#include "base/json_helpers.h"
#include "base/log.h"
#include "sqlite/sqlite_internals.h"

namespace OrvaDRCore {

namespace {

// Reads an integer that fits T.
template <class T>
bool ReadInteger(const SqliteValue& value, T& out)
{
    if (SqliteInternals::KindOf(value) != SqliteInternals::Kind::Integer) return false;
    const std::int64_t number = SqliteInternals::IntegerOf(value);
    using Limits = std::numeric_limits<T>;
    if (number < Limits::min() || number > Limits::max()) return false;
    out = static_cast<T>(number);
    return true;
}

}  // namespace

SqliteValue::SqliteValue(int number) : SqliteValue(Kind::Integer, std::int64_t{number}) {}

SqliteValue::SqliteValue(unsigned int number) : SqliteValue(Kind::Integer, std::int64_t{number}) {}

SqliteValue::SqliteValue(bool truth) : SqliteValue(Kind::Boolean, std::int64_t{truth}) {}

SqliteValue::SqliteValue(const std::string& text)
    : SqliteValue(Kind::PlainText, text.data(), text.size())
{
}

SqliteValue::SqliteValue(const char* text)
    : SqliteValue(Kind::PlainText, text, text != nullptr ? std::strlen(text) : 0)
{
}

SqliteValue::SqliteValue(Kind kind, std::int64_t number) noexcept : valid_(true), kind_(kind)
{
    number_.integer = number;
}

SqliteValue::SqliteValue(Kind kind, double number) noexcept : valid_(true), kind_(kind)
{
    number_.real = number;
}

SqliteValue::SqliteValue(Kind kind, const char* bytes, std::size_t length)
    : valid_(bytes != nullptr && FitsJsonText(length)), kind_(valid_ ? kind : Kind::Nothing)
{
    if (valid_) {
        bytes_.assign(bytes, length);
    } else if (bytes != nullptr) {
        DR_LOG(Err, "text of [%zu] bytes is too long for a value", length);
    }
}

SqliteValue SqliteValue::Text(const std::string& text)
{
    return {Kind::Text, text.data(), text.size()};
}

SqliteValue SqliteValue::Text(const char* text)
{
    return {Kind::Text, text, text != nullptr ? std::strlen(text) : 0};
}

SqliteValue SqliteValue::Integer(std::int64_t number)
{
    return {Kind::Integer, number};
}

SqliteValue SqliteValue::Real(double number)
{
    return {Kind::Real, number};
}

// Refuses a blob whose literal could not be part of a statement, which has less than 2 GiB.
SqliteValue SqliteValue::Blob(const std::string& bytes)
{
    if (!FitsJsonText(LengthOfBlobLiteral(bytes.size()))) {
        DR_LOG(Err, "blob of [%zu] bytes is too long for a value", bytes.size());
        return {};
    }
    return {Kind::Blob, bytes.data(), bytes.size()};
}

SqliteValue SqliteValue::Null()
{
    return {Kind::Null, std::int64_t{0}};
}

SqliteValue::SqliteValue(SqliteValue&& other) noexcept
    : valid_(other.valid_),
      kind_(std::exchange(other.kind_, Kind::Nothing)),
      number_(other.number_),
      bytes_(std::move(other.bytes_))
{
}

// By contract `valid_` stays as it was: only construction makes a value valid.
SqliteValue& SqliteValue::operator=(const SqliteValue& other)
{
    SqliteValue copy(other);
    SqliteInternals::Move(*this, copy);
    return *this;
}

bool SqliteValue::IsValid() const
{
    // An assignment may have replaced the payload since the value was built.
    return valid_ && kind_ != Kind::Nothing;
}

bool SqliteValue::IsNull() const
{
    return kind_ == Kind::Null;
}

template <>
bool SqliteValue::GetValue(std::string& out) const
{
    if (kind_ != Kind::PlainText && kind_ != Kind::Text && kind_ != Kind::Blob) {
        DR_LOG_AS("GetValue<std::basic_string<char> >", Warn, "[%s] is not string",
                  Shown(*this).c_str());
        return false;
    }
    out = SqliteInternals::BytesOf(*this);
    return true;
}

template <>
bool SqliteValue::GetValue(unsigned int& out) const
{
    if (ReadInteger(*this, out)) return true;
    DR_LOG_AS("GetValue<unsigned int>", Warn, "[%s] is not int", Shown(*this).c_str());
    return false;
}

template <>
bool SqliteValue::GetValue(int& out) const
{
    if (ReadInteger(*this, out)) return true;
    DR_LOG_AS("GetValue<int>", Warn, "[%s] is not int", Shown(*this).c_str());
    return false;
}

template <>
bool SqliteValue::GetValue(std::int64_t& out) const
{
    if (ReadInteger(*this, out)) return true;
    DR_LOG_AS("GetValue<long int>", Warn, "[%s] is not int", Shown(*this).c_str());
    return false;
}

template <>
bool SqliteValue::GetValue(double& out) const
{
    if (kind_ != Kind::Integer && kind_ != Kind::Real) {
        DR_LOG_AS("GetValue<double>", Warn, "[%s] is not double", Shown(*this).c_str());
        return false;
    }
    out = kind_ == Kind::Real ? SqliteInternals::RealOf(*this)
                              : static_cast<double>(SqliteInternals::IntegerOf(*this));
    return true;
}

template <>
bool SqliteValue::GetValue(bool& out) const
{
    if (kind_ == Kind::Boolean) {
        out = SqliteInternals::IntegerOf(*this) != 0;
        return true;
    }
    if (ReadInteger(*this, out)) return true;  // 0 or 1
    DR_LOG_AS("GetValue<bool>", Warn, "[%s] is not bool", Shown(*this).c_str());
    return false;
}

std::string SqliteValue::ToFormatedValue() const
{
    std::string text;
    AppendLiteral(text, *this);
    return text;
}

std::string SqliteValue::EscapeText(const std::string& text)
{
    std::string escaped;
    escaped.reserve(text.size());
    AppendEscaped(escaped, text);
    return escaped;
}

SqliteRecord::~SqliteRecord() = default;

bool SqliteRecord::LoadRecord(const SqliteValueList& /*record*/)
{
    return false;
}

SqliteValueList SqliteRecord::ToSqliteRecord() const
{
    return BuildRecord(GetRecordFields());
}

}  // namespace OrvaDRCore
