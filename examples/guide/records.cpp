// Values, records, statements and conditions, printed as the text that the builders make.
#include <cstdlib>
#include <iostream>
#include <string>
#include <vector>

#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_value.h>

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteAnd;
using OrvaDRCore::SqliteContains;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteIn;
using OrvaDRCore::SqliteLess;
using OrvaDRCore::SqliteNotEqual;
using OrvaDRCore::SqliteOr;
using OrvaDRCore::SqliteOrder;
using OrvaDRCore::SqliteRecord;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;

namespace {

// [record_type]
struct Node : SqliteRecord {
    std::string name;
    int port = 0;
    bool enabled = true;

    std::vector<std::string> GetRecordFields() const override
    {
        return {"name", "port", "enabled"};
    }

    // To the database.
    SqliteValueList BuildRecord(const std::vector<std::string>& fields) const override
    {
        SqliteValueList all;
        all.AddValue("name", SqliteValue::Text(name));
        all.AddValue("port", port);
        all.AddValue("enabled", enabled);
        SqliteValueList record;
        for (const std::string& field : fields) record.AddValue(field, all.GetValue(field));
        return record;
    }

    // From the database: all fields or none.
    bool LoadRecord(const SqliteValueList& record) override
    {
        Node node;
        if (!record.GetValue("name", node.name) || !record.GetValue("port", node.port) ||
            !record.GetValue("enabled", node.enabled)) {
            return false;
        }
        *this = node;
        return true;
    }
};
// [/record_type]

void ShowValues()
{
    // [values]
    std::cout << SqliteValue(-3).ToFormatedValue() << '\n';
    std::cout << SqliteValue(4000000000U).ToFormatedValue() << '\n';
    std::cout << SqliteValue(true).ToFormatedValue() << '\n';
    std::cout << SqliteValue("backup").ToFormatedValue() << '\n';
    std::cout << SqliteValue("it's").ToFormatedValue() << "   <- no literal\n";
    std::cout << SqliteValue::Text("it's").ToFormatedValue() << '\n';
    std::cout << SqliteValue::Integer(5'000'000'000).ToFormatedValue() << '\n';
    std::cout << SqliteValue::Real(0.25).ToFormatedValue() << '\n';
    std::cout << SqliteValue::Blob("it's").ToFormatedValue() << '\n';
    std::cout << SqliteValue::Null().ToFormatedValue() << '\n';

    int number = 0;
    bool truth = false;
    std::cout << SqliteValue("12").GetValue(number);      // a text is not a number
    std::cout << SqliteValue(true).GetValue(number);      // true is not 1
    std::cout << SqliteValue(1).GetValue(truth) << '\n';  // but 1 is a bool: columns have no other
    // [/values]

    // [invalid]
    SqliteValue assigned;
    assigned = SqliteValue(1);
    SqliteValueList record;
    std::cout << assigned.IsValid() << record.AddValue("port", assigned) << '\n';
    std::cout << record.AddValue("port", SqliteValue(1)) << '\n';
    // [/invalid]
}

void ShowRecord()
{
    // [record]
    SqliteValueList record;
    record.AddValue("port", 5001);
    record.AddValue("name", "backup");
    record.AddValue("port", 5002);  // replaces
    std::cout << record.ToStr() << '\n';

    int port = 0;
    std::string note = "none";
    if (record.GetValue("port", port)) std::cout << "port " << port << '\n';
    if (!record.GetValue("note", note)) std::cout << "note " << note << '\n';
    for (const auto& [field, value] : record.GetValues()) {
        std::cout << field << " is " << value.ToFormatedValue() << '\n';
    }
    // [/record]
}

void ShowStatements(const SqliteTableHandler& nodes)
{
    // [statements]
    Node node;
    node.name = "O'Brien's NAS";
    node.port = 5001;

    InsertCommand insert;
    insert.SetTable(nodes);
    insert.SetFieldValues(node.ToSqliteRecord());
    std::cout << insert.GetCommand() << '\n';
    insert.SetReplacable(true);
    std::cout << insert.GetCommand() << '\n';

    UpdateCommand update;
    update.SetTable(nodes);
    update.SetFieldValues(node.BuildRecord({"port", "enabled"}));
    update.SetCondition(SqliteEqual("name", SqliteValue::Text(node.name)));
    std::cout << update.GetCommand() << '\n';

    SelectCommand select;
    select.SetTable(nodes);
    select.AddField("name");
    select.AddField("port");
    select.SetCondition(SqliteEqual("enabled", true));
    select.OrderBy("port", SqliteOrder::Descending);
    select.OrderBy("name");
    select.Limit(10, 20);  // the third page
    std::cout << select.GetCommand() << '\n';
    // [/statements]
}

// [checked]
// Fails, instead of selecting everything, if a value cannot be written.
bool SelectByName(const std::vector<SqliteValue>& names, SelectCommand& select)
{
    SqliteIn among;
    return among.SetValue("name", names) && select.SetCondition(among);
}
// [/checked]

bool ShowConditions(const SqliteTableHandler& nodes)
{
    // [conditions]
    const SqliteEqual enabled("enabled", true);
    const SqliteNotEqual notDefault("port", 5001);
    const SqliteIn named("name", std::vector<SqliteValue>{"a", "b"});
    const SqliteIn selected("name", "SELECT name FROM favourites");
    const SqliteLess low("port", 1024);
    const SqliteContains percent("name", "50%");
    const SqliteAnd both(enabled.GetCondition(), notDefault.GetCondition());
    const SqliteAnd all(both.GetCondition(), named.GetCondition());
    std::cout << selected.GetCondition() << '\n';
    std::cout << all.GetCondition() << '\n';
    std::cout << SqliteOr(low.GetCondition(), percent.GetCondition()).GetCondition() << '\n';
    // [/conditions]

    SelectCommand select;
    select.SetTable(nodes);
    select.SelectAll();
    const bool refused = !SelectByName({"a", SqliteValue()}, select);
    const bool accepted = SelectByName({"a", "b"}, select);
    std::cout << select.GetCommand() << '\n';
    return refused && accepted;
}

}  // namespace

int main()
{
    const SqliteTableHandler nodes("nodes", "name TEXT PRIMARY KEY, port INTEGER, enabled INTEGER");
    ShowValues();
    ShowRecord();
    ShowStatements(nodes);
    const bool isAsTold = ShowConditions(nodes);

    SqliteValueList row;
    row.AddValue("name", "O'Brien's NAS");  // as returned by a select
    row.AddValue("port", 5001);
    row.AddValue("enabled", 1);
    Node node;
    return isAsTold && node.LoadRecord(row) && node.enabled ? EXIT_SUCCESS : EXIT_FAILURE;
}
