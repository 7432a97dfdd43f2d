// Finds out whether a table exists, without reading the schema table each time.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_TABLE_LOOKUP_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_TABLE_LOOKUP_H

#include <sqlite3.h>

#include <cstdint>
#include <string>
#include <unordered_set>

#include "sqlite/sqlite_statement.h"
#include "sqlite/sqlite_watch.h"

namespace OrvaDRCore {

// The names of the tables for which the query has answered yes, and a check whether these answers
// still hold.
//
// The check is a cached statement. Its first step takes the shared lock and compares the schema's
// number in the file with the one that it was prepared for. When the schema has changed, through this
// connection or another one, or a change of it was rolled back, SQLite prepares the statement again.
// SQLite counts that, and then all names are forgotten. A no is never remembered, because the
// table may be created next.
class TableLookup {
  public:
    // The query, whose answer counts. The name is written into it as it is.
    static std::string Query(const std::string& table);

    // Whether the check may be used for this table. False if the answer may depend on more than
    // the schema of main, or if that may change unnoticed.
    static bool CanCheck(sqlite3* handle, const StatementWatch& watch, const std::string& table);

    // Checks the schema. Afterwards the shared lock is held. Returns SQLite's code, SQLITE_ROW for
    // a success. A failed check must be given back, too, after its message was read.
    int Check(sqlite3* handle);

    // Within a transaction a check holds until a statement may have changed the schema: the lock that
    // it took stays.
    struct Moment {
        std::uint64_t transaction;
        std::uint64_t schemaStatements;
    };
    void NoteCheckAt(const Moment& now) { checked_ = now; }
    bool WasCheckedAt(const Moment& now) const
    {
        return checked_.transaction == now.transaction &&
               checked_.schemaStatements == now.schemaStatements;
    }

    // Whether a check holds the lock.
    bool IsChecking() const { return isChecking_; }

    // Ends the check, which gives back the lock outside of a transaction.
    void GiveBack();

    bool IsKnown(const std::string& table) const { return tables_.count(table) != 0; }

    // To be called for a yes of the query that ran right after a check.
    void Remember(const std::string& table);

    // To be called before the connection is closed.
    void Clear();

  private:
    Statement check_;
    bool isChecking_ = false;  // the statement runs
    Moment checked_{};
    std::unordered_set<std::string> tables_;
};

}  // namespace OrvaDRCore

#endif
