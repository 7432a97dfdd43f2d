// The operations that scripts consist of.
#ifndef ORVADRCORE_TESTS_SHAPES_OPERATIONS_H
#define ORVADRCORE_TESTS_SHAPES_OPERATIONS_H

#include <vector>

#include "draw.h"
#include "side.h"

namespace Shapes {

// What the statements of a script are drawn from.
struct Pool {
    const Schema& schema;
    std::size_t tameness;
    std::vector<std::uint64_t> shapes;  // those that come again, as seeds
};

// Any of those below, or the same while others are at work.
Operation AnyOperation(Random& random, const Pool& pool);

// Of records and commands.
Operation AnyRecordOperation(Draw& draw);

// Of statements as texts.
Operation AnyTextOperation(Draw& draw);

// A statement with one of the conditions in partial_indexes.cpp, on its tables. The order of the rows can
// be noticed.
Operation AnyOrderedOperation(Draw& draw);

// Opening, closing, transactions, PRAGMAs, other databases, tables.
Operation AnySessionOperation(Draw& draw);

// What a second connection does: changes of rows and of the schema.
std::string AnyNeighbourStatement(Draw& draw);

// A select that gives rows to a function, which does something itself. The function that starts it
// is given that function.
using TakeRow = std::function<bool(const OrvaDRCore::SqliteRow&)>;
using StartSelect = std::function<bool(Side&, const TakeRow&)>;
Operation SelectWithCallback(Draw& draw, const std::string& text, const StartSelect& start);

// Which of the connections an operation uses.
inline std::size_t AnyConnection(Draw& draw)
{
    return draw.value.OneIn(6) ? 1 : 0;
}

inline std::string NameOf(std::size_t connection)
{
    return "db" + std::to_string(connection) + ".";
}

}  // namespace Shapes

#endif
