// Looks at an SQLite database without changing anything on disk.
#ifndef ORVADR_DATABASE_H
#define ORVADR_DATABASE_H

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace Orvadr {

enum class DatabaseState { Ok, Damaged, Locked, Missing, Unreadable };

struct TableLook {
    std::string name;
    std::optional<std::int64_t> rows;  // none if they could not be counted
};

struct DatabaseLook {
    DatabaseState state = DatabaseState::Unreadable;
    std::string reason;       // why it is unreadable
    std::string journalMode;  // "wal" or "delete"; empty if unknown
    std::optional<std::int64_t> size;
    std::vector<TableLook> tables;
    std::vector<std::string> problems;  // what PRAGMA integrity_check found
};

// Called now and then during the check, with the percentage of the file that was read, from 0 to 99.
using Progress = std::function<void(int)>;

// Checks a whole database, and counts the rows of its tables. A writer that needs the file exclusively
// waits meanwhile, except where the database has a write-ahead log. Waits a second for a lock.
DatabaseLook LookAtDatabase(const std::string& path, const Progress& progress);

}  // namespace Orvadr

#endif
