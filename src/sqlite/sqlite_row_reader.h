// Reads the rows of a select.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_ROW_READER_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_ROW_READER_H

#include <sqlite3.h>

#include <string>
#include <vector>

#include <orvadrcore/sqlite_value.h>

namespace OrvaDRCore {

// Reads the row that a statement has stepped to.
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

  private:
    sqlite3_stmt* statement_;
    std::vector<std::string> names_;
};

}  // namespace OrvaDRCore

#endif
