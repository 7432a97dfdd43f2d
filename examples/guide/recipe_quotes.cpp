// Texts with quotes and wildcards, in values, conditions and LIKE.
#include <cstdlib>
#include <iostream>
#include <string>
#include <vector>

#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_db.h>

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteBeginsWith;
using OrvaDRCore::SqliteCondition;
using OrvaDRCore::SqliteContains;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteIn;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;

namespace {

bool Print(SqliteDB& db, const SqliteTableHandler& table, const SqliteCondition& condition)
{
    SelectCommand select;
    select.SetTable(table);
    select.AddField("name");
    std::vector<SqliteValueList> rows;
    if (!select.SetCondition(condition) || !db.SelectRecords(select, rows)) return false;
    std::cout << condition.GetCondition() << " -> " << rows.size() << '\n';
    return true;
}

}  // namespace

int main()
{
    SqliteDB db("recipe_quotes.db", 3);
    const SqliteTableHandler nodes("nodes", "name TEXT PRIMARY KEY");
    for (const std::string name : {"O'Brien's NAS", "'; DROP TABLE nodes; --", "50%_a", "50-b"}) {
        InsertCommand insert;
        insert.SetTable(nodes);
        SqliteValueList node;
        node.AddValue("name", SqliteValue::Text(name));
        insert.SetFieldValues(node);
        if (!db.InsertRecord(insert)) return EXIT_FAILURE;
    }

    // [conditions]
    const std::vector<std::string> wanted = {"O'Brien's NAS", "'; DROP TABLE nodes; --"};
    const SqliteEqual first("name", SqliteValue::Text(wanted.front()));
    std::vector<SqliteValue> values;
    values.reserve(wanted.size());
    for (const std::string& name : wanted) values.push_back(SqliteValue::Text(name));
    const SqliteIn both("name", values);
    // [/conditions]

    // [like]
    const SqliteBeginsWith begins("name", "50%");
    const SqliteContains contains("name", "'");
    // [/like]
    const bool isPrinted = Print(db, nodes, first) && Print(db, nodes, both) &&
                           Print(db, nodes, begins) && Print(db, nodes, contains);
    return isPrinted ? EXIT_SUCCESS : EXIT_FAILURE;
}
