// An InsertCommand as a statement with parameters.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_INSERT_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_INSERT_H

#include <sqlite3.h>

#include <string>

#include <orvadrcore/sqlite_command.h>

namespace OrvaDRCore {

// Access for the library's own sources.
struct InsertInternals {
    static const SqliteValueList& RecordOf(const InsertCommand& command)
    {
        return command.fieldValues_;
    }
    static bool IsReplacable(const InsertCommand& command) { return command.replacable_; }
};

// Appends "INSERT INTO table (a,b) VALUES (?,?)".
void AppendInsertShape(std::string& text, const std::string& table, const SqliteValueList& record,
                       bool replacable);

// Writes the shape of a command's statement. Returns false if the statement must be run as it
// stands: for names that are more than names, and for values whose literals do not always store
// what binding stores.
bool WriteInsertShape(const InsertCommand& command, std::string& shape);

// Binds the values of a command to a statement that was prepared from its shape. They are not
// copied. Returns SQLite's code.
int BindInsert(sqlite3_stmt* statement, const InsertCommand& command);

}  // namespace OrvaDRCore

#endif
