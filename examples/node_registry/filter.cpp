#include "filter.h"

#include <vector>

#include <orvadrcore/sqlite_condition.h>

#include "node.h"
#include "text.h"

namespace NodeRegistry {

using OrvaDRCore::SqliteAnd;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteIn;
using OrvaDRCore::SqliteNotEqual;
using OrvaDRCore::SqliteNotIn;
using OrvaDRCore::SqliteOr;
using OrvaDRCore::SqliteValue;

namespace {

bool Build(const Json::Value& filter, int& left, std::string& ret_condition);

// `Junction` is SqliteAnd or SqliteOr.
template <class Junction>
bool Join(const Json::Value& filters, int& left, std::string& ret_condition)
{
    if (!filters.isArray() || filters.empty()) return false;
    std::string joined;
    for (const Json::Value& filter : filters) {
        std::string condition;
        if (!Build(filter, left, condition)) return false;
        joined = joined.empty() ? condition : Junction(joined, condition).GetCondition();
    }
    ret_condition = joined;
    return true;
}

// `Membership` is SqliteIn or SqliteNotIn.
template <class Membership>
bool MatchIds(const Json::Value& ids, std::string& ret_condition)
{
    if (!ids.isArray()) return false;
    std::vector<SqliteValue> values;
    for (const Json::Value& id : ids) {
        if (!id.isString() || !IsPlainText(id.asString(), MaxIdBytes)) return false;
        values.push_back(SqliteValue::Text(id.asString()));
    }
    ret_condition = Membership("id", values).GetCondition();
    return true;
}

// `Comparison` is SqliteEqual or SqliteNotEqual.
template <class Comparison>
bool CompareEnabled(const Json::Value& enabled, std::string& ret_condition)
{
    if (!enabled.isBool()) return false;
    ret_condition = Comparison("enabled", enabled.asBool()).GetCondition();
    return true;
}

// `left` is the number of filters that the request may still have.
bool Build(const Json::Value& filter, int& left, std::string& ret_condition)
{
    if (!filter.isObject() || filter.size() != 1 || left-- == 0) return false;
    const std::string kind = filter.begin().name();
    const Json::Value& operand = *filter.begin();
    if (kind == "and") return Join<SqliteAnd>(operand, left, ret_condition);
    if (kind == "or") return Join<SqliteOr>(operand, left, ret_condition);
    if (kind == "ids") return MatchIds<SqliteIn>(operand, ret_condition);
    if (kind == "not_ids") return MatchIds<SqliteNotIn>(operand, ret_condition);
    if (kind == "enabled") return CompareEnabled<SqliteEqual>(operand, ret_condition);
    if (kind == "not_enabled") return CompareEnabled<SqliteNotEqual>(operand, ret_condition);
    return false;
}

}  // namespace

bool ToCondition(const Json::Value& filter, std::string& ret_condition)
{
    int left = MaxFilters;
    return Build(filter, left, ret_condition);
}

}  // namespace NodeRegistry
