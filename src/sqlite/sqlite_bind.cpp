#include "sqlite/sqlite_bind.h"

#include <string_view>

#include "sqlite/sqlite_internals.h"

namespace OrvaDRCore {

int BindValue(sqlite3_stmt* statement, int place, const SqliteValue& value)
{
    using Kind = SqliteInternals::Kind;
    const Json::Value& payload = SqliteInternals::Payload(value);
    switch (SqliteInternals::KindOf(value)) {
        case Kind::Boolean:
        case Kind::Integer: return sqlite3_bind_int64(statement, place, payload.asInt64());
        case Kind::Real: return sqlite3_bind_double(statement, place, payload.asDouble());
        case Kind::PlainText:
        case Kind::Text: {
            const std::string_view text = BytesOf(payload);
            return sqlite3_bind_text64(statement, place, text.data(), text.size(), SQLITE_STATIC,
                                       SQLITE_UTF8);
        }
        case Kind::Blob: {
            const std::string_view bytes = BytesOf(payload);
            return sqlite3_bind_blob64(statement, place, bytes.data(), bytes.size(), SQLITE_STATIC);
        }
        default: return sqlite3_bind_null(statement, place);
    }
}

}  // namespace OrvaDRCore
