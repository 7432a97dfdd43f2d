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

// SQLite's result code for a row that the schema refuses.
constexpr int SqliteConstraint = 19;

Json::Value NameTaken()
{
    return Reason("name", "belongs to another node");
}

SqliteEqual Matches(const NodeKey& key)
{
    return {key.field, SqliteValue::EscapeText(key.text)};
}

// Whether a statement's only or last try met a row that the schema refuses.
bool IsConstraintFailure(const Json::Value& record)
{
    const bool isList = record.isArray() && !record.empty();
    const Json::Value& failure = isList ? record[record.size() - 1]["err_msg"] : record;
    return failure.isObject() && failure["sqlite_errcode"] == SqliteConstraint;
}

}  // namespace

Registry::Registry(const std::string& file) : table(Table, Schema), db(file, RetryLimit) {}

bool Registry::Create(Node& node)
{
    if (!IsNameFree(node)) return false;
    node.id = GenerateUUID();
    if (node.id.empty()) return Fail(ERR::ERR_NODE_CREATE, Reason("id", "cannot be made"));
    return db.InsertRecord(Insertion(node)) || FailAsWrite();
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
    select.SetTable(table);
    for (const std::string& field : Node().GetRecordFields()) select.AddField(field);
    if (!condition.empty()) select.SetCondition(condition);
    std::vector<SqliteValueList> records;
    if (!db.SelectRecords(select, records)) return FailAsDb();

    // By name, which sorts them; and a select that failed half-way and was tried again has given
    // some rows twice.
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
    update.SetTable(table);
    update.SetFieldValues(changes);
    update.SetCondition(Matches({"id", node.id}));
    return db.UpdateRecord(update) || FailAsWrite();
}

bool Registry::Remove(const std::string& id)
{
    return db.DeleteRecord(Matches({"id", id}).GetCondition(), table) || FailAsDb();
}

bool Registry::Replace(const std::vector<Node>& nodes)
{
    if (!db.Open()) return Fail(ERR::ERR_DATABASE_OPERATION, Json::Value());
    if (!db.CreateTable(table)) return FailAsDb();
    SqliteTransaction transaction(db);
    if (!transaction.Begin()) return FailAsDb();
    return (FillAnew(nodes) && transaction.Commit()) || FailAsWrite();
}

InsertCommand Registry::Insertion(const Node& node) const
{
    InsertCommand insert;
    insert.SetTable(table);
    insert.SetFieldValues(node.ToSqliteRecord());
    return insert;
}

// Single tries alone: where SQLite has ended the transaction, another try would stay outside it.
bool Registry::FillAnew(const std::vector<Node>& nodes)
{
    const auto insert = [&](const Node& node) {
        return db.DoExecSqliteCommand(Insertion(node).GetCommand());
    };
    return db.DoExecSqliteCommand(db.GenerateDeleteCommand(table.GetName(), "")) &&
           std::all_of(nodes.begin(), nodes.end(), insert);
}

bool Registry::SelectFirst(const NodeKey& key, SqliteValueList& ret_record)
{
    SelectCommand select;
    select.SetTable(table);
    select.SelectAll();
    select.SetCondition(Matches(key));
    return db.SelectRecord(select, ret_record) || FailAsDb();
}

// Asked before a statement that would fail: a refused row is tried again for seconds. The answer
// may be old by the time of the statement, where the schema has the last word: see FailAsWrite().
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
    errCode = code;
    err = errors;
    return false;
}

bool Registry::FailAsDb()
{
    return Fail(db.GetErrCode(), db.GetErr());
}

// Ids are new and no column is left empty: what the schema can refuse is a name that another
// handler has taken since IsNameFree().
bool Registry::FailAsWrite()
{
    if (IsConstraintFailure(db.GetErr())) return Fail(ERR::ERR_NODE_EXIST, NameTaken());
    return FailAsDb();
}

}  // namespace NodeRegistry
