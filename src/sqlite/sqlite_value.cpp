#include <orvadrcore/sqlite_value.h>

#include <algorithm>
#include <cstring>
#include <limits>
#include <thread>

#include "base/json_helpers.h"
#include "base/log.h"
#include "base/scope_guard.h"
#include "sqlite/sqlite_internals.h"

namespace OrvaDRCore {

namespace {

// AddValue() moves at most this many fields to make room for one.
constexpr std::size_t MostMoved = 32;

// Room that the first field makes, so that small records are not reallocated as they grow.
constexpr std::size_t UsualFields = 4;

// While a thread sorts the fields that AddValue() has left unsorted.
constexpr std::size_t BeingSorted = std::numeric_limits<std::size_t>::max();

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

// The first field of a sorted range whose name is not less than this one.
template <class Iterator>
Iterator LowerBound(Iterator begin, Iterator end, const std::string& name)
{
    return std::lower_bound(begin, end, name, [](const auto& field, const auto& wanted) {
        return field.first < wanted;
    });
}

// Moves the last field before so many others.
template <class Fields>
void MoveLast(Fields& fields, std::size_t others)
{
    if (others == 0) return;
    auto place = fields.end() - 1;
    auto last = std::move(*place);
    const auto move = [](auto& to, auto& from) {
        to.first = std::move(from.first);
        SqliteInternals::Move(to.second, from.second);
    };
    for (; others > 0; --others, --place) move(*place, *(place - 1));
    move(*place, last);
}

// Sorts the last fields into the others, which are sorted. Of a field that was added twice, the
// second value counts. Nothing has changed if memory runs out.
template <class Fields>
void SortInto(Fields& fields, std::size_t unsorted)
{
    using Field = typename Fields::value_type;
    const auto isBefore = [](const Field* one, const Field* other) {
        return one->first < other->first;
    };
    std::vector<Field*> order;
    order.reserve(fields.size());
    for (Field& field : fields) order.push_back(&field);
    const auto begin = order.end() - static_cast<std::ptrdiff_t>(unsorted);
    std::stable_sort(begin, order.end(), isBefore);
    std::inplace_merge(order.begin(), begin, order.end(), isBefore);
    Fields sorted;
    sorted.reserve(fields.size());
    for (Field* const field : order) {
        if (!sorted.empty() && sorted.back().first == field->first) sorted.pop_back();
        sorted.push_back(std::move(*field));
    }
    fields.swap(sorted);
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

SqliteValueList::SqliteValueList(const SqliteValueList& other) : values_(other.GetValues()) {}

SqliteValueList::SqliteValueList(SqliteValueList&& other) noexcept
    : values_(std::move(other.values_)), unsorted_(other.unsorted_.exchange(0))
{
}

SqliteValueList::~SqliteValueList() = default;

SqliteValueList& SqliteValueList::operator=(const SqliteValueList& other)
{
    // Copies by construction, because assigning each value would lose `valid_`.
    if (this != &other) *this = SqliteValueList(other);
    return *this;
}

SqliteValueList& SqliteValueList::operator=(SqliteValueList&& other) noexcept
{
    values_.swap(other.values_);
    unsorted_ = other.unsorted_.exchange(unsorted_);
    return *this;
}

bool SqliteValueList::AddValue(const std::string& field, const SqliteValue& value)
{
    return AddValue(field, SqliteValue(value));
}

// In a large record whose fields come in any order it would take long to make room for each one.
// There they are appended, and sorted before the record is read or when most of it is unsorted.
bool SqliteValueList::AddValue(const std::string& field, SqliteValue&& value)
{
    if (field.empty() || !value.IsValid()) {
        DR_LOG(Err, "Bad Field[%s] or value [%s]", field.c_str(), value.ToFormatedValue().c_str());
        return false;
    }
    if (unsorted_ > values_.size() / 2) Sort();
    const auto end = values_.end() - static_cast<std::ptrdiff_t>(unsorted_);
    const auto place = LowerBound(values_.begin(), end, field);
    if (place != end && place->first == field) {
        SqliteInternals::Move(place->second, value);
        return true;
    }
    const auto moved = static_cast<std::size_t>(end - place);
    if (values_.empty()) values_.reserve(UsualFields);
    values_.emplace_back(field, std::move(value));
    if (unsorted_ == 0 && moved <= MostMoved) {
        MoveLast(values_, moved);
    } else {
        ++unsorted_;
    }
    return true;
}

SqliteValueList& SqliteValueList::operator+=(const SqliteValueList& other)
{
    for (const auto& [field, value] : other.GetValues()) AddValue(field, value);
    return *this;
}

bool SqliteValueList::HasField(const std::string& field) const
{
    if (field.empty()) {
        DR_LOG(Err, "Invalid field [%s]", field.c_str());
        return false;
    }
    return Find(field) != nullptr;
}

const SqliteValue* SqliteValueList::Find(const std::string& field) const
{
    const Fields& fields = GetValues();
    const auto found = LowerBound(fields.begin(), fields.end(), field);
    return found != fields.end() && found->first == field ? &found->second : nullptr;
}

const SqliteValue& SqliteValueList::GetValue(const std::string& field) const
{
    if (field.empty()) {
        DR_LOG(Err, "Invalid field [%s]", field.c_str());
        return invalidValue_;
    }
    const SqliteValue* const value = Find(field);
    if (value == nullptr) {
        DR_LOG(Warn, "Failed to find field [%s]", field.c_str());
        return invalidValue_;
    }
    return *value;
}

template <class T>
bool SqliteValueList::ReadField(const std::string& field, T& out) const
{
    constexpr const char* Function = "GetValue";
    if (field.empty()) {
        DR_LOG_AS(Function, Err, "Invalid field [%s]", field.c_str());
        return false;
    }
    const SqliteValue* const value = Find(field);
    if (value == nullptr) {
        // DEBUG, unlike the other GetValue(): callers use this one to test whether a field exists.
        DR_LOG_AS(Function, Debug, "field [%s] is not existed", field.c_str());
        return false;
    }
    return value->GetValue(out);
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

const std::vector<std::pair<std::string, SqliteValue>>& SqliteValueList::GetValues() const
{
    if (unsorted_.load(std::memory_order_acquire) != 0) Sort();
    return values_;
}

// Threads may read the same record: one of them sorts it, the others wait.
void SqliteValueList::Sort() const
{
    std::size_t unsorted = unsorted_.load(std::memory_order_acquire);
    while (unsorted != 0) {
        if (unsorted == BeingSorted) {
            std::this_thread::yield();
            unsorted = unsorted_.load(std::memory_order_acquire);
        } else if (unsorted_.compare_exchange_weak(unsorted, BeingSorted)) {
            const ScopeGuard store([&] { unsorted_.store(unsorted, std::memory_order_release); });
            SortInto(values_, unsorted);
            unsorted = 0;
        }
    }
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
