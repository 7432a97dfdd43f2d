// The nodes table. Several handlers may work on one file at the same time.
//
// Operations answer true, or false with the reason in GetErrCode() and GetErr(), as SqliteDB does:
// a failure of the database is handed on with its own code and record.
#ifndef NODE_REGISTRY_REGISTRY_H
#define NODE_REGISTRY_REGISTRY_H

#include <string>
#include <vector>

#include <json/value.h>

#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_db.h>

#include "node.h"

namespace NodeRegistry {

class Registry {
  public:
    // The file is opened, and made when it is missing, by the first operation.
    explicit Registry(const std::string& file);

    // Adds a node under a new id, which is put into `node`. ERR_NODE_EXIST when its name is taken.
    bool Create(Node& node);

    // ERR_NODE_NOT_EXIST when there is no such node.
    bool Find(const NodeKey& key, Node& ret_node);

    // The nodes that meet a condition, or all for an empty one, sorted by name.
    bool List(const std::string& condition, std::vector<Node>& ret_nodes);

    // Changes the named fields of the node whose id `node` has. ERR_NODE_EXIST when it would get
    // the name of another one. The node must exist: nothing is changed otherwise, and nobody told.
    bool Change(const Node& node, const std::vector<std::string>& fields);

    // Removes a node. That it is not there is no failure.
    bool Remove(const std::string& id);

    // Makes these the nodes, with the ids that they have, in one transaction: on failure all is as
    // it was. No two may have the same id or name.
    bool Replace(const std::vector<Node>& nodes);

    int GetErrCode() const { return errCode; }
    const Json::Value& GetErr() const { return err; }

  private:
    bool SelectFirst(const NodeKey& key, OrvaDRCore::SqliteValueList& ret_record);
    bool IsNameFree(const Node& node);
    OrvaDRCore::InsertCommand Insertion(const Node& node) const;
    bool FillAnew(const std::vector<Node>& nodes);
    bool Fail(int code, const Json::Value& errors);
    bool FailAsDb();
    bool FailAsWrite();

    OrvaDRCore::SqliteTableHandler table;
    OrvaDRCore::SqliteDB db;
    int errCode = 0;
    Json::Value err;
};

}  // namespace NodeRegistry

#endif
