#include "sqlite/sqlite_statement.h"

#include <algorithm>
#include <cstring>
#include <limits>
#include <utility>

#include "sqlite/sqlite_internals.h"

namespace OrvaDRCore {

namespace {

// The table lookup and the selects that a program has in its loops.
constexpr std::size_t MaxCached = 8;

// A list of thousands of values is not likely to come twice, and its statement is large.
constexpr std::size_t MaxCachedLength = 1024;

// Whether the connection has main and temp alone. Before SQLite 3.39 there is no way to ask.
bool HasNothingAttached([[maybe_unused]] sqlite3* handle)
{
#if SQLITE_VERSION_NUMBER >= 3039000
    return handle != nullptr && sqlite3_db_name(handle, 2) == nullptr;
#else
    return false;
#endif
}

// A PRAGMA may do its work when it is prepared: selects alone can run again as they are.
bool IsWorthCaching(const std::string& command, sqlite3_stmt* statement)
{
    return command.size() <= MaxCachedLength && command.compare(0, 7, "SELECT ") == 0 &&
           sqlite3_stmt_readonly(statement) != 0 &&
           HasNothingAttached(sqlite3_db_handle(statement));
}

// Texts are not copied: the record outlives the statement's run. Answers SQLite's code.
int BindValue(sqlite3_stmt* statement, int place, const SqliteValue& value)
{
    const Json::Value& payload = SqliteInternals::Payload(value);
    if (payload.isString()) {
        const char* begin = nullptr;
        const char* end = nullptr;
        payload.getString(&begin, &end);
        return sqlite3_bind_text64(statement, place, begin,
                                   static_cast<sqlite3_uint64>(end - begin), SQLITE_STATIC,
                                   SQLITE_UTF8);
    }
    return sqlite3_bind_int64(statement, place, payload.asInt64());
}

}  // namespace

// SQLite counts the bytes of a literal in an int and crashes when that overflows.
bool IsTooLong(const std::string& command)
{
    constexpr std::size_t Limit = std::numeric_limits<int>::max();
    return command.size() >= Limit && ::strnlen(command.c_str(), Limit) == Limit;
}

int PrepareStatement(sqlite3* handle, const std::string& command, Statement& statement)
{
    // A length that is beyond SQLite's own limit is refused before the text is read.
    const int length = IsTooLong(command) ? std::numeric_limits<int>::max() : -1;
    sqlite3_stmt* made = nullptr;
    const int code = sqlite3_prepare_v2(handle, command.c_str(), length, &made, nullptr);
    statement.reset(made);
    return code;
}

std::string InsertStatement(const std::string& table, const SqliteValueList& record,
                            bool replacable)
{
    std::string fields;
    std::string places;
    for (const auto& [field, value] : record.GetValues()) {
        const char* separator = fields.empty() ? "" : ",";
        fields.append(separator).append(field);
        places.append(separator).append("?");
    }
    const char* verb = replacable ? "INSERT OR REPLACE INTO " : "INSERT INTO ";
    return verb + table + " (" + fields + ") VALUES (" + places + ");";
}

int InsertRow(sqlite3_stmt* statement, const SqliteValueList& record)
{
    int place = 0;
    for (const auto& [field, value] : record.GetValues()) {
        const int code = BindValue(statement, ++place, value);
        if (code != SQLITE_OK) return code;
    }
    const int code = sqlite3_step(statement);
    sqlite3_reset(statement);
    return code == SQLITE_DONE ? SQLITE_OK : code;
}

int EndBeforeLastRow(sqlite3_stmt* statement)
{
    return sqlite3_stmt_readonly(statement) != 0 ? SQLITE_OK : sqlite3_reset(statement);
}

int StatementCache::Take(sqlite3* handle, const std::string& command, Statement& statement)
{
    if (!HasNothingAttached(handle)) selects.clear();
    const auto cached = std::find_if(selects.begin(), selects.end(), [&](const Select& select) {
        return select.command == command;
    });
    if (cached == selects.end()) return PrepareStatement(handle, command, statement);
    std::rotate(cached, cached + 1, selects.end());
    statement = std::move(selects.back().statement);
    if (statement == nullptr) return PrepareStatement(handle, command, statement);
    return SQLITE_OK;
}

void StatementCache::Keep(const std::string& command, Statement statement)
{
    if (!IsWorthCaching(command, statement.get())) return;
    sqlite3_reset(statement.get());
    if (selects.empty() || selects.back().command != command) {
        if (selects.size() == MaxCached) selects.erase(selects.begin());
        selects.push_back({command, nullptr});
    }
    selects.back().statement = std::move(statement);
}

}  // namespace OrvaDRCore
