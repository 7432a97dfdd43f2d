#include "sqlite/sqlite_statement.h"

#include <cstring>
#include <limits>

namespace OrvaDRCore {

// SQLite counts the bytes of a literal in an int and crashes when that overflows.
bool IsTooLong(const std::string& command)
{
    constexpr std::size_t Limit = std::numeric_limits<int>::max();
    return command.size() >= Limit && ::strnlen(command.c_str(), Limit) == Limit;
}

int PrepareStatement(sqlite3* handle, const std::string& command, Statement& statement)
{
    // SQLite refuses a length beyond its own limit before it reads the text.
    const int length = IsTooLong(command) ? std::numeric_limits<int>::max() : -1;
    sqlite3_stmt* made = nullptr;
    const int code = sqlite3_prepare_v2(handle, command.c_str(), length, &made, nullptr);
    statement.reset(made);
    return code;
}

int EndBeforeLastRow(sqlite3_stmt* statement)
{
    return sqlite3_stmt_readonly(statement) != 0 ? SQLITE_OK : sqlite3_reset(statement);
}

bool HasNothingAttached([[maybe_unused]] sqlite3* handle)
{
#if SQLITE_VERSION_NUMBER >= 3039000
    return handle != nullptr && sqlite3_db_name(handle, 2) == nullptr;
#else
    return false;
#endif
}

}  // namespace OrvaDRCore
