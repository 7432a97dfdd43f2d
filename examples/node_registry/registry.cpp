#include "registry.h"

#include <algorithm>
#include <map>

#include <orvadrcore/errors.h>
#include <orvadrcore/sqlite_transaction.h>
#include <orvadrcore/utils.h>

#include "reply.h"

namespace NodeRegistry {

using OrvaDRCore::ERR;
using OrvaDRCore::GenerateUUID;
using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteTransaction;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;

namespace {

constexpr unsigned int RetryLimit = 5;
constexpr const char* Table = "nodes";
constexpr const char* Schema =
    "id TEXT PRIMARY KEY, name TEXT NOT NULL UNIQUE, address TEXT NOT NULL, "
    "port INTEGER NOT NULL, volume TEXT NOT NULL, enabled INTEGER NOT NULL";

// SQLITE_CONSTRAINT: the schema refuses the row.
constexpr int SqliteConstraint = 19;

Json::Value NameTaken()
{
    return Reason("name", "belongs to another node");
}

SqliteEqual Matches(const NodeKey& key)
{
    return {key.field, SqliteValue::Text(key.text)};
}

// Whether the last attempt failed because the schema refuses the row.
bool IsConstraintFailure(const Json::Value& record)
{
    const bool isList = record.isArray() && !record.empty();
    const Json::Value& failure = isList ? record[record.size() - 1]["err_msg"] : record;
    return failure.isObject() && failure["sqlite_errcode"] == SqliteConstraint;
}

}  // namespace

Registry::Registry(const std::string& file) : table_(Table, Schema), db_(file, RetryLimit) {}

bool Registry::Create(Node& node)
{
    if (!IsNameFree(node)) return false;
    node.id = GenerateUUID();
    if (node.id.empty()) return Fail(ERR::ERR_NODE_CREATE, Reason("id", "cannot be made"));
    return db_.InsertRecord(Insertion(node)) || FailAsWrite();
}

bool Registry::Find(const NodeKey& key, Node& ret_node)
{
    SqliteValueList record;
    if (!SelectFirst(key, record)) return false;
    if (record.GetValues().empty()) {
        return Fail(ERR::ERR_NODE_NOT_EXIST, Reason(key.field, "belongs to no node"));
    }
    return ret_node.LoadRecord(record) ||
           Fail(ERR::ERR_NODE_GET, Reason(key.field, "belongs to a row that is damaged"));
}

bool Registry::List(const std::string& condition, std::vector<Node>& ret_nodes)
{
    SelectCommand select;
    select.SetTable(table_);
    for (const std::string& field : Node().GetRecordFields()) select.AddField(field);
    if (!condition.empty()) select.SetCondition(condition);
    std::vector<SqliteValueList> records;
    if (!db_.SelectRecords(select, records)) return FailAsDb();

    // A map sorts them by name and drops duplicates: a select that was retried may return rows twice.
    std::map<std::string, Node> nodes;
    for (const SqliteValueList& record : records) {
        Node node;
        if (!node.LoadRecord(record)) {
            return Fail(ERR::ERR_NODE_LIST, Reason("nodes", "hold a row that is damaged"));
        }
        nodes[node.name] = node;
    }
    ret_nodes.clear();
    for (const auto& [name, node] : nodes) ret_nodes.push_back(node);
    return true;
}

bool Registry::Change(const Node& node, const std::vector<std::string>& fields)
{
    const SqliteValueList changes = node.BuildRecord(fields);
    if (changes.HasField("name") && !IsNameFree(node)) return false;

    UpdateCommand update;
    update.SetTable(table_);
    update.SetFieldValues(changes);
    update.SetCondition(Matches({"id", node.id}));
    return db_.UpdateRecord(update) || FailAsWrite();
}

bool Registry::Remove(const std::string& id)
{
    return db_.DeleteRecord(Matches({"id", id}).GetCondition(), table_) || FailAsDb();
}

bool Registry::Replace(const std::vector<Node>& nodes)
{
    if (!db_.Open()) return Fail(ERR::ERR_DATABASE_OPERATION, Json::Value());
    if (!db_.CreateTable(table_)) return FailAsDb();
    SqliteTransaction transaction(db_);
    if (!transaction.Begin()) return FailAsDb();
    return (FillAnew(nodes) && transaction.Commit()) || FailAsWrite();
}

InsertCommand Registry::Insertion(const Node& node) const
{
    InsertCommand insert;
    insert.SetTable(table_);
    insert.SetFieldValues(node.ToSqliteRecord());
    return insert;
}

// Without retries: if SQLite has ended the transaction, a retry would run outside of it.
bool Registry::FillAnew(const std::vector<Node>& nodes)
{
    const auto insert = [&](const Node& node) {
        return db_.DoExecSqliteCommand(Insertion(node).GetCommand());
    };
    return db_.DoExecSqliteCommand(db_.GenerateDeleteCommand(table_.GetName(), "")) &&
           std::all_of(nodes.begin(), nodes.end(), insert);
}

bool Registry::SelectFirst(const NodeKey& key, SqliteValueList& ret_record)
{
    SelectCommand select;
    select.SetTable(table_);
    select.SelectAll();
    select.SetCondition(Matches(key));
    return db_.SelectRecord(select, ret_record) || FailAsDb();
}

// Checked before the statement, because a refused row would be retried for seconds. Another handler
// may take the name after the check; then the schema refuses the row: see FailAsWrite().
bool Registry::IsNameFree(const Node& node)
{
    SqliteValueList holder;
    if (!SelectFirst({"name", node.name}, holder)) return false;
    std::string id;
    if (holder.GetValues().empty() || (holder.GetValue("id", id) && id == node.id)) return true;
    return Fail(ERR::ERR_NODE_EXIST, NameTaken());
}

bool Registry::Fail(int code, const Json::Value& errors)
{
    errCode_ = code;
    err_ = errors;
    return false;
}

bool Registry::FailAsDb()
{
    return Fail(db_.GetErrCode(), db_.GetErr());
}

// Ids are new and no column is NULL, so the schema only refuses a name that another handler has taken
// since IsNameFree().
bool Registry::FailAsWrite()
{
    if (IsConstraintFailure(db_.GetErr())) return Fail(ERR::ERR_NODE_EXIST, NameTaken());
    return FailAsDb();
}

}  // namespace NodeRegistry
