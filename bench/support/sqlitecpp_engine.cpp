#if BENCH_HAS_SQLITECPP

#include <SQLiteCpp/Database.h>
#include <SQLiteCpp/Statement.h>

#include "support/engines.h"

namespace Bench {

namespace {

Node NodeOfRow(SQLite::Statement& statement)
{
    return {statement.getColumn(0).getInt(), statement.getColumn(1).getString(),
            statement.getColumn(2).getString(), statement.getColumn(3).getInt(),
            statement.getColumn(4).getInt()};
}

}  // namespace

// As its documents advise: statements are prepared once and reset.
struct SqliteCppEngine::State {
    explicit State(const std::string& path)
        : db(path, SQLite::OPEN_READWRITE | SQLite::OPEN_CREATE, BusyTimeoutMSec),
          created(db.exec(std::string("CREATE TABLE IF NOT EXISTS nodes (") + NodesSchema + ")"))
    {
    }

    SQLite::Database db;
    int created;  // before the statements, which need the table
    SQLite::Statement insert{db, "INSERT INTO nodes VALUES (?,?,?,?,?)"};
    SQLite::Statement select{db, "SELECT * FROM nodes WHERE id=?"};
    SQLite::Statement selectAll{db, "SELECT * FROM nodes"};
    SQLite::Statement update{db, "UPDATE nodes SET state=? WHERE id=?"};
    SQLite::Statement remove{db, "DELETE FROM nodes WHERE id=?"};
};

SqliteCppEngine::SqliteCppEngine(const std::string& path) : state(std::make_unique<State>(path)) {}

SqliteCppEngine::~SqliteCppEngine() = default;

void SqliteCppEngine::Exec(const char* statement)
{
    state->db.exec(statement);
}

void SqliteCppEngine::Insert(const Node& node)
{
    SQLite::Statement& insert = state->insert;
    insert.bind(1, node.id);
    insert.bindNoCopy(2, node.name);
    insert.bindNoCopy(3, node.address);
    insert.bind(4, node.port);
    insert.bind(5, node.state);
    insert.exec();
    insert.reset();
}

void SqliteCppEngine::Select(int id)
{
    rows.clear();
    state->select.bind(1, id);
    if (state->select.executeStep()) rows.push_back(NodeOfRow(state->select));
    state->select.reset();
}

void SqliteCppEngine::SelectAll()
{
    rows.clear();
    while (state->selectAll.executeStep()) rows.push_back(NodeOfRow(state->selectAll));
    state->selectAll.reset();
}

void SqliteCppEngine::Update(int id, int newState)
{
    state->update.bind(1, newState);
    state->update.bind(2, id);
    state->update.exec();
    state->update.reset();
}

void SqliteCppEngine::Delete(int id)
{
    state->remove.bind(1, id);
    state->remove.exec();
    state->remove.reset();
}

struct SqliteCppByName::State {
    explicit State(const std::string& path) : db(path, SQLite::OPEN_READWRITE, BusyTimeoutMSec) {}

    SQLite::Database db;
    SQLite::Statement selectAll{db, "SELECT * FROM nodes"};
};

SqliteCppByName::SqliteCppByName(const std::string& path) : state(std::make_unique<State>(path)) {}

SqliteCppByName::~SqliteCppByName() = default;

void SqliteCppByName::Exec(const char* statement)
{
    state->db.exec(statement);
}

void SqliteCppByName::SelectAll()
{
    rows.clear();
    SQLite::Statement& select = state->selectAll;
    while (select.executeStep()) {
        auto& row = rows.emplace_back();
        for (int column = 0; column < select.getColumnCount(); ++column) {
            const SQLite::Column value = select.getColumn(column);
            if (value.isInteger()) {
                row.emplace(value.getName(), value.getInt());
            } else {
                row.emplace(value.getName(), value.getText());
            }
        }
    }
    select.reset();
}

}  // namespace Bench

#endif
