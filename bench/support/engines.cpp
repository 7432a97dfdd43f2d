#include "support/engines.h"

#include <sqlite3.h>

#include <algorithm>

#include "support/bench.h"

namespace Bench {

namespace {

using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteValueList;

void CreateNodes(sqlite3* handle)
{
    ExecText(handle, std::string("CREATE TABLE IF NOT EXISTS nodes (") + NodesSchema + ")");
}

// Creates unused tables, numbered from `first` to `end` - 1.
void CreateOthers(const std::string& path, int first, int end)
{
    const Database db = OpenDatabase(path);
    ExecText(db.get(), "BEGIN");
    for (int table = first; table < end; ++table) {
        ExecText(db.get(), "CREATE TABLE other" + std::to_string(table) + " (a, b, c)");
    }
    ExecText(db.get(), "COMMIT");
}

void BindText(sqlite3_stmt* statement, int column, const std::string& text)
{
    sqlite3_bind_text(statement, column, text.data(), static_cast<int>(text.size()), SQLITE_STATIC);
}

void BindNode(sqlite3_stmt* statement, const Node& node)
{
    sqlite3_bind_int(statement, 1, node.id);
    BindText(statement, 2, node.name);
    BindText(statement, 3, node.address);
    sqlite3_bind_int(statement, 4, node.port);
    sqlite3_bind_int(statement, 5, node.state);
}

void Finish(sqlite3_stmt* statement)
{
    const int code = sqlite3_step(statement);
    sqlite3_reset(statement);
    Require(code == SQLITE_DONE, "a statement failed");
}

Node NodeOfRow(sqlite3_stmt* statement)
{
    return {sqlite3_column_int(statement, 0), ColumnText(statement, 1), ColumnText(statement, 2),
            sqlite3_column_int(statement, 3), sqlite3_column_int(statement, 4)};
}

void CollectNodes(sqlite3_stmt* statement, std::vector<Node>& nodes)
{
    int code = SQLITE_OK;
    while ((code = sqlite3_step(statement)) == SQLITE_ROW) nodes.push_back(NodeOfRow(statement));
    sqlite3_reset(statement);
    Require(code == SQLITE_DONE, "a select failed");
}

// A row by column names: `get(row, name, out)` reads a column.
template <class Row, class Get>
std::vector<Node> ToNodes(const std::vector<Row>& rows, Get get)
{
    std::vector<Node> nodes;
    for (const Row& row : rows) {
        Node node;
        get(row, "id", node.id);
        get(row, "name", node.name);
        get(row, "address", node.address);
        get(row, "port", node.port);
        get(row, "state", node.state);
        nodes.push_back(node);
    }
    return nodes;
}

}  // namespace

Node MakeNode(int id)
{
    return {id, "node-" + std::to_string(id % 1000), "192.168.10." + std::to_string(id % 250),
            5000 + id % 1000, id % 3};
}

std::string ToText(const Node& node)
{
    return std::to_string(node.id) + "|" + node.name + "|" + node.address + "|" +
           std::to_string(node.port) + "|" + std::to_string(node.state) + "\n";
}

std::string ToText(const std::vector<Node>& nodes)
{
    std::string text = std::to_string(nodes.size()) + " rows\n";
    for (const Node& node : nodes) text += ToText(node);
    return text;
}

std::string ToText(const NamedRows& rows)
{
    std::vector<Node> nodes;
    for (const auto& row : rows) {
        nodes.push_back({row.at("id").asInt(), row.at("name").asString(),
                         row.at("address").asString(), row.at("port").asInt(),
                         row.at("state").asInt()});
    }
    return ToText(nodes);
}

void FillNodes(const std::string& path, int rows, int tables)
{
    const int before = tables / 2;
    CreateOthers(path, 1, before);
    BareEngine engine(path);
    CreateOthers(path, std::max(before, 1), tables);
    engine.Exec("BEGIN");
    for (int id = 1; id <= rows; ++id) engine.Insert(MakeNode(id));
    engine.Exec("COMMIT");
}

std::string DumpNodes(const std::string& path)
{
    BareEngine engine(path);
    engine.SelectAll();
    return engine.Selected();
}

OurEngine::OurEngine(const std::string& path, unsigned int retries)
    : table_("nodes", NodesSchema), db_(path, retries)
{
    Require(db_.Open(), "cannot open a database");
    Require(db_.CreateTable(table_), "cannot make a table");
}

void OurEngine::Exec(const char* statement)
{
    Require(db_.Exec(statement), statement);
}

void OurEngine::Insert(const Node& node)
{
    OrvaDRCore::InsertCommand command;
    command.SetTable(table_);
    command.AddFieldValue("id", node.id);
    command.AddFieldValue("name", node.name);
    command.AddFieldValue("address", node.address);
    command.AddFieldValue("port", node.port);
    command.AddFieldValue("state", node.state);
    Require(db_.InsertRecord(command), "an insert failed");
}

void OurEngine::Select(int id)
{
    OrvaDRCore::SelectCommand command;
    command.SetTable(table_);
    command.SelectAll();
    command.SetCondition(SqliteEqual("id", id));
    rows_.clear();
    SqliteValueList row;
    Require(db_.SelectRecord(command, row), "a select failed");
    rows_.push_back(std::move(row));
}

void OurEngine::SelectAll()
{
    OrvaDRCore::SelectCommand command;
    command.SetTable(table_);
    command.SelectAll();
    rows_.clear();
    Require(db_.SelectRecords(command, rows_), "a select failed");
}

void OurEngine::Update(int id, int state)
{
    OrvaDRCore::UpdateCommand command;
    command.SetTable(table_);
    command.AddFieldValue("state", state);
    command.SetCondition(SqliteEqual("id", id));
    Require(db_.UpdateRecord(command), "an update failed");
}

void OurEngine::Delete(int id)
{
    Require(db_.DeleteRecord(SqliteEqual("id", id).GetCondition(), table_), "a delete failed");
}

std::string OurEngine::Selected() const
{
    return ToText(ToNodes(rows_, [](const SqliteValueList& row, const char* name, auto& out) {
        Require(row.GetValue(name, out), name);
    }));
}

BareEngine::BareEngine(const std::string& path, int busyTimeoutMSec)
    : handle_(OpenDatabase(path, busyTimeoutMSec))
{
    CreateNodes(handle_.get());
    insert_ = Prepare(handle_.get(), "INSERT INTO nodes VALUES (?,?,?,?,?)");
    select_ = Prepare(handle_.get(), "SELECT * FROM nodes WHERE id=?");
    selectAll_ = Prepare(handle_.get(), "SELECT * FROM nodes");
    update_ = Prepare(handle_.get(), "UPDATE nodes SET state=? WHERE id=?");
    remove_ = Prepare(handle_.get(), "DELETE FROM nodes WHERE id=?");
}

void BareEngine::Exec(const char* statement)
{
    ExecText(handle_.get(), statement);
}

void BareEngine::Insert(const Node& node)
{
    BindNode(insert_.get(), node);
    Finish(insert_.get());
}

void BareEngine::Select(int id)
{
    rows_.clear();
    sqlite3_bind_int(select_.get(), 1, id);
    Require(sqlite3_step(select_.get()) == SQLITE_ROW, "no row");
    rows_.push_back(NodeOfRow(select_.get()));
    sqlite3_reset(select_.get());
}

void BareEngine::SelectAll()
{
    rows_.clear();
    CollectNodes(selectAll_.get(), rows_);
}

void BareEngine::Update(int id, int state)
{
    sqlite3_bind_int(update_.get(), 1, state);
    sqlite3_bind_int(update_.get(), 2, id);
    Finish(update_.get());
}

void BareEngine::Delete(int id)
{
    sqlite3_bind_int(remove_.get(), 1, id);
    Finish(remove_.get());
}

ContractEngine::ContractEngine(const std::string& path) : handle_(OpenDatabase(path))
{
    CreateNodes(handle_.get());
    find_ = Prepare(handle_.get(), "SELECT 1 FROM sqlite_master WHERE type='table' AND name=?;");
}

void ContractEngine::Exec(const char* statement)
{
    ExecText(handle_.get(), statement);
}

void ContractEngine::FindTable()
{
    BindText(find_.get(), 1, name_);
    Require(sqlite3_step(find_.get()) == SQLITE_ROW, "no table");
    Finish(find_.get());  // an error after the row counts, too
}

void ContractEngine::Insert(const Node& node)
{
    FindTable();
    std::string text = "INSERT INTO " + name_ + " (address,id,name,port,state) VALUES (";
    AppendLiteral(text, std::string_view(node.address));
    AppendLiteral(text += ',', node.id);
    AppendLiteral(text += ',', std::string_view(node.name));
    AppendLiteral(text += ',', node.port);
    AppendLiteral(text += ',', node.state);
    ExecText(handle_.get(), text += ");");
}

// Reads all rows of a select. Reads the names for each row, because rows are built one by one.
void ContractEngine::Collect(const std::string& text)
{
    rows_.clear();
    const Statement statement = Prepare(handle_.get(), text);
    int code = SQLITE_OK;
    while ((code = sqlite3_step(statement.get())) == SQLITE_ROW) {
        std::map<std::string, Value>& row = rows_.emplace_back();
        const int columns = sqlite3_column_count(statement.get());
        for (int column = 0; column < columns; ++column) {
            const char* field = sqlite3_column_name(statement.get(), column);
            if (sqlite3_column_type(statement.get(), column) == SQLITE_INTEGER) {
                row.emplace(field, sqlite3_column_int(statement.get(), column));
            } else {
                row.emplace(field, ColumnText(statement.get(), column));
            }
        }
    }
    Require(code == SQLITE_DONE, "a select failed");
}

void ContractEngine::Select(int id)
{
    FindTable();
    std::string text = "SELECT  * FROM " + name_ + " WHERE id=";
    AppendLiteral(text, id);
    Collect(text);
}

void ContractEngine::SelectAll()
{
    FindTable();
    Collect("SELECT  * FROM " + name_);
}

void ContractEngine::Update(int id, int state)
{
    FindTable();
    std::string text = "UPDATE " + name_ + " SET state=";
    AppendLiteral(text, state);
    AppendLiteral(text += " WHERE id=", id);
    ExecText(handle_.get(), text);
}

void ContractEngine::Delete(int id)
{
    FindTable();
    std::string text = "DELETE FROM " + name_ + " WHERE id=";
    AppendLiteral(text, id);
    ExecText(handle_.get(), text += ';');
}

std::string ContractEngine::Selected() const
{
    using Row = std::map<std::string, Value>;
    return ToText(ToNodes(rows_, [](const Row& row, const char* field, auto& out) {
        out = std::get<std::decay_t<decltype(out)>>(row.at(field));
    }));
}

}  // namespace Bench
