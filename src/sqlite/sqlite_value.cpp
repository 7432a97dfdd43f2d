#include <orvadrcore/sqlite_value.h>

#include <cstring>
#include <utility>

#include "base/json_helpers.h"
#include "base/log.h"
#include "sqlite/sqlite_internals.h"

namespace OrvaDRCore {

SqliteValue::SqliteValue(int number) : valid_(true), value_(number) {}

SqliteValue::SqliteValue(unsigned int number) : valid_(true), value_(number) {}

SqliteValue::SqliteValue(bool truth) : valid_(true), value_(truth) {}

SqliteValue::SqliteValue(const std::string& text) : SqliteValue(text.data(), text.size()) {}

SqliteValue::SqliteValue(const char* text)
    : SqliteValue(text, text != nullptr ? std::strlen(text) : 0)
{
}

SqliteValue::SqliteValue(const char* text, std::size_t length)
    : valid_(text != nullptr && FitsJsonText(length)),
      value_(valid_ ? Json::Value(text, text + length) : Json::Value())
{
    if (text != nullptr && !valid_) {
        DR_LOG(Err, "text of [%zu] bytes is too long for a value", length);
    }
}

// By contract `valid_` stays as it was: only construction makes a value valid.
SqliteValue& SqliteValue::operator=(const SqliteValue& other)
{
    value_ = other.value_;
    return *this;
}

bool SqliteValue::IsValid() const
{
    // An assignment may have replaced the payload since the value was built.
    const Json::ValueType kind = value_.type();
    return valid_ && (kind == Json::intValue || kind == Json::uintValue ||
                      kind == Json::stringValue || kind == Json::booleanValue);
}

template <>
bool SqliteValue::GetValue(std::string& out) const
{
    if (!value_.isString()) {
        DR_LOG_AS("GetValue<std::basic_string<char> >", Warn, "[%s] is not string",
                  toString(value_).c_str());
        return false;
    }
    out = value_.asString();
    return true;
}

template <>
bool SqliteValue::GetValue(unsigned int& out) const
{
    if (!value_.isUInt()) {
        DR_LOG_AS("GetValue<unsigned int>", Warn, "[%s] is not int", toString(value_).c_str());
        return false;
    }
    out = value_.asUInt();
    return true;
}

template <>
bool SqliteValue::GetValue(int& out) const
{
    if (!value_.isInt()) {
        DR_LOG_AS("GetValue<int>", Warn, "[%s] is not int", toString(value_).c_str());
        return false;
    }
    out = value_.asInt();
    return true;
}

template <>
bool SqliteValue::GetValue(bool& out) const
{
    const bool isBit = value_.isInt() && (value_.asInt() == 0 || value_.asInt() == 1);
    if (!value_.isBool() && !isBit) {
        DR_LOG_AS("GetValue<bool>", Warn, "[%s] is not bool", toString(value_).c_str());
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
    for (const char character : text) {
        if (character == '\'') escaped += '\'';
        escaped += character;
    }
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
