#include "sqlite/sqlite_batch.h"

#include <algorithm>
#include <map>

#include "sqlite/sqlite_internals.h"
#include "sqlite/sqlite_statement.h"

namespace OrvaDRCore {

namespace {

bool HaveSameFields(const SqliteValueList& one, const SqliteValueList& other)
{
    const auto& left = one.GetValues();
    const auto& right = other.GetValues();
    return std::equal(left.begin(), left.end(), right.begin(), right.end(),
                      [](const auto& a, const auto& b) { return a.first == b.first; });
}

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

// Bytes are not copied: the record outlives the run of the statement.
int BindBytes(sqlite3_stmt* statement, int place, const SqliteValue& value)
{
    const std::string_view bytes = BytesOf(SqliteInternals::Payload(value));
    if (SqliteInternals::KindOf(value) == SqliteInternals::Kind::Blob) {
        return sqlite3_bind_blob64(statement, place, bytes.data(), bytes.size(), SQLITE_STATIC);
    }
    return sqlite3_bind_text64(statement, place, bytes.data(), bytes.size(), SQLITE_STATIC,
                               SQLITE_UTF8);
}

// Returns SQLite's code.
int BindValue(sqlite3_stmt* statement, int place, const SqliteValue& value)
{
    const Json::Value& payload = SqliteInternals::Payload(value);
    switch (payload.type()) {
        case Json::stringValue: return BindBytes(statement, place, value);
        case Json::realValue: return sqlite3_bind_double(statement, place, payload.asDouble());
        case Json::nullValue: return sqlite3_bind_null(statement, place);
        default: return sqlite3_bind_int64(statement, place, payload.asInt64());
    }
}

// Returns SQLite's code, SQLITE_OK when the row is there.
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

}  // namespace

// A list refuses values that are not valid, but a caller who casts const away can put one there.
bool IsStorable(const SqliteValueList& record)
{
    const auto& values = record.GetValues();
    return !values.empty() && std::all_of(values.begin(), values.end(),
                                          [](const auto& field) { return field.second.IsValid(); });
}

bool InsertRows(sqlite3* handle, const std::string& table,
                const std::vector<SqliteValueList>& records, bool replacable, SqliteError& error)
{
    std::map<const SqliteValueList*, Statement, ByFields> statements;
    Statement* insert = nullptr;
    const SqliteValueList* last = nullptr;
    for (const SqliteValueList& record : records) {
        if (last == nullptr || !HaveSameFields(*last, record)) insert = &statements[&record];
        last = &record;
        int code = SQLITE_OK;
        if (*insert == nullptr) {
            code = PrepareStatement(handle, InsertStatement(table, record, replacable), *insert);
        }
        if (code == SQLITE_OK) code = InsertRow(insert->get(), record);
        if (code != SQLITE_OK) {
            error.SetFailure(InsertStatement(table, record, replacable), code,
                             sqlite3_errmsg(handle));
            return false;
        }
    }
    return true;
}

}  // namespace OrvaDRCore
