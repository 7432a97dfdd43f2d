#include "sqlite/sqlite_row_reader.h"

#include <algorithm>
#include <cstring>
#include <tuple>

#include "base/json_helpers.h"
#include "sqlite/sqlite_internals.h"

namespace OrvaDRCore {

namespace {

// Whether a text is not too long for a value. Null stands for a number.
bool MakesValue(const char* text)
{
    return text == nullptr || FitsJsonText(std::strlen(text));
}

}  // namespace

RowReader::RowReader(sqlite3_stmt* statement) : statement_(statement)
{
    const int columns = sqlite3_column_count(statement);
    columns_.reserve(static_cast<std::size_t>(columns));
    for (int column = 0; column < columns; ++column) {
        // Null when SQLite has run out of memory.
        const char* name = sqlite3_column_name(statement, column);
        columns_.push_back({name != nullptr ? name : "", column});
    }
    sorted_.reserve(columns_.size());
    for (Column& column : columns_) sorted_.push_back(&column);
    std::sort(sorted_.begin(), sorted_.end(), [](const Column* one, const Column* other) {
        return std::tie(one->name, one->number) < std::tie(other->name, other->number);
    });
    for (std::size_t i = 1; i < sorted_.size(); ++i) {
        sorted_[i]->isRepeated = sorted_[i]->name == sorted_[i - 1]->name;
    }
}

SqliteValue RowReader::Field::ToValue() const
{
    return text != nullptr ? SqliteValue(text) : SqliteValue(number);
}

// In two passes: lines are logged in the order of the columns, the record is made in that of names.
SqliteValueList RowReader::Read(LeftOut leftOut) const
{
    fields_.clear();
    for (const Column& column : columns_) fields_.push_back(ReadField(column, leftOut));
    SqliteValueList record;
    SqliteInternals::Reserve(record, columns_.size());
    for (const Column* const column : sorted_) {
        const Field& field = fields_[static_cast<std::size_t>(column->number)];
        if (!field.isThere) continue;
        if (column->isRepeated) {
            record.AddValue(column->name, field.ToValue());
        } else if (field.text != nullptr) {
            SqliteInternals::Append(record, column->name, field.text);
        } else {
            SqliteInternals::Append(record, column->name, field.number);
        }
    }
    return record;
}

RowReader::Field RowReader::ReadField(const Column& column, LeftOut leftOut) const
{
    Field field;
    sqlite3_value* const value = GetValue(column);
    const int type = sqlite3_value_type(value);
    if (type == SQLITE_INTEGER) {
        field.number = sqlite3_value_int(value);
    } else if (type == SQLITE_TEXT) {
        field.text = reinterpret_cast<const char*>(sqlite3_column_text(statement_, column.number));
    }
    if (type != SQLITE_INTEGER && field.text == nullptr) {
        leftOut(column.name, type);
    } else if (column.name.empty() || !MakesValue(field.text)) {
        SqliteValueList().AddValue(column.name, field.ToValue());  // logs that it is refused
    } else {
        field.isThere = true;
    }
    return field;
}

const RowReader::Column* RowReader::Search(const std::string& name)
{
    const auto after = std::upper_bound(
        sorted_.begin(), sorted_.end(), name,
        [](const std::string& wanted, const Column* column) { return wanted < column->name; });
    if (after == sorted_.begin() || (*(after - 1))->name != name) return nullptr;
    Column* const found = *(after - 1);
    if (last_ != nullptr) last_->follower = found;
    return last_ = found;
}

}  // namespace OrvaDRCore
