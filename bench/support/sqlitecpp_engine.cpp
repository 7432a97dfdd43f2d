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

// As its documentation recommends: prepares statements once and resets them.
struct SqliteCpp {
    SqliteCpp(const std::string& path, int busyTimeoutMSec)
        : db(path, SQLite::OPEN_READWRITE | SQLite::OPEN_CREATE, busyTimeoutMSec),
          created(db.exec(std::string("CREATE TABLE IF NOT EXISTS nodes (") + NodesSchema + ")"))
    {
    }

    void Exec(const char* statement);
    void Insert(const Node& node);
    void Select(int id);
    void SelectAll();
    void Update(int id, int newState);
    void Delete(int id);

    SQLite::Database db;
    int created;  // declared before the statements, which need the table
    SQLite::Statement insert{db, "INSERT INTO nodes VALUES (?,?,?,?,?)"};
    SQLite::Statement select{db, "SELECT * FROM nodes WHERE id=?"};
    SQLite::Statement selectAll{db, "SELECT * FROM nodes"};
    SQLite::Statement update{db, "UPDATE nodes SET state=? WHERE id=?"};
    SQLite::Statement remove{db, "DELETE FROM nodes WHERE id=?"};
    std::vector<Node> rows;
};

void SqliteCpp::Exec(const char* statement)
{
    db.exec(statement);
}

void SqliteCpp::Insert(const Node& node)
{
    insert.reset();  // before the insert, because a failed one needs it, too
    insert.bind(1, node.id);
    insert.bindNoCopy(2, node.name);
    insert.bindNoCopy(3, node.address);
    insert.bind(4, node.port);
    insert.bind(5, node.state);
    insert.exec();
}

void SqliteCpp::Select(int id)
{
    rows.clear();
    select.bind(1, id);
    if (select.executeStep()) rows.push_back(NodeOfRow(select));
    select.reset();
}

void SqliteCpp::SelectAll()
{
    rows.clear();
    while (selectAll.executeStep()) rows.push_back(NodeOfRow(selectAll));
    selectAll.reset();
}

void SqliteCpp::Update(int id, int newState)
{
    update.bind(1, newState);
    update.bind(2, id);
    update.exec();
    update.reset();
}

void SqliteCpp::Delete(int id)
{
    remove.bind(1, id);
    remove.exec();
    remove.reset();
}

struct SqliteCppByName : SqliteCpp {
    using SqliteCpp::SqliteCpp;
    void SelectAll();

    NamedRows rows;
};

void SqliteCppByName::SelectAll()
{
    rows.clear();
    while (selectAll.executeStep()) {
        auto& row = rows.emplace_back();
        for (int column = 0; column < selectAll.getColumnCount(); ++column) {
            const SQLite::Column value = selectAll.getColumn(column);
            if (value.isInteger()) {
                row.emplace(value.getName(), value.getInt());
            } else {
                row.emplace(value.getName(), value.getText());
            }
        }
    }
    selectAll.reset();
}

template class Peer<SqliteCpp>;
template class Peer<SqliteCppByName>;

}  // namespace Bench

#endif
