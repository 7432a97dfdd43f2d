#include <orvadrcore/sqlite_command.h>

#include <orvadrcore/utils.h>

#include "base/log.h"
#include "sqlite/sqlite_internals.h"

namespace OrvaDRCore {

namespace {

// Room for a statement from the beginning, so that it need not move as it grows.
constexpr std::size_t UsualLength = 240;

template <class T>
bool AddFieldValue(SqliteValueList& record, const std::string& field, const T& value)
{
    if (field.empty() || !MakesValue(value)) {
        DR_LOG(Err, "Bad Field [%s] /value[%s]", field.c_str(),
               SqliteValue(value).ToFormatedValue().c_str());
        return false;
    }
    SqliteInternals::Add(record, field, value);
    return true;
}

// Writes to the stream's buffer, which throws when memory runs out. The stream's operators would
// swallow that and leave a text that is cut off.
void Write(std::stringstream& out, const std::string& text)
{
    out.rdbuf()->sputn(text.data(), static_cast<std::streamsize>(text.size()));
}

// The text of a condition object, for the caller's setter of texts; null when it is not valid.
const std::string* TextOf(const SqliteCondition& condition)
{
    if (!condition.IsValid()) {
        DR_LOG_AS("SetCondition", Err, "Invalid condition");
        return nullptr;
    }
    return &condition.GetCondition();
}

// The names of the fields and their literals, each list in brackets.
void AppendInsertValues(std::string& text, const SqliteValueList& record)
{
    text += '(';
    for (const auto& [field, value] : record.GetValues()) (text += field) += ',';
    if (text.back() == ',') text.pop_back();
    text += ") VALUES (";
    for (const auto& [field, value] : record.GetValues()) {
        AppendLiteral(text, value);
        text += ',';
    }
    if (text.back() == ',') text.pop_back();
    text += ')';
}

std::string PairsForLog(const SqliteValueList& record)
{
    return "values:[" + JoinPairs(record, "=", ",") + "]";
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
          table_.GetName() + "]");  // there is no opening bracket, because the contract says so
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
    std::string text;
    text.reserve(UsualLength);
    text += replacable_ ? "INSERT OR REPLACE INTO " : "INSERT INTO ";
    text += GetTable().GetName();
    text += ' ';
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

bool UpdateCommand::AddFieldValue(const std::string& field, const char* text)
{
    return OrvaDRCore::AddFieldValue(fieldValues_, field, text);
}

// An empty text is refused without a line, on purpose; SelectCommand has one.
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

// No ";" at the end of updates and selects, unlike inserts, on purpose.
std::string UpdateCommand::GetCommand() const
{
    if (!IsValid()) {
        DR_LOG(Err, "Bad update command");
        return {};
    }
    std::string text =
        "UPDATE " + GetTable().GetName() + " SET " + JoinPairs(fieldValues_, "=", ",");
    if (!condition_.empty()) text += " WHERE " + condition_;
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
    std::string text = "SELECT ";
    if (!fields_.empty()) {
        text += Container::ToString(fields_, ",") + " ";
    } else if (selectAll_) {
        text += " * ";  // the second blank before the star, on purpose
    }
    text += "FROM " + GetTable().GetName();
    if (!condition_.empty()) text += " WHERE " + condition_;
    return text;
}

void SelectCommand::DumpParam(std::stringstream& out) const
{
    Write(out, "condition:[" + condition_ + "]/fields:[" +
                   (selectAll_ ? "all" : Container::ToString(fields_, ", ")) + "]");
}

}  // namespace OrvaDRCore
