// Inserts many records with few statements: one per set of fields.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_BATCH_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_BATCH_H

#include <sqlite3.h>

#include <string>
#include <vector>

#include <orvadrcore/sqlite_value.h>

#include "sqlite/sqlite_error.h"

namespace OrvaDRCore {

// Whether a record has a field and all of its values are valid.
bool IsStorable(const SqliteValueList& record);

// Inserts the records in their order and stores what their literals would store, except that plain
// texts are stored byte for byte. Stops at the first record that fails, whose error is set.
bool InsertRows(sqlite3* handle, const std::string& table,
                const std::vector<SqliteValueList>& records, bool replacable, SqliteError& error);

}  // namespace OrvaDRCore

#endif
