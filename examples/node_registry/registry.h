// The table of nodes. Several handlers may use one file at the same time.
//
// Like those of SqliteDB, operations return true, or false with the reason in GetErrCode() and
// GetErr(). A database failure keeps SqliteDB's code and record.
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
    // The first operation opens the file, and creates it if it is missing.
    explicit Registry(const std::string& file);

    // Adds a node and sets its new id. ERR_NODE_EXIST if the name is taken.
    bool Create(Node& node);

    // ERR_NODE_NOT_EXIST if there is no such node.
    bool Find(const NodeKey& key, Node& ret_node);

    // The nodes that match the condition, sorted by name. An empty condition matches all.
    bool List(const std::string& condition, std::vector<Node>& ret_nodes);

    // Changes the named fields of the node with the id of `node`. ERR_NODE_EXIST if another node has
    // the new name. If no node has the id, nothing happens, and this is not reported.
    bool Change(const Node& node, const std::vector<std::string>& fields);

    // Removes a node. It need not exist.
    bool Remove(const std::string& id);

    // Replaces all nodes by these, with their ids, in one transaction: a failure changes nothing. Ids
    // and names must be unique.
    bool Replace(const std::vector<Node>& nodes);

    int GetErrCode() const { return errCode_; }
    const Json::Value& GetErr() const { return err_; }

  private:
    bool SelectFirst(const NodeKey& key, OrvaDRCore::SqliteValueList& ret_record);
    bool IsNameFree(const Node& node);
    OrvaDRCore::InsertCommand Insertion(const Node& node) const;
    bool FillAnew(const std::vector<Node>& nodes);
    bool Fail(int code, const Json::Value& errors);
    bool FailAsDb();
    bool FailAsWrite();

    OrvaDRCore::SqliteTableHandler table_;
    OrvaDRCore::SqliteDB db_;
    int errCode_ = 0;
    Json::Value err_;
};

}  // namespace NodeRegistry

#endif
