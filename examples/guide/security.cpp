// An SQL injection, with a plain text and with a Text, and column names that are checked.
#include <algorithm>
#include <cstdlib>
#include <iostream>
#include <string>
#include <vector>

#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_value.h>

using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValue;

namespace {

// [names]
// Names are not quoted, unlike values. So a caller may only pick one of ours.
bool IsColumn(const std::string& name)
{
    const std::vector<std::string> columns = {"id", "name", "port"};
    return std::find(columns.begin(), columns.end(), name) != columns.end();
}
// [/names]

std::string Select(const SqliteEqual& condition)
{
    SelectCommand select;
    select.SetTable(SqliteTableHandler("nodes", ""));
    select.SelectAll();
    select.SetCondition(condition);
    return select.GetCommand();
}

}  // namespace

int main()
{
    // [quoting]
    const std::string given = "x' OR '1'='1";  // sent by a caller
    const SqliteEqual wrong("name", given);
    const SqliteEqual right("name", SqliteValue::Text(given));
    // [/quoting]
    std::cout << "wrong: " << Select(wrong) << '\n';
    std::cout << "right: " << Select(right) << '\n';

    for (const char* name : {"port", "port FROM nodes; --"}) {
        std::cout << name << (IsColumn(name) ? ": a column\n" : ": refused\n");
    }
    return EXIT_SUCCESS;
}
