// Prepared statements: their owner, what they are filled with, and the few that a connection keeps.
#ifndef ORVADRCORE_SRC_SQLITE_STATEMENT_H
#define ORVADRCORE_SRC_SQLITE_STATEMENT_H

#include <sqlite3.h>

#include <map>
#include <memory>
#include <string>
#include <vector>

#include <orvadrcore/sqlite_value.h>

namespace OrvaDRCore {

struct FinalizeStatement {
    void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};
using Statement = std::unique_ptr<sqlite3_stmt, FinalizeStatement>;

// Fills `statement`, with null for a text that holds no statement. Answers SQLite's code.
int PrepareStatement(sqlite3* handle, const std::string& command, Statement& statement);

// The INSERT of records with these fields, with placeholders for the values.
std::string InsertStatement(const std::string& table, const SqliteValueList& record,
                            bool replacable);

// Inserts a record by its statement, and stores what its literals would. Answers SQLite's code,
// SQLITE_OK when the row is there.
int InsertRow(sqlite3_stmt* statement, const SqliteValueList& record);

// The selects that a connection ran last. They are reset, and thus hold no lock; SQLite prepares
// them again by itself when the tables have changed. All go before the connection does.
class KeptSelects {
  public:
    // Fills `statement` with a kept one, whose place stays empty until it is back, or with a new
    // one. Answers SQLite's code.
    int Take(sqlite3* handle, const std::string& command, Statement& statement);

    // Keeps the statement that was taken last for the next time, if it only reads and is not of
    // unusual length.
    void Keep(const std::string& command, Statement statement);

  private:
    struct Select {
        std::string command;
        Statement statement;
    };
    std::vector<Select> selects;  // the one used last comes last
};

}  // namespace OrvaDRCore

#endif
