#if BENCH_HAS_SOCI

// Its header includes SQLite's inside a namespace, so nothing here may include sqlite3.h.
#include <soci/soci.h>
#include <soci/sqlite3/soci-sqlite3.h>

#include "support/engines.h"

namespace Bench {

// As its documentation recommends: prepares statements once, with bound variables.
struct Soci {
    Soci(const std::string& path, int busyTimeoutMSec)
        : session(soci::sqlite3,
                  "db=" + path + " timeout=" + std::to_string(busyTimeoutMSec / 1000)),
          created(Create())
    {
    }

    bool Create()
    {
        session << std::string("CREATE TABLE IF NOT EXISTS nodes (") + NodesSchema + ")";
        return true;
    }

    void Exec(const char* statement);
    void Insert(const Node& node);
    void Select(int id);
    void SelectAll();
    void Update(int id, int newState);
    void Delete(int id);

    soci::session session;
    bool created;  // declared before the statements, which need the table
    Node bound;
    int key = 0;
    soci::statement insert =
        (session.prepare << "INSERT INTO nodes VALUES (:id,:name,:address,:port,:state)",
         soci::use(bound.id), soci::use(bound.name), soci::use(bound.address),
         soci::use(bound.port), soci::use(bound.state));
    soci::statement select =
        (session.prepare << "SELECT * FROM nodes WHERE id=:id", soci::use(key),
         soci::into(bound.id), soci::into(bound.name), soci::into(bound.address),
         soci::into(bound.port), soci::into(bound.state));
    soci::statement selectAll =
        (session.prepare << "SELECT * FROM nodes", soci::into(bound.id), soci::into(bound.name),
         soci::into(bound.address), soci::into(bound.port), soci::into(bound.state));
    soci::statement update = (session.prepare << "UPDATE nodes SET state=:state WHERE id=:id",
                              soci::use(bound.state), soci::use(key));
    soci::statement remove = (session.prepare << "DELETE FROM nodes WHERE id=:id", soci::use(key));
    std::vector<Node> rows;
};

void Soci::Exec(const char* statement)
{
    session << statement;
}

void Soci::Insert(const Node& node)
{
    bound = node;
    insert.execute(true);
}

void Soci::Select(int id)
{
    rows.clear();
    key = id;
    if (select.execute(true)) rows.push_back(bound);
}

void Soci::SelectAll()
{
    rows.clear();
    selectAll.execute();
    while (selectAll.fetch()) rows.push_back(bound);
}

void Soci::Update(int id, int newState)
{
    key = id;
    bound.state = newState;
    update.execute(true);
}

void Soci::Delete(int id)
{
    key = id;
    remove.execute(true);
}

struct SociByName : Soci {
    using Soci::Soci;
    void SelectAll();

    NamedRows rows;
};

void SociByName::SelectAll()
{
    rows.clear();
    const soci::rowset<soci::row> all = (session.prepare << "SELECT * FROM nodes");
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

template class Peer<Soci>;
template class Peer<SociByName>;

}  // namespace Bench

#endif
