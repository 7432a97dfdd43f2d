#include "sqlite/sqlite_row_reader.h"

#include <algorithm>

#include "sqlite/sqlite_internals.h"

namespace OrvaDRCore {

RowReader::RowReader(sqlite3_stmt* statement) : statement_(statement)
{
    const int columns = sqlite3_column_count(statement);
    columns_.reserve(static_cast<std::size_t>(columns));
    for (int column = 0; column < columns; ++column) {
        // Null when SQLite has run out of memory.
        const char* name = sqlite3_column_name(statement, column);
        columns_.push_back({name != nullptr ? name : "", column});
    }
}

SqliteValueList RowReader::Read(LeftOut leftOut) const
{
    SqliteValueList record;
    for (const auto& [name, column, follower] : columns_) {
        const int type = sqlite3_column_type(statement_, column);
        const unsigned char* text =
            type == SQLITE_TEXT ? sqlite3_column_text(statement_, column) : nullptr;
        if (type == SQLITE_INTEGER) {
            SqliteInternals::Add(record, name, sqlite3_column_int(statement_, column));
        } else if (text != nullptr) {
            SqliteInternals::Add(record, name, reinterpret_cast<const char*>(text));
        } else {
            leftOut(name, type);
        }
    }
    return record;
}

const RowReader::Column* RowReader::Search(const std::string& name)
{
    if (sorted_.empty()) {
        for (Column& column : columns_) sorted_.push_back(&column);
        std::stable_sort(
            sorted_.begin(), sorted_.end(),
            [](const Column* one, const Column* other) { return one->name < other->name; });
    }
    const auto after = std::upper_bound(
        sorted_.begin(), sorted_.end(), name,
        [](const std::string& wanted, const Column* column) { return wanted < column->name; });
    if (after == sorted_.begin() || (*(after - 1))->name != name) return nullptr;
    Column* const found = *(after - 1);
    if (last_ != nullptr) last_->follower = found;
    return last_ = found;
}

}  // namespace OrvaDRCore
