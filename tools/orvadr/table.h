// A table for people.
#ifndef ORVADR_TABLE_H
#define ORVADR_TABLE_H

#include <cstddef>
#include <functional>
#include <string>
#include <vector>

#include <json/value.h>

namespace Orvadr {

struct Column {
    const char* title;
    // The cell for an object: printable text, in which a newline begins another line of the cell.
    std::function<std::string(const Json::Value&)> cell;
};

// A column with the text or number of a key; with `ifNull` where that is null.
Column TextColumn(const char* title, const char* key, const char* ifNull = "");

// A column with a line for each element of the array under a key.
Column LinesColumn(const char* title, const char* key, std::string (*line)(const Json::Value&));

// What the output can do.
struct Screen {
    std::size_t columns = 0;  // 0: lines may be of any length
    bool hasColour = false;
};

// A row for each object, below a row of titles; nothing if there is no object. Columns that have nothing
// to show are left out. Where the screen is narrower than the table, the widest columns are wrapped. A
// cell whose column is called STATE is coloured.
std::string FormatTable(const std::vector<Column>& columns, const Json::Value& objects,
                        const Screen& screen);

}  // namespace Orvadr

#endif
