#include "sqlite/sqlite_insert.h"

#include <algorithm>

#include "sqlite/sqlite_bind.h"
#include "sqlite/sqlite_internals.h"
#include "sqlite/sqlite_shape.h"

namespace OrvaDRCore {

namespace {

// Whether binding a value stores what its literal stores. A quote in a plain text ends the literal,
// and a zero byte ends the statement. SQLite reads the literal of a real in its own way,
// and may index a bound blob as another text than its literal, in a database of UTF-16.
bool IsBoundAsWritten(const SqliteValue& value)
{
    using Kind = SqliteInternals::Kind;
    switch (SqliteInternals::KindOf(value)) {
        case Kind::Nothing:
        case Kind::Blob:
        case Kind::Real: return false;
        case Kind::Boolean:
        case Kind::Integer:
        case Kind::Null: return true;
        default: break;
    }
    const std::string& bytes = SqliteInternals::BytesOf(value);
    if (bytes.size() > MaxTextBytes) return false;
    const bool isPlain = SqliteInternals::KindOf(value) == Kind::PlainText;
    return bytes.find('\0') == std::string::npos &&
           (!isPlain || bytes.find('\'') == std::string::npos);
}

}  // namespace

void AppendInsertShape(std::string& text, const std::string& table, const SqliteValueList& record,
                       bool replacable)
{
    AppendInsertInto(text, table, replacable);
    AppendColumns(text, record);
    for (std::size_t count = record.GetValues().size(); count > 0; --count) text += "?,";
    text.back() = ')';
}

bool WriteInsertShape(const InsertCommand& command, std::string& shape)
{
    const SqliteValueList& record = InsertInternals::RecordOf(command);
    const std::string& table = command.GetTable().GetName();
    const auto& values = record.GetValues();
    const auto isPlain = [](const auto& field) {
        return IsPlainName(field.first) && IsBoundAsWritten(field.second);
    };
    if (values.empty() || values.size() > MaxParameters || !IsPlainName(table) ||
        !IsPlainTable(table) || !std::all_of(values.begin(), values.end(), isPlain)) {
        return false;
    }
    shape.clear();
    AppendInsertShape(shape, table, record, InsertInternals::IsReplacable(command));
    return true;
}

int BindInsert(sqlite3_stmt* statement, const InsertCommand& command)
{
    int place = 0;
    for (const auto& [field, value] : InsertInternals::RecordOf(command).GetValues()) {
        const int code = BindValue(statement, ++place, value);
        if (code != SQLITE_OK) return code;
    }
    return SQLITE_OK;
}

}  // namespace OrvaDRCore
