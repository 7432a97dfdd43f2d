// The databases that scripts begin with.
#ifndef ORVADRCORE_TESTS_SHAPES_SCHEMAS_H
#define ORVADRCORE_TESTS_SHAPES_SCHEMAS_H

#include <string>
#include <vector>

namespace Shapes {

struct Table {
    std::string name;                  // as statements write it
    std::string columns;               // between the parentheses of CREATE TABLE
    std::vector<std::string> names{};  // of the columns that statements use
};

struct Schema {
    const char* name;
    std::vector<std::string> setup;  // run on an empty file
    std::vector<Table> tables;       // what operations use; the first one most
};

const std::vector<Schema>& Schemas();

}  // namespace Shapes

#endif
