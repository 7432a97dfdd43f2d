// The databases that scripts begin with.
#ifndef ORVADRCORE_TESTS_SHAPES_SCHEMAS_H
#define ORVADRCORE_TESTS_SHAPES_SCHEMAS_H

#include <string>
#include <vector>

#include "random.h"

namespace Shapes {

struct Table {
    std::string name;                  // as statements write it
    std::string columns;               // between the parentheses of CREATE TABLE
    std::vector<std::string> names{};  // of the columns that statements use
};

struct Schema {
    std::string name;
    std::vector<std::string> setup;         // run on an empty file
    std::vector<Table> tables;              // what operations use; the first one most
    std::vector<std::string> session{};     // what its connections often run
    std::vector<std::string> neighbour{};   // what others often run
    std::vector<std::string> conditions{};  // what its statements often use: see CommonCondition()
    const char* file = "main.db";           // as its connections write it
};

// One of the databases in schemas.cpp, or one with random partial indexes.
Schema AnySchema(Random& random);
Schema AnyPartialIndexes(Random& random);

}  // namespace Shapes

#endif
