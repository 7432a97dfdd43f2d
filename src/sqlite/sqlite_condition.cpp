#include <orvadrcore/sqlite_condition.h>

#include "base/log.h"
#include "sqlite/sqlite_internals.h"

namespace OrvaDRCore {

namespace {

constexpr const char* In = "IN";
constexpr const char* NotIn = "NOT IN";

// All log lines of this file name the function that the caller used.
constexpr const char* Setter = "SetValue";

bool SetComparison(std::string& condition, const std::string& lvalue, const char* sign,
                   const SqliteValue& value)
{
    if (lvalue.empty() || !value.IsValid()) {
        DR_LOG_AS(Setter, Err, "Bad lvalue[%s] or rvalue[%s]", lvalue.c_str(),
                  value.ToFormatedValue().c_str());
        return false;
    }
    condition = lvalue + sign + value.ToFormatedValue();
    return true;
}

// The text for a pattern that escapes with backslashes.
std::string EscapeWildcards(const std::string& text)
{
    std::string escaped;
    escaped.reserve(text.size());
    for (const char character : text) {
        if (character == '%' || character == '_' || character == '\\') escaped += '\\';
        escaped += character;
    }
    return escaped;
}

// `before` is put between the quote and the text.
bool SetPattern(std::string& condition, const std::string& lvalue, const char* before,
                const std::string& text)
{
    // LIKE reads a pattern up to its first zero byte only, and would match other rows.
    const bool isReadable = text.find('\0') == std::string::npos;
    const std::string pattern = before + EscapeWildcards(text) + "%";
    const SqliteValue value = isReadable ? SqliteValue::Text(pattern) : SqliteValue();
    if (!SetComparison(condition, lvalue, " LIKE ", value)) return false;
    condition += R"( ESCAPE '\')";
    return true;
}

// By contract this appends: a second call on the same object adds its text after the first one.
bool AppendJunction(std::string& condition, const std::string& left, const char* word,
                    const std::string& right)
{
    if (left.empty() || right.empty()) {
        DR_LOG_AS(Setter, Err, "Bad lvalue[%s] or rvalue[%s]", left.c_str(), right.c_str());
        return false;
    }
    condition += "(" + left + ") " + word + " (" + right + ")";
    return true;
}

}  // namespace

SqliteCondition::SqliteCondition(const std::string& text) : condition(text) {}

bool SqliteCondition::IsValid() const
{
    return !condition.empty();
}

SqliteEqual::SqliteEqual(const std::string& lvalue, const SqliteValue& value)
{
    SetValue(lvalue, value);
}

bool SqliteEqual::SetValue(const std::string& lvalue, const SqliteValue& value)
{
    return SetComparison(condition, lvalue, IsStoredAsNull(value) ? " IS " : "=", value);
}

SqliteNotEqual::SqliteNotEqual(const std::string& lvalue, const SqliteValue& value)
{
    SetValue(lvalue, value);
}

bool SqliteNotEqual::SetValue(const std::string& lvalue, const SqliteValue& value)
{
    return SetComparison(condition, lvalue, IsStoredAsNull(value) ? " IS NOT " : "!=", value);
}

SqliteLess::SqliteLess(const std::string& lvalue, const SqliteValue& value)
{
    SetValue(lvalue, value);
}

bool SqliteLess::SetValue(const std::string& lvalue, const SqliteValue& value)
{
    return SetComparison(condition, lvalue, "<", value);
}

SqliteLessEqual::SqliteLessEqual(const std::string& lvalue, const SqliteValue& value)
{
    SetValue(lvalue, value);
}

bool SqliteLessEqual::SetValue(const std::string& lvalue, const SqliteValue& value)
{
    return SetComparison(condition, lvalue, "<=", value);
}

SqliteGreater::SqliteGreater(const std::string& lvalue, const SqliteValue& value)
{
    SetValue(lvalue, value);
}

bool SqliteGreater::SetValue(const std::string& lvalue, const SqliteValue& value)
{
    return SetComparison(condition, lvalue, ">", value);
}

SqliteGreaterEqual::SqliteGreaterEqual(const std::string& lvalue, const SqliteValue& value)
{
    SetValue(lvalue, value);
}

bool SqliteGreaterEqual::SetValue(const std::string& lvalue, const SqliteValue& value)
{
    return SetComparison(condition, lvalue, ">=", value);
}

SqliteContains::SqliteContains(const std::string& lvalue, const std::string& text)
{
    SetValue(lvalue, text);
}

bool SqliteContains::SetValue(const std::string& lvalue, const std::string& text)
{
    return SetPattern(condition, lvalue, "%", text);
}

SqliteBeginsWith::SqliteBeginsWith(const std::string& lvalue, const std::string& text)
{
    SetValue(lvalue, text);
}

bool SqliteBeginsWith::SetValue(const std::string& lvalue, const std::string& text)
{
    return SetPattern(condition, lvalue, "", text);
}

SqliteAnd::SqliteAnd(const std::string& left, const std::string& right)
{
    SetValue(left, right);
}

bool SqliteAnd::SetValue(const std::string& left, const std::string& right)
{
    return AppendJunction(condition, left, "AND", right);
}

SqliteOr::SqliteOr(const std::string& left, const std::string& right)
{
    SetValue(left, right);
}

bool SqliteOr::SetValue(const std::string& left, const std::string& right)
{
    return AppendJunction(condition, left, "OR", right);
}

SqliteInFamily::SqliteInFamily(const std::string& keyword) : keyword_(keyword) {}

SqliteInFamily::SqliteInFamily(const std::string& keyword, const std::string& lvalue,
                               const std::vector<SqliteValue>& values)
    : keyword_(keyword)
{
    SetValue(lvalue, values);
}

SqliteInFamily::SqliteInFamily(const std::string& keyword, const std::string& lvalue,
                               const std::string& value)
    : keyword_(keyword)
{
    SetValue(lvalue, value);
}

// The contract looks at the keyword only: after a refused list the condition is empty but valid.
bool SqliteInFamily::IsValid() const
{
    return keyword_ == In || keyword_ == NotIn;
}

bool SqliteInFamily::CheckKeyword() const
{
    // In the constructors this is the base's IsValid(), later that of the derived class.
    if (IsValid()) return true;  // NOLINT(clang-analyzer-optin.cplusplus.VirtualCall)
    DR_LOG_AS(Setter, Err, "Bad keyword [%s]", keyword_.c_str());
    return false;
}

bool SqliteInFamily::SetValue(const std::string& lvalue, const std::vector<SqliteValue>& values)
{
    if (!CheckKeyword()) return false;
    if (lvalue.empty()) {
        DR_LOG(Err, "Bad lvalue[%s]", lvalue.c_str());
        return false;
    }
    condition = lvalue + " " + keyword_ + " ( ";
    for (const SqliteValue& value : values) {
        if (!value.IsValid()) {
            condition.clear();
            DR_LOG(Err, "Invalid rvalue [%s]", value.ToFormatedValue().c_str());
            return false;
        }
        AppendLiteral(condition, value);
        condition += ',';
    }
    if (!values.empty()) condition.pop_back();
    condition += " )";
    return true;
}

bool SqliteInFamily::SetValue(const std::string& lvalue, const std::string& value)
{
    if (!CheckKeyword()) return false;
    if (lvalue.empty() || value.empty()) {
        DR_LOG(Err, "Bad lvalue[%s] or value[%s]", lvalue.c_str(), value.c_str());
        return false;
    }
    condition = lvalue + " " + keyword_ + " ( " + value + " )";
    return true;
}

SqliteIn::SqliteIn() : SqliteInFamily(In) {}

SqliteIn::SqliteIn(const std::string& lvalue, const std::vector<SqliteValue>& values)
    : SqliteInFamily(In, lvalue, values)
{
}

SqliteIn::SqliteIn(const std::string& lvalue, const std::string& value)
    : SqliteInFamily(In, lvalue, value)
{
}

SqliteNotIn::SqliteNotIn() : SqliteInFamily(NotIn) {}

SqliteNotIn::SqliteNotIn(const std::string& lvalue, const std::vector<SqliteValue>& values)
    : SqliteInFamily(NotIn, lvalue, values)
{
}

SqliteNotIn::SqliteNotIn(const std::string& lvalue, const std::string& value)
    : SqliteInFamily(NotIn, lvalue, value)
{
}

}  // namespace OrvaDRCore
