#include "sqlite/sqlite_statement_cache.h"

#include <algorithm>
#include <numeric>
#include <utility>

namespace OrvaDRCore {

namespace {

// Room for the statements of a few tables in a program's loops.
constexpr std::size_t MaxCached = 20;
constexpr int MaxBytes = 36 * 1024;

// A list of thousands of values seldom comes twice, and its statement takes much memory.
constexpr std::size_t MaxSelectLength = 1024;

// Only selects: a PRAGMA may do its work while it is prepared.
bool IsShortSelect(std::string_view text, sqlite3_stmt* statement)
{
    return text.size() <= MaxSelectLength && text.compare(0, 7, "SELECT ") == 0 &&
           sqlite3_stmt_readonly(statement) != 0;
}

std::string_view TextOf(sqlite3_stmt* statement)
{
    const char* const text = sqlite3_sql(statement);
    return text != nullptr ? text : std::string_view();
}

}  // namespace

bool StatementCache::IsUsable(sqlite3* handle)
{
    if (HasNothingAttached(handle)) return true;
    cached_.clear();
    return false;
}

int StatementCache::Take(sqlite3* handle, const std::string& text, Cached& cached)
{
    cached_.reserve(MaxCached);
    if (IsUsable(handle)) {
        const std::size_t index = Find(text);
        if (index < cached_.size()) {
            cached = std::move(cached_[index]);
            cached_.erase(cached_.begin() + static_cast<std::ptrdiff_t>(index));
            return SQLITE_OK;
        }
    }
    cached.bytes = 0;
    return PrepareStatement(handle, text, cached.statement);
}

void StatementCache::KeepSelect(Cached&& cached)
{
    sqlite3_stmt* const statement = cached.statement.get();
    if (IsShortSelect(TextOf(statement), statement)) Keep(std::move(cached));
}

void StatementCache::Keep(Cached&& cached)
{
    sqlite3_stmt* const statement = cached.statement.get();
    if (!IsUsable(sqlite3_db_handle(statement))) return;
    sqlite3_reset(statement);
    sqlite3_clear_bindings(statement);
    cached.text = TextOf(statement);
    if (cached.bytes == 0) {
        cached.bytes = sqlite3_stmt_status(statement, SQLITE_STMTSTATUS_MEMUSED, 0);
        if (cached.bytes > MaxBytes / 2) return;
    }
    const std::size_t same = Find(cached.text);
    if (same < cached_.size()) cached_.erase(cached_.begin() + static_cast<std::ptrdiff_t>(same));
    const auto add = [](int sum, const Cached& other) { return sum + other.bytes; };
    while (cached_.size() == MaxCached ||
           std::accumulate(cached_.begin(), cached_.end(), cached.bytes, add) > MaxBytes) {
        cached_.erase(cached_.begin());
    }
    cached_.push_back(std::move(cached));
}

std::size_t StatementCache::Find(std::string_view text) const
{
    const auto found = std::find_if(cached_.rbegin(), cached_.rend(),
                                    [text](const Cached& cached) { return cached.text == text; });
    return found != cached_.rend() ? static_cast<std::size_t>(cached_.rend() - found) - 1
                                   : cached_.size();
}

}  // namespace OrvaDRCore
