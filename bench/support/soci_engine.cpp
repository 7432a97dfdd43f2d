#if BENCH_HAS_SOCI

// Its header takes that of SQLite into a namespace: neither may be included together with the other.
#include <soci/soci.h>
#include <soci/sqlite3/soci-sqlite3.h>

#include "support/engines.h"

namespace Bench {

// As its documents advise: statements are prepared once, with variables bound to them.
struct SociEngine::State {
    explicit State(const std::string& path)
        : session(soci::sqlite3, "db=" + path + " timeout=1"), created(Create())
    {
    }

    bool Create()
    {
        session << std::string("CREATE TABLE IF NOT EXISTS nodes (") + NodesSchema + ")";
        return true;
    }

    soci::session session;
    bool created;  // before the statements, which need the table
    Node node;
    int key = 0;
    soci::statement insert =
        (session.prepare << "INSERT INTO nodes VALUES (:id,:name,:address,:port,:state)",
         soci::use(node.id), soci::use(node.name), soci::use(node.address), soci::use(node.port),
         soci::use(node.state));
    soci::statement select = (session.prepare << "SELECT * FROM nodes WHERE id=:id", soci::use(key),
                              soci::into(node.id), soci::into(node.name), soci::into(node.address),
                              soci::into(node.port), soci::into(node.state));
    soci::statement selectAll =
        (session.prepare << "SELECT * FROM nodes", soci::into(node.id), soci::into(node.name),
         soci::into(node.address), soci::into(node.port), soci::into(node.state));
    soci::statement update = (session.prepare << "UPDATE nodes SET state=:state WHERE id=:id",
                              soci::use(node.state), soci::use(key));
    soci::statement remove = (session.prepare << "DELETE FROM nodes WHERE id=:id", soci::use(key));
};

SociEngine::SociEngine(const std::string& path) : state(std::make_unique<State>(path)) {}

SociEngine::~SociEngine() = default;

void SociEngine::Exec(const char* statement)
{
    state->session << statement;
}

void SociEngine::Insert(const Node& node)
{
    state->node = node;
    state->insert.execute(true);
}

void SociEngine::Select(int id)
{
    rows.clear();
    state->key = id;
    if (state->select.execute(true)) rows.push_back(state->node);
}

void SociEngine::SelectAll()
{
    rows.clear();
    state->selectAll.execute();
    while (state->selectAll.fetch()) rows.push_back(state->node);
}

void SociEngine::Update(int id, int newState)
{
    state->key = id;
    state->node.state = newState;
    state->update.execute(true);
}

void SociEngine::Delete(int id)
{
    state->key = id;
    state->remove.execute(true);
}

struct SociByName::State {
    explicit State(const std::string& path) : session(soci::sqlite3, "db=" + path + " timeout=1") {}

    soci::session session;
};

SociByName::SociByName(const std::string& path) : state(std::make_unique<State>(path)) {}

SociByName::~SociByName() = default;

void SociByName::Exec(const char* statement)
{
    state->session << statement;
}

void SociByName::SelectAll()
{
    rows.clear();
    const soci::rowset<soci::row> all = (state->session.prepare << "SELECT * FROM nodes");
    for (const soci::row& given : all) {
        auto& row = rows.emplace_back();
        for (std::size_t column = 0; column < given.size(); ++column) {
            const soci::column_properties& properties = given.get_properties(column);
            if (properties.get_data_type() == soci::dt_integer) {
                row.emplace(properties.get_name(), given.get<int>(column));
            } else {
                row.emplace(properties.get_name(), given.get<std::string>(column));
            }
        }
    }
}

}  // namespace Bench

#endif
