// Values as parameters of a statement.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_BIND_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_BIND_H

#include <sqlite3.h>

#include <orvadrcore/sqlite_value.h>

namespace OrvaDRCore {

// Binds a value so that what its literal stores is stored, except that a plain text is stored byte
// for byte. Bytes are not copied: the value must outlive the run of the statement. The first place
// is 1. Returns SQLite's code.
int BindValue(sqlite3_stmt* statement, int place, const SqliteValue& value);

}  // namespace OrvaDRCore

#endif
