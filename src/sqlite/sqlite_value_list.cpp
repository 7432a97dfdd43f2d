// Records: the fields of SqliteValueList.
#define DR_LOG_FILE "sqlite_value.cpp"

#include <algorithm>
#include <limits>
#include <thread>
#include <utility>

#include <orvadrcore/sqlite_value.h>

#include "base/log.h"
#include "base/scope_guard.h"
#include "sqlite/sqlite_internals.h"

namespace OrvaDRCore {

namespace {

// AddValue() moves at most this many fields to make room for one.
constexpr std::size_t MostMoved = 32;

// Room that the first field makes, so that small records are not reallocated as they grow.
constexpr std::size_t UsualFields = 4;

// What unsorted_ is while one thread sorts the fields and the others wait.
constexpr std::size_t BeingSorted = std::numeric_limits<std::size_t>::max();

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
    if (unsorted == 1) {  // the usual case if the record is read after each field
        const auto last = fields.end() - 1;
        const auto place = LowerBound(fields.begin(), last, last->first);
        return MoveLast(fields, static_cast<std::size_t>(last - place));
    }
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
    std::string text;
    AppendPairs(text, *this, ":", ", ");
    return text;
}

}  // namespace OrvaDRCore
