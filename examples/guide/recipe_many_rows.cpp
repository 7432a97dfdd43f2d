// Many rows at once: one statement for each few hundred of them.
#include <algorithm>
#include <cstddef>
#include <cstdlib>
#include <iostream>
#include <string>
#include <vector>

#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_db.h>
#include <orvadrcore/utils.h>

using OrvaDRCore::Container;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;

namespace {

// [insert_all]
constexpr std::size_t RowsPerStatement = 500;

std::vector<std::string> FieldsOf(const SqliteValueList& record)
{
    std::vector<std::string> fields;
    for (const auto& [field, value] : record.GetValues()) fields.push_back(field);
    return fields;
}

std::string LiteralsOf(const SqliteValueList& record)
{
    std::vector<std::string> literals;
    for (const auto& [field, value] : record.GetValues())
        literals.push_back(value.ToFormatedValue());
    return "(" + Container::ToString(literals, ",") + ")";
}

// Inserts records that all have the same fields. On failure the statements before the failing one
// have happened, and of its rows none.
bool InsertAll(SqliteDB& db, const SqliteTableHandler& table,
               const std::vector<SqliteValueList>& records)
{
    if (records.empty()) return true;
    const std::vector<std::string> fields = FieldsOf(records.front());
    const bool areAlike = std::all_of(records.begin(), records.end(), [&](const auto& record) {
        return FieldsOf(record) == fields;
    });
    if (fields.empty() || !areAlike || !db.Open() || !db.CreateTable(table)) return false;

    const std::string head =
        "INSERT INTO " + table.GetName() + " (" + Container::ToString(fields, ",") + ") VALUES ";
    for (std::size_t begin = 0; begin < records.size(); begin += RowsPerStatement) {
        const std::size_t end = std::min(begin + RowsPerStatement, records.size());
        std::vector<std::string> rows;
        for (std::size_t row = begin; row < end; ++row) rows.push_back(LiteralsOf(records[row]));
        if (!db.Exec(head + Container::ToString(rows, ","))) return false;
    }
    return true;
}
// [/insert_all]

bool PrintCount(SqliteDB& db)
{
    SqliteValueList row;
    if (!db.SelectByCommand("SELECT count(*) AS nodes, max(port) AS port FROM nodes", row))
        return false;
    std::cout << row.ToStr() << '\n';
    return true;
}

}  // namespace

int main()
{
    SqliteDB db("recipe_many_rows.db", 0);
    const SqliteTableHandler nodes("nodes", "name TEXT PRIMARY KEY, port INTEGER");
    std::vector<SqliteValueList> records;
    for (int number = 1; number <= 1200; ++number) {
        SqliteValueList record;
        record.AddValue("name", SqliteValue::EscapeText("node '" + std::to_string(number) + "'"));
        record.AddValue("port", number);
        records.push_back(record);
    }
    if (!InsertAll(db, nodes, records) || !PrintCount(db)) return EXIT_FAILURE;

    // One row of these is there already: none of them comes in.
    for (SqliteValueList& record : records) record.AddValue("port", 5001);
    records.resize(2);
    records.front().AddValue("name", "new");
    if (InsertAll(db, nodes, records) || !PrintCount(db)) return EXIT_FAILURE;
    return EXIT_SUCCESS;
}
