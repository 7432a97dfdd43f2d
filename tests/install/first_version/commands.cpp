#include <orvadrcore/sqlite_command.h>

#include <memory>
#include <sstream>

#include "show.h"

namespace {

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteCommand;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteOrder;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;

// A statement of the program's own.
class Vacuum : public SqliteCommand {
  public:
    std::string GetCommand() const override { return "VACUUM"; }
    bool IsValid() const override { return true; }
    void DumpParam(std::stringstream& out) const override { out << "nothing"; }
};

// Through the virtual table.
void ShowCommand(const SqliteCommand& command)
{
    Show{"command", command.IsValid(), command.GetCommand()};
    Show{"  in the log", command.ToStr(), command.GetTable().GetSchema()};
}

template <class Command>
void AddFields(Command& command)
{
    Show{"added",
         command.AddFieldValue("a", std::string("text")),
         command.AddFieldValue("b", "text"),
         command.AddFieldValue("c", SqliteValue::Real(0.5)),
         command.AddFieldValue("d", true),
         command.AddFieldValue("e", -1),
         command.AddFieldValue("f", 1U),
         command.AddFieldValue("", 1)};
}

// Not through the virtual table: the functions are called by their names.
template <class Command>
void ShowParts(const Command& command)
{
    std::stringstream out;
    command.DumpParam(out);
    Show{"  parts", command.IsValid(), command.GetCommand(), out.str()};
}

template <class Insert>
void ShowInsert(const SqliteTableHandler& table)
{
    Insert insert;
    ShowCommand(insert);
    insert.SetTable(table);
    AddFields(insert);
    insert.SetReplacable(true);
    ShowCommand(insert);
    Show{"values", insert.ToFormatedInsertValues()};
    SqliteValueList values;
    values.AddValue("only", 1);
    insert.SetFieldValues(values);
    ShowParts<InsertCommand>(insert);
}

template <class Update>
void ShowUpdate(const SqliteTableHandler& table)
{
    Update update;
    update.SetTable(table);
    AddFields(update);
    Show{"condition", update.SetCondition("id=1")};
    ShowCommand(update);
    SqliteValueList values;
    values.AddValue("only", 1);
    update.SetFieldValues(values);
    Show{"condition", update.SetCondition(SqliteEqual("id", 2))};
    ShowParts<UpdateCommand>(update);
}

template <class Select>
void ShowSelect(const SqliteTableHandler& table)
{
    Select select;
    select.SetTable(table);
    select.SelectAll();
    ShowCommand(select);
    Show{"select",
         select.AddField("node"),
         select.AddField("sum(size)"),
         select.GroupBy("node"),
         select.OrderBy("node"),
         select.OrderBy("size", SqliteOrder::Descending),
         select.SetCondition("id=1"),
         select.SetCondition(SqliteEqual("id", 2))};
    select.Limit(20);
    ShowCommand(select);
    select.Limit(20, 5);
    ShowParts<SelectCommand>(select);
}

template <class Command>
void ShowCopies()
{
    Command command;
    command.SetTable(SqliteTableHandler("copied", ""));
    Command copy(command);
    copy = command;
    const std::unique_ptr<SqliteCommand> owned = std::make_unique<Command>(copy);
    Show{"copy", owned->GetTable().GetName()};
}

}  // namespace

void CallCommands()
{
    const SqliteTableHandler table("nodes", "id INTEGER");
    const std::unique_ptr<SqliteTableHandler> derived =
        std::make_unique<Derived<SqliteTableHandler>>("derived", "id INTEGER");
    Show{"table", derived->GetName(), derived->GetSchema(), SqliteTableHandler().GetName().empty()};
    Vacuum vacuum;
    Show{"set", vacuum.SetTable(table), vacuum.SetTable(SqliteTableHandler())};
    ShowCommand(vacuum);
    ShowInsert<InsertCommand>(table);
    ShowInsert<Derived<InsertCommand>>(*derived);
    ShowUpdate<UpdateCommand>(table);
    ShowUpdate<Derived<UpdateCommand>>(*derived);
    ShowSelect<SelectCommand>(table);
    ShowSelect<Derived<SelectCommand>>(*derived);
    ShowCopies<InsertCommand>();
    ShowCopies<UpdateCommand>();
    ShowCopies<SelectCommand>();
}
