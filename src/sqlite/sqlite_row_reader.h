// Reads the rows of a select.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_ROW_READER_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_ROW_READER_H

#include <sqlite3.h>

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

    RowReader(const RowReader&) = delete;
    RowReader& operator=(const RowReader&) = delete;
    ~RowReader() = default;

    bool HasStatement() const { return statement_ != nullptr; }

    // Is told of each column that the record leaves out, with SQLite's number of its type. A text
    // is left out when SQLite has run out of memory.
    using LeftOut = void (*)(const std::string& name, int type);

    // The integers, as 32 bits, and the texts, up to their first zero byte. Of several columns with
    // the same name the last one that is not left out counts.
    SqliteValueList Read(LeftOut leftOut) const;

    struct Column {
        std::string name;
        int number;
        Column* follower = nullptr;  // the one that was looked up after it the last time
        bool isRepeated = false;     // the one before it in the order of names has the same name
    };

    const std::vector<Column>& GetColumns() const { return columns_; }

    // The last column with this name, null if there is none.
    const Column* Find(const std::string& name)
    {
        // Callers look the columns up in the same order in each row.
        Column* const guess = last_ != nullptr ? last_->follower : nullptr;
        if (guess == nullptr || guess->name != name) return Search(name);
        return last_ = guess;
    }

    // A column's value in this row, good until the next row. SQLite calls such a value unprotected: to
    // read it takes no mutex. None is needed because one thread at a time uses a connection.
    sqlite3_value* GetValue(const Column& column) const
    {
        return sqlite3_column_value(statement_, column.number);
    }

    // For a value that could not be read because SQLite has run out of memory: the select fails
    // then, or the value could be taken for NULL.
    void NoteOutOfMemory() { isOutOfMemory_ = true; }
    bool IsOutOfMemory() const { return isOutOfMemory_; }

  private:
    // A column of this row, as the record has it.
    struct Field {
        bool isThere = false;
        int number = 0;
        const char* text = nullptr;  // of a column that is a text

        SqliteValue ToValue() const;
    };

    Field ReadField(const Column& column, LeftOut leftOut) const;
    const Column* Search(const std::string& name);

    sqlite3_stmt* statement_;
    std::vector<Column> columns_;
    std::vector<Column*> sorted_;        // by name, those with the same name by number
    mutable std::vector<Field> fields_;  // of this row by the number of the column, for Read()
    Column* last_ = nullptr;             // that was looked up
    bool isOutOfMemory_ = false;
};

}  // namespace OrvaDRCore

#endif
