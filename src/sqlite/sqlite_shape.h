// Statements without their literals, so that one prepared statement serves many texts.
#ifndef ORVADRCORE_SRC_SQLITE_SQLITE_SHAPE_H
#define ORVADRCORE_SRC_SQLITE_SQLITE_SHAPE_H

#include <sqlite3.h>

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

namespace OrvaDRCore {

// "UPDATE jobs SET state='new' WHERE id=7" has the shape "UPDATE jobs SET state=? WHERE id=?" and
// the literals 'new' and 7.
struct Shape {
    using Literal = std::variant<std::int64_t, std::string_view>;

    std::string text;
    std::vector<Literal> literals;  // those that became parameters; texts point into the statement
    bool isSelect = false;
};

// The largest statement that is run by its shape. Far below all limits of SQLite, which count the
// literals in a text but not bound values.
inline constexpr std::size_t MaxParameters = 256;
inline constexpr std::size_t MaxTextBytes = 65'536;  // of a statement, and of each bound text

// Reads a statement as the builders and conditions of this library write it:
//
//     INSERT [OR REPLACE] INTO name (names) VALUES (literals)[;]
//     UPDATE name SET name=literal,... WHERE condition[;]
//     DELETE FROM name [WHERE condition][;]
//     SELECT names|* FROM name [WHERE condition][;]
//
// Literals are integers of up to 18 digits and texts without quotes; NULL stays in the text. A
// condition is made of up to 16 terms `name op literal`, `name [NOT] IN (literal)` and
// `name IS [NOT] NULL` with AND, OR and parentheses.
//
// Returns false for every other statement, for one without a literal to replace, and where SQLite
// might run the shape in another way than the statement; the comments in the source say when. Such
// a statement is to be run as it stands. `shape` is undefined then.
bool ReadShape(const std::string& statement, Shape& shape);

// Whether a name is made of letters, digits and underscores and begins with no digit.
bool IsPlainName(std::string_view name);

// Whether a table may be used by its shape: not one that belongs to SQLite itself.
bool IsPlainTable(std::string_view name);

// Binds the literals to a statement that was prepared from the shape's text. `copy` is SQLITE_STATIC
// if the statement's text outlives the run, or SQLITE_TRANSIENT. Returns SQLite's code.
int BindLiterals(sqlite3_stmt* statement, const Shape& shape, sqlite3_destructor_type copy);

}  // namespace OrvaDRCore

#endif
