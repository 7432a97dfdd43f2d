// Reads the rows of a select.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_ROW_READER_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_ROW_READER_H

#include <sqlite3.h>

#include <cstddef>
#include <string>
#include <vector>

#include <orvadrcore/sqlite_value.h>

namespace OrvaDRCore {

// Reads the row that a statement has stepped to. One reader serves all rows of a select.
class RowReader {
  public:
    // Reads the column names, so the statement must have been stepped once: SQLite prepares a
    // cached statement again at its first step if the schema has changed.
    explicit RowReader(sqlite3_stmt* statement);

    bool HasStatement() const { return statement_ != nullptr; }

    // Is told of each column that the record leaves out, with SQLite's number of its type. A text
    // is left out when SQLite has run out of memory.
    using LeftOut = void (*)(const std::string& name, int type);

    // The integers, as 32 bits, and the texts, up to their first zero byte. Of several columns with
    // the same name the last one counts.
    SqliteValueList Read(LeftOut leftOut) const;

    const std::vector<std::string>& GetNames() const { return names_; }

    // The last column with this name, GetNames().size() if there is none.
    std::size_t Find(const std::string& name);

    // A column's value in this row, which may be read in this thread until the next row. The
    // column must exist.
    sqlite3_value* GetColumn(std::size_t column) const
    {
        return sqlite3_column_value(statement_, static_cast<int>(column));
    }

    // For a value that could not be read because SQLite has run out of memory: the select fails
    // then, or the value could be taken for NULL.
    void NoteOutOfMemory() { isOutOfMemory_ = true; }
    bool IsOutOfMemory() const { return isOutOfMemory_; }

  private:
    std::size_t Search(const std::string& name);

    sqlite3_stmt* statement_;
    std::vector<std::string> names_;
    bool isOutOfMemory_ = false;

    // Set by the first search: the columns in the order of their names, and for each column the one
    // that was looked up after it the last time. Callers read every row in the same order, so this
    // is nearly always the one that they want.
    std::vector<std::size_t> sorted_;
    std::vector<std::size_t> followers_;
    std::size_t last_ = 0;
};

}  // namespace OrvaDRCore

#endif
