#include "sqlite/sqlite_batch.h"

#include <algorithm>
#include <map>
#include <string_view>

#include "sqlite/sqlite_bind.h"
#include "sqlite/sqlite_insert.h"
#include "sqlite/sqlite_internals.h"
#include "sqlite/sqlite_statement.h"

namespace OrvaDRCore {

namespace {

// Orders records by their field names, so that a map has one entry per set of fields.
struct ByFields {
    bool operator()(const SqliteValueList* one, const SqliteValueList* other) const
    {
        const auto& left = one->GetValues();
        const auto& right = other->GetValues();
        return std::lexicographical_compare(
            left.begin(), left.end(), right.begin(), right.end(),
            [](const auto& a, const auto& b) { return a.first < b.first; });
    }
};

// The INSERT for records with these fields, with placeholders for the values.
std::string InsertStatement(const std::string& table, const SqliteValueList& record,
                            bool replacable)
{
    std::string text;
    AppendInsertShape(text, table, record, replacable);
    return text + ';';
}

// Inserts records that have the same fields.
struct Insert {
    Statement statement;
    std::vector<std::string_view> fields;  // in the first of these records
};

int PrepareInsert(sqlite3* handle, const std::string& text, const SqliteValueList& record,
                  Insert& insert)
{
    for (const auto& [field, value] : record.GetValues()) insert.fields.push_back(field);
    return PrepareStatement(handle, text, insert.statement);
}

// Binds a record's values. Returns false if the record has other fields; otherwise `code` is
// SQLite's.
bool BindRecord(const Insert& insert, const SqliteValueList& record, int& code)
{
    const auto& values = record.GetValues();
    if (values.size() != insert.fields.size()) return false;
    auto expected = insert.fields.begin();
    int place = 0;
    for (const auto& [field, value] : values) {
        if (field != *expected++) return false;
        code = BindValue(insert.statement.get(), ++place, value);
        if (code != SQLITE_OK) return true;
    }
    return true;
}

// Returns SQLite's code, SQLITE_OK when the row is there.
int InsertRow(const Insert& insert)
{
    const int code = sqlite3_step(insert.statement.get());
    sqlite3_reset(insert.statement.get());
    return code == SQLITE_DONE ? SQLITE_OK : code;
}

}  // namespace

// A list refuses values that are not valid, but a caller who casts const away can put one there.
bool IsStorable(const SqliteValueList& record)
{
    const auto& values = record.GetValues();
    return !values.empty() && std::all_of(values.begin(), values.end(), [](const auto& field) {
        return SqliteInternals::IsValid(field.second);
    });
}

bool InsertRows(sqlite3* handle, const std::string& table,
                const std::vector<SqliteValueList>& records, bool replacable, SqliteError& error)
{
    std::map<const SqliteValueList*, Insert, ByFields> inserts;
    Insert* insert = nullptr;
    for (const SqliteValueList& record : records) {
        int code = SQLITE_OK;
        if (insert == nullptr || !BindRecord(*insert, record, code)) {
            insert = &inserts[&record];
            if (insert->statement == nullptr) {
                code = PrepareInsert(handle, InsertStatement(table, record, replacable), record,
                                     *insert);
            }
            if (code == SQLITE_OK) BindRecord(*insert, record, code);
        }
        if (code == SQLITE_OK) code = InsertRow(*insert);
        if (code != SQLITE_OK) {
            error.SetFailure(InsertStatement(table, record, replacable), code,
                             sqlite3_errmsg(handle));
            return false;
        }
    }
    return true;
}

}  // namespace OrvaDRCore
