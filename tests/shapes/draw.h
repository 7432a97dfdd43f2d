// What random operations are made from.
//
// A library that caches statements by their shape is tested only if shapes come again with other
// values. So an operation is drawn from two sources of random numbers: one for its shape, which is
// one of a few in a script, and one for the values in it.
#ifndef ORVADRCORE_TESTS_SHAPES_DRAW_H
#define ORVADRCORE_TESTS_SHAPES_DRAW_H

#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_value.h>

#include <string>

#include "random.h"
#include "schemas.h"

namespace Shapes {

struct Draw {
    Random shape;
    Random value;
    const Schema& schema;
    std::size_t tameness = 1;
    int depth = 0;  // of operations that run inside of others

    // Whether the shape has something that programs seldom write, once in so many. In tame scripts
    // most statements are those that the library runs by their shape.
    bool IsOdd(std::size_t often) { return shape.OneIn(often * tameness); }
};

// ------------------------------------------------------------------------------------------ values

std::string AnyText(Random& random);
OrvaDRCore::SqliteValue AnyValue(Draw& draw);

// SQL for a value. Some of these are not valid.
std::string AnyLiteral(Draw& draw);

// A statement with a few characters changed, or none.
std::string MaybeMutated(Draw& draw, std::string statement);

// -------------------------------------------------------------------------------------- conditions

const Table& AnyTable(Draw& draw);

// A column of the table, or an expression.
std::string AnyColumn(Draw& draw, const Table& table);

// A text after WHERE.
std::string AnyCondition(Draw& draw, const Table& table, int depth = 0);

// A condition with few numbers, like those of the partial indexes in partial_indexes.cpp.
std::string CommonCondition(Draw& draw, const std::string& column);

// The text with every "$c", "$v" and "$t" replaced by a column, a literal and the table.
std::string FillIn(Draw& draw, const Table& table, const std::string& text);

// ---------------------------------------------------------------------------------------- commands

OrvaDRCore::SqliteTableHandler AnyHandler(Draw& draw, const Table& table);
OrvaDRCore::SqliteValueList AnyRecord(Draw& draw, const Table& table);
OrvaDRCore::InsertCommand AnyInsert(Draw& draw, const Table& table);
OrvaDRCore::UpdateCommand AnyUpdate(Draw& draw, const Table& table);
OrvaDRCore::SelectCommand AnySelect(Draw& draw, const Table& table);
std::string AnyDelete(Draw& draw, const Table& table);

// A statement as a text.
std::string AnyWrite(Draw& draw);
std::string AnyQuery(Draw& draw);

}  // namespace Shapes

#endif
