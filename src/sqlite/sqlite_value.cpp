#include <orvadrcore/sqlite_value.h>

#include <cstring>
#include <utility>

#include "base/json_helpers.h"
#include "base/log.h"
#include "sqlite/sqlite_internals.h"

namespace OrvaDRCore {

SqliteValue::SqliteValue(int number) : SqliteValue(Kind::Integer, number) {}

SqliteValue::SqliteValue(unsigned int number) : SqliteValue(Kind::Integer, number) {}

SqliteValue::SqliteValue(bool truth) : SqliteValue(Kind::Boolean, truth) {}

SqliteValue::SqliteValue(const std::string& text)
    : SqliteValue(Kind::PlainText, text.data(), text.size())
{
}

SqliteValue::SqliteValue(const char* text)
    : SqliteValue(Kind::PlainText, text, text != nullptr ? std::strlen(text) : 0)
{
}

SqliteValue::SqliteValue(Kind kind, Json::Value&& payload)
    : valid_(true), kind_(kind), value_(std::move(payload))
{
}

SqliteValue::SqliteValue(Kind kind, const char* bytes, std::size_t length)
    : valid_(bytes != nullptr && FitsJsonText(length)),
      kind_(valid_ ? kind : Kind::Nothing),
      value_(valid_ ? Json::Value(bytes, bytes + length) : Json::Value())
{
    if (bytes != nullptr && !valid_) {
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
    return {Kind::Integer, Json::Value(static_cast<Json::Int64>(number))};
}

SqliteValue SqliteValue::Real(double number)
{
    return {Kind::Real, Json::Value(number)};
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
    return {Kind::Null, Json::Value()};
}

SqliteValue::SqliteValue(SqliteValue&& other) noexcept
    : valid_(other.valid_),
      kind_(std::exchange(other.kind_, Kind::Nothing)),
      value_(std::move(other.value_))
{
}

// By contract `valid_` stays as it was: only construction makes a value valid.
SqliteValue& SqliteValue::operator=(const SqliteValue& other)
{
    value_ = other.value_;
    kind_ = other.kind_;
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
    if (!value_.isString()) {
        DR_LOG_AS("GetValue<std::basic_string<char> >", Warn, "[%s] is not string",
                  Shown(*this).c_str());
        return false;
    }
    out = value_.asString();
    return true;
}

template <>
bool SqliteValue::GetValue(unsigned int& out) const
{
    if (kind_ != Kind::Integer || !value_.isUInt()) {
        DR_LOG_AS("GetValue<unsigned int>", Warn, "[%s] is not int", Shown(*this).c_str());
        return false;
    }
    out = value_.asUInt();
    return true;
}

template <>
bool SqliteValue::GetValue(int& out) const
{
    if (kind_ != Kind::Integer || !value_.isInt()) {
        DR_LOG_AS("GetValue<int>", Warn, "[%s] is not int", Shown(*this).c_str());
        return false;
    }
    out = value_.asInt();
    return true;
}

template <>
bool SqliteValue::GetValue(std::int64_t& out) const
{
    if (kind_ != Kind::Integer) {
        DR_LOG_AS("GetValue<long int>", Warn, "[%s] is not int", Shown(*this).c_str());
        return false;
    }
    out = value_.asInt64();
    return true;
}

template <>
bool SqliteValue::GetValue(double& out) const
{
    if (kind_ != Kind::Integer && kind_ != Kind::Real) {
        DR_LOG_AS("GetValue<double>", Warn, "[%s] is not double", Shown(*this).c_str());
        return false;
    }
    out = value_.asDouble();
    return true;
}

template <>
bool SqliteValue::GetValue(bool& out) const
{
    const bool isBit =
        kind_ == Kind::Integer && value_.isInt() && (value_.asInt() == 0 || value_.asInt() == 1);
    if (kind_ != Kind::Boolean && !isBit) {
        DR_LOG_AS("GetValue<bool>", Warn, "[%s] is not bool", Shown(*this).c_str());
        return false;
    }
    out = value_.asBool();
    return true;
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

SqliteValueList::SqliteValueList(SqliteValueList&& other) noexcept
    : values_(std::move(other.values_))
{
}

SqliteValueList::~SqliteValueList() = default;

SqliteValueList& SqliteValueList::operator=(const SqliteValueList& other)
{
    // Copies by construction, because assigning each value would lose `valid_`.
    if (this != &other) values_ = std::map<std::string, SqliteValue>(other.values_);
    return *this;
}

SqliteValueList& SqliteValueList::operator=(SqliteValueList&& other) noexcept
{
    values_.swap(other.values_);
    return *this;
}

bool SqliteValueList::AddValue(const std::string& field, const SqliteValue& value)
{
    return AddValue(field, SqliteValue(value));
}

bool SqliteValueList::AddValue(const std::string& field, SqliteValue&& value)
{
    if (field.empty() || !value.IsValid()) {
        DR_LOG(Err, "Bad Field[%s] or value [%s]", field.c_str(), value.ToFormatedValue().c_str());
        return false;
    }
    const auto [entry, added] = values_.try_emplace(field, std::move(value));
    if (!added) entry->second = value;  // try_emplace() has not moved from it
    return true;
}

SqliteValueList& SqliteValueList::operator+=(const SqliteValueList& other)
{
    for (const auto& [field, value] : other.values_) AddValue(field, value);
    return *this;
}

bool SqliteValueList::HasField(const std::string& field) const
{
    if (field.empty()) {
        DR_LOG(Err, "Invalid field [%s]", field.c_str());
        return false;
    }
    return values_.count(field) > 0;
}

const SqliteValue& SqliteValueList::GetValue(const std::string& field) const
{
    if (field.empty()) {
        DR_LOG(Err, "Invalid field [%s]", field.c_str());
        return invalidValue_;
    }
    const auto entry = values_.find(field);
    if (entry == values_.end()) {
        DR_LOG(Warn, "Failed to find field [%s]", field.c_str());
        return invalidValue_;
    }
    return entry->second;
}

template <class T>
bool SqliteValueList::ReadField(const std::string& field, T& out) const
{
    constexpr const char* Function = "GetValue";
    if (field.empty()) {
        DR_LOG_AS(Function, Err, "Invalid field [%s]", field.c_str());
        return false;
    }
    const auto entry = values_.find(field);
    if (entry == values_.end()) {
        // DEBUG, unlike the other GetValue(): callers use this one to test whether a field exists.
        DR_LOG_AS(Function, Debug, "field [%s] is not existed", field.c_str());
        return false;
    }
    return entry->second.GetValue(out);
}

template <>
bool SqliteValueList::GetValue(const std::string& field, std::string& out) const
{
    return ReadField(field, out);
}

template <>
bool SqliteValueList::GetValue(const std::string& field, unsigned int& out) const
{
    return ReadField(field, out);
}

template <>
bool SqliteValueList::GetValue(const std::string& field, int& out) const
{
    return ReadField(field, out);
}

template <>
bool SqliteValueList::GetValue(const std::string& field, std::int64_t& out) const
{
    return ReadField(field, out);
}

template <>
bool SqliteValueList::GetValue(const std::string& field, double& out) const
{
    return ReadField(field, out);
}

template <>
bool SqliteValueList::GetValue(const std::string& field, bool& out) const
{
    return ReadField(field, out);
}

std::string SqliteValueList::ToStr() const
{
    return JoinPairs(*this, ":", ", ");
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
