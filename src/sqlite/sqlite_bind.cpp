#include "sqlite/sqlite_bind.h"

#include <string>

#include "sqlite/sqlite_internals.h"

namespace OrvaDRCore {

int BindValue(sqlite3_stmt* statement, int place, const SqliteValue& value)
{
    using Internals = SqliteInternals;
    using Kind = Internals::Kind;
    switch (Internals::KindOf(value)) {
        case Kind::Boolean:
        case Kind::Integer:
            return sqlite3_bind_int64(statement, place, Internals::IntegerOf(value));
        case Kind::Real: return sqlite3_bind_double(statement, place, Internals::RealOf(value));
        case Kind::PlainText:
        case Kind::Text: {
            const std::string& text = Internals::BytesOf(value);
            return sqlite3_bind_text64(statement, place, text.data(), text.size(), SQLITE_STATIC,
                                       SQLITE_UTF8);
        }
        case Kind::Blob: {
            const std::string& bytes = Internals::BytesOf(value);
            return sqlite3_bind_blob64(statement, place, bytes.data(), bytes.size(), SQLITE_STATIC);
        }
        default: return sqlite3_bind_null(statement, place);
    }
}

}  // namespace OrvaDRCore
