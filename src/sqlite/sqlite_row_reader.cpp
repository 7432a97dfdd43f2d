#include "sqlite/sqlite_row_reader.h"

#include "sqlite/sqlite_internals.h"

namespace OrvaDRCore {

RowReader::RowReader(sqlite3_stmt* statement) : statement_(statement)
{
    const int columns = sqlite3_column_count(statement);
    for (int column = 0; column < columns; ++column) {
        // Null when SQLite has run out of memory.
        const char* name = sqlite3_column_name(statement, column);
        names_.emplace_back(name != nullptr ? name : "");
    }
}

SqliteValueList RowReader::Read(LeftOut leftOut) const
{
    SqliteValueList record;
    int column = 0;
    for (const std::string& name : names_) {
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
        ++column;
    }
    return record;
}

}  // namespace OrvaDRCore
