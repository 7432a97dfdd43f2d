#include "sqlite/sqlite_table_lookup.h"

#include "sqlite/sqlite_shortcuts.h"

namespace OrvaDRCore {

namespace {

// Its first row comes without reading a table: what it costs does not depend on their number. Its
// second part makes SQLite check the schema.
constexpr const char* CheckText = "SELECT 1 UNION ALL SELECT 1 FROM sqlite_master";

// All names together take less than 20 KB. When there are more, all are forgotten.
constexpr std::size_t MaxTables = 128;
constexpr std::size_t MaxNameLength = 64;

// Whether the query asks for this very name: no quote ends it, and no zero byte ends the query.
bool IsWholeName(const std::string& table)
{
    return table.size() <= MaxNameLength && table.find('\'') == std::string::npos &&
           table.find('\0') == std::string::npos;
}

}  // namespace

std::string TableLookup::Query(const std::string& table)
{
    return "SELECT 1 FROM sqlite_master WHERE type='table' AND name='" + table + "';";
}

bool TableLookup::CanCheck(sqlite3* handle, const StatementWatch& watch, const std::string& table)
{
    return ShortcutsInUse().lookups && !watch.IsSchemaUnguarded() && IsWholeName(table) &&
           HasNothingAttached(handle);
}

int TableLookup::Check(sqlite3* handle)
{
    GiveBack();
    if (check_ == nullptr) {
        const int code = PrepareStatement(handle, CheckText, check_);
        if (code != SQLITE_OK) return code;
    }
    isChecking_ = true;
    const int code = sqlite3_step(check_.get());
    if (code != SQLITE_ROW) return code;
    constexpr int SetBack = 1;
    if (sqlite3_stmt_status(check_.get(), SQLITE_STMTSTATUS_REPREPARE, SetBack) != 0) {
        tables_.clear();
    }
    return code;
}

void TableLookup::GiveBack()
{
    if (isChecking_) sqlite3_reset(check_.get());
    isChecking_ = false;
}

void TableLookup::Remember(const std::string& table)
{
    if (tables_.size() == MaxTables) tables_.clear();
    tables_.insert(table);
}

void TableLookup::Clear()
{
    isChecking_ = false;
    check_.reset();
    tables_.clear();
}

}  // namespace OrvaDRCore
