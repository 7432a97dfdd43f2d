#include <orvadrcore/sqlite_db.h>
#include <orvadrcore/sqlite_transaction.h>

#include <cstdint>
#include <utility>
#include <vector>

#include "show.h"

namespace {

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteRow;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteTransaction;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;

const char* const SelectNodes = "SELECT * FROM nodes ORDER BY id";

SqliteTableHandler Nodes()
{
    return {"nodes", "id INTEGER PRIMARY KEY, name TEXT, size INTEGER, load REAL"};
}

SqliteValueList MakeNode(int id)
{
    SqliteValueList node;
    node.AddValue("id", id);
    node.AddValue("name", SqliteValue::Text("node " + std::to_string(id)));
    node.AddValue("size", SqliteValue::Integer(5000000000 + id));
    node.AddValue("load", SqliteValue::Real(id / 4.0));
    return node;
}

SelectCommand SelectIds()
{
    SelectCommand select;
    select.SetTable(Nodes());
    select.AddField("id");
    select.OrderBy("id");
    return select;
}

void ShowState(const std::string& what, const SqliteDB& db)
{
    Show{
        what,       db.GetErrCode(), db.GetSqliteCode(), db.GetAffectedRows(), db.GetLastInsertId(),
        db.GetErr()};
}

void ShowRows(const std::vector<SqliteValueList>& rows)
{
    for (const SqliteValueList& row : rows) Show{"  row", row.ToStr()};
}

template <class T>
void ReadColumn(const SqliteRow& row, const std::string& name, std::size_t number)
{
    T named{};
    T numbered{};
    const bool isNamed = row.GetValue(name, named);
    const bool isNumbered = row.GetValue(number, numbered);
    Show{"  column " + name, isNamed, named, isNumbered, numbered};
}

bool TakeRow(const SqliteRow& row)
{
    Show{"row", row.GetColumnCount(), row.GetColumnName(1), row.IsNull("name"), row.IsNull("none")};
    ReadColumn<std::string>(row, "name", 1);
    ReadColumn<int>(row, "id", 0);
    ReadColumn<unsigned int>(row, "id", 0);
    ReadColumn<std::int64_t>(row, "size", 2);
    ReadColumn<double>(row, "load", 3);
    ReadColumn<bool>(row, "id", 0);
    return row.GetColumnCount() == 0;  // no more rows
}

void ShowWrites(SqliteDB& db)
{
    InsertCommand insert;
    insert.SetTable(Nodes());
    insert.SetFieldValues(MakeNode(1));
    Show{"insert", db.InsertRecord(insert)};
    ShowState("  inserted", db);
    Show{"insert again", db.InsertRecord(insert)};
    ShowState("  refused", db);
    Show{"insert many", db.InsertRecords(Nodes(), {MakeNode(2), MakeNode(3)})};
    Show{"replace many", db.InsertRecords(Nodes(), {MakeNode(2)}, true)};
    UpdateCommand update;
    update.SetTable(Nodes());
    update.AddFieldValue("name", "renamed");
    update.SetCondition("id=3");
    Show{"update", db.UpdateRecord(update)};
    ShowState("  updated", db);
}

void ShowSelects(SqliteDB& db)
{
    std::vector<SqliteValueList> rows;
    SqliteValueList row;
    bool found = false;
    Show{"select", db.SelectRecords(SelectIds(), rows), db.SelectByCommand(SelectNodes, rows),
         db.DoSelectSqliteRecords(SelectNodes, rows)};
    ShowRows(rows);
    Show{"one", db.SelectRecord(SelectIds(), row), row.ToStr()};
    Show{"found", db.SelectRecord(SelectIds(), row, found), found};
    Show{"text", db.SelectByCommand("SELECT name FROM nodes WHERE id=3", row), row.ToStr()};
    Show{"once", db.DoSelectSqliteRecord("SELECT max(id) AS most FROM nodes", row), row.ToStr()};
    SelectCommand all;
    all.SetTable(Nodes());
    all.SelectAll();
    Show{"each", db.SelectEach(all, TakeRow), db.SelectEachByCommand(SelectNodes, TakeRow)};
}

void ShowTables(SqliteDB& db)
{
    Show{"tables",
         db.IsTableExisted("nodes"),
         db.IsTableExisted("later"),
         db.CreateTable(SqliteTableHandler("later", "id INTEGER")),
         db.IsTableExisted("later"),
         db.Upgrade({"CREATE TABLE steps (id INTEGER)"}),
         db.IsTableExisted("steps")};
}

void ShowDeletes(SqliteDB& db)
{
    Show{"delete",
         db.GenerateDeleteCommand("nodes", "id=1"),
         db.DeleteRecord("id=1", Nodes()),
         db.DoDelete(Nodes(), "id=2"),
         db.Exec("DELETE FROM later"),
         db.DoExecSqliteCommand("DELETE FROM later"),
         db.DeleteAllRecords(Nodes())};
    ShowState("  deleted", db);
    db.SetDBErr("SELECT", 1, "set by the program");
    Show{"set", db.GetErr()};
}

template <class Transaction>
void ShowTransaction(SqliteDB& db)
{
    Transaction transaction(db);
    Show{"transaction",          transaction.Begin(), db.InsertRecords(Nodes(), {MakeNode(8)}),
         transaction.Rollback(), transaction.Begin(), transaction.Begin(),
         transaction.Commit(),   transaction.Commit()};
}

template <class Connection>
void ShowMoves(const std::string& path)
{
    Connection db(path, 0);
    Show{"open", db.Open()};
    Connection moved(std::move(db));
    db = std::move(moved);
    Show{"moved", db.IsTableExisted("nodes")};
    db.Close();
}

}  // namespace

void CallDatabase(const std::string& dir)
{
    SqliteDB db(dir + "/nodes.db", 0);
    ShowState("new", db);
    ShowWrites(db);
    ShowSelects(db);
    ShowTables(db);
    ShowDeletes(db);
    ShowTransaction<SqliteTransaction>(db);
    ShowTransaction<Derived<SqliteTransaction>>(db);
    ShowMoves<SqliteDB>(dir + "/nodes.db");
    ShowMoves<Derived<SqliteDB>>(dir + "/nodes.db");
}
