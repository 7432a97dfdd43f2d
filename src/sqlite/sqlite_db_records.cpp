// The record operations of SqliteDB.
#define DR_LOG_FILE "sqlite_db.cpp"

#include <algorithm>
#include <typeinfo>

#include <orvadrcore/errors.h>
#include <orvadrcore/sqlite_db.h>

#include "base/log.h"
#include "base/scope_guard.h"
#include "sqlite/sqlite_batch.h"
#include "sqlite/sqlite_connection.h"
#include "sqlite/sqlite_exec.h"
#include "sqlite/sqlite_shortcuts.h"

namespace OrvaDRCore {

namespace {

// What the record operations differ in.
struct Operation {
    const char* function;  // the name in the log lines
    const char* kind;      // the word for an invalid command
    int invalidCode;       // the error code for an invalid command
};

bool OpenFor(const char* function, SqliteDB& db)
{
    if (db.Open()) return true;
    DR_LOG_AS(function, Err, "Failed to open db [%s]", db.Connection().GetPath().c_str());
    return false;
}

// The steps before the statement of a record operation. Deletes have their own message.
bool OpenWithTable(const char* function, SqliteDB& db, const SqliteTableHandler& table)
{
    if (!OpenFor(function, db)) return false;
    if (!db.CreateTable(table)) {
        DR_LOG_AS(function, Err, "Failed to create table");
        return false;
    }
    return true;
}

// The same for the operations that take a command.
bool Prepare(const Operation& operation, SqliteDB& db, const SqliteCommand& command)
{
    SqliteConnection& connection = db.Connection();
    connection.Error().Set(ERR::ERR_DATABASE_OPERATION);
    if (!command.IsValid()) {
        connection.Refuse(operation.invalidCode);
        DR_LOG_AS(operation.function, Err, "invalid %s command [%s]", operation.kind,
                  command.ToStr().c_str());
        return false;
    }
    return OpenWithTable(operation.function, db, command.GetTable());
}

// `exec` runs the statement.
template <class Exec>
bool RunExec(const Operation& operation, SqliteDB& db, const SqliteCommand& command, Exec exec)
{
    if (!Prepare(operation, db, command)) return false;
    if (!exec()) {
        DR_LOG_AS(operation.function, Err, "Failed to exec [%s] in db[%s]",
                  command.GetCommand().c_str(), db.Connection().GetPath().c_str());
        return false;
    }
    return true;
}

// `select` runs the statement.
template <class Select>
bool RunSelect(const Operation& operation, SqliteDB& db, const SelectCommand& command,
               Select select)
{
    SqliteConnection& connection = db.Connection();
    // Not for a class that the caller has derived: its GetCommand() may do anything.
    connection.KeepLookupLock(typeid(command) == typeid(SelectCommand));
    const ScopeGuard giveBack([&] { connection.KeepLookupLock(false); });
    if (!Prepare(operation, db, command)) return false;
    const std::string statement = command.GetCommand();
    if (!select(statement)) {
        DR_LOG_AS(operation.function, Err, "Failed to select by command [%s]", statement.c_str());
        return false;
    }
    return true;
}

}  // namespace

bool SqliteDB::InsertRecord(const InsertCommand& command)
{
    // The contract gives 404 for an invalid insert, and 401 for the other invalid commands.
    const Operation operation{__func__, "insert", ERR::ERR_DATABASE_OPERATION};
    const bool isDirect = ShortcutsInUse().inserts && typeid(command) == typeid(InsertCommand);
    return RunExec(operation, *this, command, [&] {
        if (!isDirect) return Exec(command.GetCommand());
        return ExecWithRetries(
            *connection_, [&] { return connection_->Insert(command); },
            [&] { return command.GetCommand(); });
    });
}

bool SqliteDB::InsertRecords(const SqliteTableHandler& table,
                             const std::vector<SqliteValueList>& records, bool replacable)
{
    connection_->Error().Set(0);
    connection_->SetAffectedRows(0);
    if (records.empty()) return true;
    if (table.GetName().empty() || !std::all_of(records.begin(), records.end(), IsStorable)) {
        connection_->Refuse(ERR::BAD_PARAMETER);
        DR_LOG(Err, "invalid insert records: table[%s]", table.GetName().c_str());
        return false;
    }
    // Checked first: SQLite may end the transaction during the table lookup.
    const bool isNested = connection_->IsInTransaction();
    connection_->Error().Set(ERR::ERR_DATABASE_OPERATION);
    if (!OpenWithTable(__func__, *this, table)) return false;
    std::int64_t rows = 0;
    const auto insert = [&] {
        const std::int64_t before = connection_->CountAllRows();
        const bool areInserted = InsertRows(connection_->GetHandle(), table.GetName(), records,
                                            replacable, connection_->Error());
        rows = connection_->CountAllRows() - before;
        return areInserted;
    };
    const Attempts attempts =
        connection_->Retry([&] { return connection_->RunAtomically(isNested, insert); });
    if (!attempts.succeeded) {
        DR_LOG(Err, "Failed to insert [%zu] records in db[%s]", records.size(),
               connection_->GetPath().c_str());
        return false;
    }
    // Each record is a row at most; the others were changed by triggers.
    connection_->SetAffectedRows(std::min(rows, static_cast<std::int64_t>(records.size())));
    return true;
}

bool SqliteDB::UpdateRecord(const UpdateCommand& command)
{
    const auto exec = [&] { return Exec(command.GetCommand()); };
    return RunExec({__func__, "update", ERR::BAD_PARAMETER}, *this, command, exec);
}

bool SqliteDB::SelectRecords(const SelectCommand& command, std::vector<SqliteValueList>& records)
{
    const auto select = [&](const std::string& text) { return SelectByCommand(text, records); };
    return RunSelect({__func__, "select", ERR::BAD_PARAMETER}, *this, command, select);
}

bool SqliteDB::SelectRecord(const SelectCommand& command, SqliteValueList& record)
{
    const auto select = [&](const std::string& text) { return SelectByCommand(text, record); };
    return RunSelect({__func__, "select", ERR::BAD_PARAMETER}, *this, command, select);
}

bool SqliteDB::SelectRecord(const SelectCommand& command, SqliteValueList& record, bool& found)
{
    const auto select = [&](const std::string& text) { return SelectFirst(text, record, found); };
    return RunSelect({__func__, "select", ERR::BAD_PARAMETER}, *this, command, select);
}

bool SqliteDB::SelectEach(const SelectCommand& command,
                          const std::function<bool(const SqliteRow&)>& take)
{
    const auto select = [&](const std::string& text) { return SelectEachByCommand(text, take); };
    return RunSelect({__func__, "select", ERR::BAD_PARAMETER}, *this, command, select);
}

bool SqliteDB::DeleteRecord(const std::string& condition, const SqliteTableHandler& table)
{
    if (condition.empty()) {
        connection_->Refuse(ERR::BAD_PARAMETER);
        DR_LOG(Err, "invalid delete command: condition[%s]", condition.c_str());
        return false;
    }
    return DoDelete(table, condition);
}

bool SqliteDB::DeleteAllRecords(const SqliteTableHandler& table)
{
    return DoDelete(table, "");
}

bool SqliteDB::DoDelete(const SqliteTableHandler& table, const std::string& condition)
{
    if (table.GetName().empty()) {
        connection_->Refuse(ERR::BAD_PARAMETER);
        DR_LOG(Err, "invalid table:[%s]", table.GetName().c_str());
        return false;
    }
    connection_->Error().Set(ERR::ERR_DATABASE_OPERATION);
    if (!OpenFor(__func__, *this)) return false;
    if (!CreateTable(table)) {
        DR_LOG(Err, "Failed to create table [%s]", table.GetName().c_str());
        return false;
    }
    const std::string statement = GenerateDeleteCommand(table.GetName(), condition);
    if (!Exec(statement)) {
        DR_LOG(Err, "Failed to exec [%s] in db[%s]", statement.c_str(),
               connection_->GetPath().c_str());
        return false;
    }
    return true;
}

}  // namespace OrvaDRCore
