#include "sqlite/sqlite_statement_cache.h"

#include <algorithm>
#include <utility>

namespace OrvaDRCore {

namespace {

// Room for the table lookup and the selects in a program's loops.
constexpr std::size_t MaxCached = 8;

// A list of thousands of values seldom comes twice, and its statement takes much memory.
constexpr std::size_t MaxCachedLength = 1024;

// Only selects: a PRAGMA may do its work while it is prepared.
bool IsWorthCaching(const std::string& command, sqlite3_stmt* statement)
{
    return command.size() <= MaxCachedLength && command.compare(0, 7, "SELECT ") == 0 &&
           sqlite3_stmt_readonly(statement) != 0 &&
           HasNothingAttached(sqlite3_db_handle(statement));
}

}  // namespace

int StatementCache::Take(sqlite3* handle, const std::string& command, Statement& statement)
{
    if (!HasNothingAttached(handle)) selects_.clear();
    if (MakeLast(command)) statement = std::move(selects_.back().statement);
    return statement != nullptr ? SQLITE_OK : PrepareStatement(handle, command, statement);
}

void StatementCache::Keep(const std::string& command, Statement statement)
{
    if (!IsWorthCaching(command, statement.get())) return;
    sqlite3_reset(statement.get());
    if (!MakeLast(command)) {
        if (selects_.size() == MaxCached) selects_.erase(selects_.begin());
        selects_.push_back({command, nullptr});
    }
    selects_.back().statement = std::move(statement);
}

bool StatementCache::MakeLast(const std::string& command)
{
    if (!selects_.empty() && selects_.back().command == command) return true;
    const auto cached = std::find_if(selects_.begin(), selects_.end(), [&](const Select& select) {
        return select.command == command;
    });
    if (cached == selects_.end()) return false;
    std::rotate(cached, cached + 1, selects_.end());
    return true;
}

}  // namespace OrvaDRCore
