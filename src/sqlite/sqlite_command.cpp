#include <orvadrcore/sqlite_command.h>

#include <algorithm>
#include <limits>

#include <orvadrcore/utils.h>

#include "base/log.h"
#include "sqlite/sqlite_internals.h"

namespace OrvaDRCore {

namespace {

template <class T>
bool AddFieldValue(SqliteValueList& record, const std::string& field, const T& value)
{
    SqliteValue built(value);
    if (field.empty() || !built.IsValid()) {
        DR_LOG(Err, "Bad Field [%s] /value[%s]", field.c_str(), built.ToFormatedValue().c_str());
        return false;
    }
    return record.AddValue(field, std::move(built));
}

// Writes to the stream's buffer, which throws when memory runs out. The stream's operators would
// swallow the exception and leave a truncated text.
void Write(std::stringstream& out, const std::string& text)
{
    out.rdbuf()->sputn(text.data(), static_cast<std::streamsize>(text.size()));
}

// Returns null, after a log line, when the condition is not valid.
const std::string* TextOf(const SqliteCondition& condition)
{
    if (!condition.IsValid()) {
        DR_LOG_AS("SetCondition", Err, "Invalid condition");
        return nullptr;
    }
    return &condition.GetCondition();
}

// Appends "(id,name) VALUES (1,'x')".
void AppendInsertValues(std::string& text, const SqliteValueList& record)
{
    AppendColumns(text, record);
    for (const auto& [field, value] : record.GetValues()) {
        AppendLiteral(text, value);
        text += ',';
    }
    if (text.back() == ',') text.pop_back();
    text += ')';
}

// Adds a key to the list of GROUP BY or ORDER BY.
bool AddKey(const char* function, std::string& keys, const std::string& field,
            const char* direction)
{
    if (field.empty()) {
        DR_LOG_AS(function, Err, "Invalid field [%s]", field.c_str());
        return false;
    }
    keys += (keys.empty() ? "" : ",") + field + direction;
    return true;
}

// SQLite reads a larger number as a real, which LIMIT refuses. No table has so many rows.
std::string RowCount(std::uint64_t count)
{
    constexpr std::uint64_t Most = std::numeric_limits<std::int64_t>::max();
    return std::to_string(std::min(count, Most));
}

std::string PairsForLog(const SqliteValueList& record)
{
    std::string text = "values:[";
    AppendPairs(text, record, "=", ",");
    return text + "]";
}

}  // namespace

SqliteTableHandler::SqliteTableHandler(const std::string& name, const std::string& schema)
    : name_(name), schema_(schema)
{
}

SqliteTableHandler::~SqliteTableHandler() = default;

SqliteCommand::~SqliteCommand() = default;

bool SqliteCommand::SetTable(const SqliteTableHandler& handler)
{
    if (handler.GetName().empty()) {
        DR_LOG(Err, "Invalid table [%s]", handler.GetName().c_str());
        return false;
    }
    table_ = handler;
    return true;
}

std::string SqliteCommand::ToStr() const
{
    std::stringstream out;
    Write(out,
          table_.GetName() + "]");  // the contract has no opening bracket
    DumpParam(out);
    return out.str();
}

InsertCommand::~InsertCommand() = default;

void InsertCommand::SetFieldValues(const SqliteValueList& values)
{
    fieldValues_ = values;
}

void InsertCommand::SetReplacable(bool replacable)
{
    replacable_ = replacable;
}

template <>
bool InsertCommand::AddFieldValue(const std::string& field, const std::string& value)
{
    return OrvaDRCore::AddFieldValue(fieldValues_, field, value);
}

template <>
bool InsertCommand::AddFieldValue(const std::string& field, const bool& value)
{
    return OrvaDRCore::AddFieldValue(fieldValues_, field, value);
}

template <>
bool InsertCommand::AddFieldValue(const std::string& field, const int& value)
{
    return OrvaDRCore::AddFieldValue(fieldValues_, field, value);
}

template <>
bool InsertCommand::AddFieldValue(const std::string& field, const unsigned int& value)
{
    return OrvaDRCore::AddFieldValue(fieldValues_, field, value);
}

template <>
bool InsertCommand::AddFieldValue(const std::string& field, const SqliteValue& value)
{
    return OrvaDRCore::AddFieldValue(fieldValues_, field, value);
}

bool InsertCommand::AddFieldValue(const std::string& field, const char* text)
{
    return OrvaDRCore::AddFieldValue(fieldValues_, field, text);
}

bool InsertCommand::IsValid() const
{
    return !fieldValues_.GetValues().empty() && !GetTable().GetName().empty();
}

std::string InsertCommand::ToFormatedInsertValues() const
{
    std::string text;
    AppendInsertValues(text, fieldValues_);
    return text;
}

std::string InsertCommand::GetCommand() const
{
    if (!IsValid()) {
        DR_LOG(Err, "Bad insert parameter");
        return {};
    }
    std::string text = BeginStatement("");
    AppendInsertInto(text, GetTable().GetName(), replacable_);
    AppendInsertValues(text, fieldValues_);
    text += ';';
    return text;
}

void InsertCommand::DumpParam(std::stringstream& out) const
{
    Write(out, PairsForLog(fieldValues_));
}

UpdateCommand::~UpdateCommand() = default;

void UpdateCommand::SetFieldValues(const SqliteValueList& values)
{
    fieldValues_ = values;
}

template <>
bool UpdateCommand::AddFieldValue(const std::string& field, const std::string& value)
{
    return OrvaDRCore::AddFieldValue(fieldValues_, field, value);
}

template <>
bool UpdateCommand::AddFieldValue(const std::string& field, const bool& value)
{
    return OrvaDRCore::AddFieldValue(fieldValues_, field, value);
}

template <>
bool UpdateCommand::AddFieldValue(const std::string& field, const int& value)
{
    return OrvaDRCore::AddFieldValue(fieldValues_, field, value);
}

template <>
bool UpdateCommand::AddFieldValue(const std::string& field, const unsigned int& value)
{
    return OrvaDRCore::AddFieldValue(fieldValues_, field, value);
}

template <>
bool UpdateCommand::AddFieldValue(const std::string& field, const SqliteValue& value)
{
    return OrvaDRCore::AddFieldValue(fieldValues_, field, value);
}

bool UpdateCommand::AddFieldValue(const std::string& field, const char* text)
{
    return OrvaDRCore::AddFieldValue(fieldValues_, field, text);
}

// The contract has no log line for an empty text here, but has one in SelectCommand.
bool UpdateCommand::SetCondition(const std::string& text)
{
    if (text.empty()) return false;
    condition_ = text;
    return true;
}

bool UpdateCommand::SetCondition(const SqliteCondition& object)
{
    const std::string* text = TextOf(object);
    return text != nullptr && SetCondition(*text);
}

bool UpdateCommand::IsValid() const
{
    return !condition_.empty() && !fieldValues_.GetValues().empty() &&
           !GetTable().GetName().empty();
}

// By contract updates and selects do not end with ";", but inserts do.
std::string UpdateCommand::GetCommand() const
{
    if (!IsValid()) {
        DR_LOG(Err, "Bad update command");
        return {};
    }
    std::string text = BeginStatement("UPDATE ");
    text += GetTable().GetName();
    text += " SET ";
    AppendPairs(text, fieldValues_, "=", ",");
    AppendClause(text, " WHERE ", condition_);
    return text;
}

void UpdateCommand::DumpParam(std::stringstream& out) const
{
    Write(out, "condition:[" + condition_ + "]/" + PairsForLog(fieldValues_));
}

SelectCommand::~SelectCommand() = default;

void SelectCommand::SelectAll()
{
    fields_.clear();
    selectAll_ = true;
}

bool SelectCommand::AddField(const std::string& field)
{
    if (field.empty()) return false;
    fields_.push_back(field);
    selectAll_ = false;
    return true;
}

bool SelectCommand::SetCondition(const std::string& text)
{
    if (text.empty()) {
        DR_LOG(Err, "Empty condition");
        return false;
    }
    condition_ = text;
    return true;
}

bool SelectCommand::SetCondition(const SqliteCondition& object)
{
    const std::string* text = TextOf(object);
    return text != nullptr && SetCondition(*text);
}

bool SelectCommand::GroupBy(const std::string& field)
{
    return AddKey(__func__, groups_, field, "");
}

bool SelectCommand::OrderBy(const std::string& field, SqliteOrder order)
{
    return AddKey(__func__, orders_, field, order == SqliteOrder::Descending ? " DESC" : "");
}

void SelectCommand::Limit(std::uint64_t rows, std::uint64_t offset)
{
    limit_ = RowCount(rows);
    if (offset > 0) limit_ += " OFFSET " + RowCount(offset);
}

bool SelectCommand::IsValid() const
{
    return !GetTable().GetName().empty() && (selectAll_ || !fields_.empty());
}

std::string SelectCommand::GetCommand() const
{
    if (!IsValid()) {
        DR_LOG(Err, "Bad select command");
        return {};
    }
    std::string text = BeginStatement("SELECT ");
    if (!fields_.empty()) {
        text += Container::ToString(fields_, ",");
        text += ' ';
    } else if (selectAll_) {
        text += " * ";  // the contract has two blanks before the star
    }
    AppendClause(text, "FROM ", GetTable().GetName());
    AppendClause(text, " WHERE ", condition_);
    AppendClause(text, " GROUP BY ", groups_);
    AppendClause(text, " ORDER BY ", orders_);
    AppendClause(text, " LIMIT ", limit_);
    return text;
}

void SelectCommand::DumpParam(std::stringstream& out) const
{
    Write(out, "condition:[" + condition_ + "]/fields:[" +
                   (selectAll_ ? "all" : Container::ToString(fields_, ", ")) + "]");
    if (!groups_.empty()) Write(out, "/group:[" + groups_ + "]");
    if (!orders_.empty()) Write(out, "/order:[" + orders_ + "]");
    if (!limit_.empty()) Write(out, "/limit:[" + limit_ + "]");
}

}  // namespace OrvaDRCore
