#include <orvadrcore/sqlite_db.h>

#include <sqlite3.h>

#include <functional>
#include <optional>
#include <utility>

#include <orvadrcore/errors.h>

#include "base/log.h"
#include "sqlite/sqlite_connection.h"
#include "sqlite/sqlite_exec.h"
#include "sqlite/sqlite_internals.h"

namespace OrvaDRCore {

namespace {

// A column that the record leaves out. A text is left out when SQLite has run out of memory.
void LogLeftOut(const std::string& name, int type)
{
    constexpr const char* Function = "ParseRecord";
    if (type == SQLITE_NULL || type == SQLITE_TEXT) {
        DR_LOG_AS(Function, Warn, "field [%s] has null value", name.c_str());
    } else {
        DR_LOG_AS(Function, Warn, "Not supported type [%d] with field [%s]", type, name.c_str());
    }
}

SqliteValueList ParseRecord(const RowReader& row)
{
    if (!row.HasStatement()) {
        DR_LOG(Err, "Null Pointer");
        return {};
    }
    return row.Read(LogLeftOut);
}

SqliteConnection::TakeRow AppendTo(std::vector<SqliteValueList>& records)
{
    return [&records](const RowReader& row) {
        records.push_back(ParseRecord(row));
        return true;
    };
}

// One attempt to select the first row.
bool DoSelectFirst(SqliteConnection& connection, const std::string& command,
                   SqliteValueList& record, bool& found)
{
    // A statement that writes may give a row and still fail to commit; the row does not count then.
    std::optional<SqliteValueList> first;
    const auto takeFirst = [&first](const RowReader& row) {
        first = ParseRecord(row);
        return false;
    };
    if (!connection.Select(command, takeFirst)) return false;
    found = first.has_value();
    if (first) record = std::move(*first);
    return true;
}

// Reports how a select of all rows went.
bool LogAttempts(const char* function, const std::string& command, const Attempts& attempts)
{
    if (!attempts.succeeded) {
        DR_LOG_AS(function, Warn,
                  "Reach retry limit [%u], failed to exec command [%s] with errors [%s]",
                  attempts.failures, command.c_str(), attempts.errors.c_str());
    } else if (attempts.failures > 0) {
        DR_LOG_AS(function, Info,
                  "After retry [%u] times, success to select command, previous errs [%s]",
                  attempts.failures, attempts.errors.c_str());
    }
    return attempts.succeeded;
}

// SelectByCommand() for all rows, each of which is given to `takeRow`.
bool SelectRows(SqliteConnection& connection, const std::string& command,
                const SqliteConnection::TakeRow& takeRow)
{
    return LogAttempts("SelectByCommand", command,
                       connection.Retry([&] { return connection.Select(command, takeRow); }));
}

// Takes the connection out of an object. The object stays usable: closed, with the same path and
// limit.
std::unique_ptr<SqliteConnection> Take(std::unique_ptr<SqliteConnection>& from)
{
    auto closed = std::make_unique<SqliteConnection>(from->GetPath(), from->GetRetryLimit());
    closed.swap(from);
    closed->SetOwner(nullptr);  // it refers to the other object
    return closed;
}

}  // namespace

SqliteDB::SqliteDB(const std::string& path, unsigned int retryLimit)
    : connection_(std::make_unique<SqliteConnection>(path, retryLimit))
{
}

SqliteDB::SqliteDB(SqliteDB&& other) noexcept : connection_(Take(other.connection_)) {}

SqliteDB& SqliteDB::operator=(SqliteDB&& other) noexcept
{
    if (this != &other) connection_ = Take(other.connection_);
    return *this;
}

SqliteDB::~SqliteDB() = default;

SqliteConnection& SqliteDB::Connection() const
{
    return *connection_;
}

bool SqliteDB::IsTableExisted(const std::string& table)
{
    // Only the row counts: the table exists if it was read, even if the lookup failed afterwards.
    bool isFound = false;
    const auto lookUp = [&] { return connection_->LookUp(table, isFound); };
    const Attempts attempts = connection_->Retry(std::cref(lookUp));  // without an allocation
    if (attempts.failures > 0) LogAttempts("SelectByCommand", TableLookup::Query(table), attempts);
    return isFound;
}

bool SqliteDB::CreateTable(const SqliteTableHandler& table)
{
    // The contract checks the schema first: without one nothing is needed, not even a name.
    if (table.GetSchema().empty()) return true;
    if (table.GetName().empty()) {
        DR_LOG(Err, "Invalid table [%s]", table.GetName().c_str());
        return false;
    }
    if (IsTableExisted(table.GetName())) return true;

    const std::string statement =
        "CREATE TABLE IF NOT EXISTS " + table.GetName() + " (" + table.GetSchema() + ")";
    if (!Exec(statement)) {
        DR_LOG(Err, "Failed to create table [%s] with cmd[%s]", table.GetName().c_str(),
               statement.c_str());
        return false;
    }
    return true;
}

std::string SqliteDB::GenerateDeleteCommand(const std::string& table,
                                            const std::string& condition) const
{
    if (table.empty()) {
        DR_LOG(Err, "empty table");
        return {};
    }
    std::string text = BeginStatement("DELETE FROM ");
    text += table;
    AppendClause(text, " WHERE ", condition);
    text += ';';
    return text;
}

bool SqliteDB::Exec(const std::string& command)
{
    if (connection_->IsOpen() && command.empty()) {
        connection_->Refuse(ERR::BAD_PARAMETER);
        DR_LOG(Err, "empty command to exec db[%s]", connection_->GetPath().c_str());
        return false;
    }
    return ExecWithRetries(
        *connection_, [&] { return DoExecSqliteCommand(command); }, [&] { return command; });
}

bool SqliteDB::SelectByCommand(const std::string& command, SqliteValueList& record)
{
    bool found = false;
    return SelectFirst(command, record, found);
}

bool SqliteDB::SelectByCommand(const std::string& command, std::vector<SqliteValueList>& records)
{
    if (command.empty()) {
        connection_->Refuse(ERR::BAD_PARAMETER);
        DR_LOG(Err, "Empty command to select records");
        return false;
    }
    return SelectRows(*connection_, command, AppendTo(records));
}

bool SqliteDB::SelectEachByCommand(const std::string& command,
                                   const std::function<bool(const SqliteRow&)>& take)
{
    SqliteConnection& connection = *connection_;  // stays where it is when this object is moved
    if (command.empty()) {
        connection.Refuse(ERR::BAD_PARAMETER);
        DR_LOG(Err, "Empty command to select records");
        return false;
    }
    if (take == nullptr) {
        connection.Refuse(ERR::BAD_PARAMETER);
        DR_LOG(Err, "no function takes the rows of [%s]", command.c_str());
        return false;
    }
    bool hasRow = false;
    const auto takeRow = [&](RowReader& reader) {
        hasRow = true;
        return take(SqliteRow(reader));
    };
    const auto select = [&] { return connection.Select(command, takeRow); };
    return LogAttempts(__func__, command, connection.Retry(select, [&] { return !hasRow; }));
}

bool SqliteDB::Open()
{
    if (connection_->IsOpen()) return true;
    if (!connection_->Open()) {
        DR_LOG(Warn, "Failed to open db[%s]", connection_->GetPath().c_str());
        return false;
    }
    if (!connection_->InstallBusyWait()) {
        // The connection stays open: the contract says that the next call returns true.
        DR_LOG(Warn, "Failed to set busy timeout with error");
        return false;
    }
    return true;
}

void SqliteDB::Close()
{
    connection_->Close();
}

int SqliteDB::GetErrCode() const
{
    return connection_->Error().GetCode();
}

const Json::Value& SqliteDB::GetErr() const
{
    return connection_->Error().GetRecord();
}

int SqliteDB::GetSqliteCode() const
{
    return connection_->Error().GetSqliteCode();
}

std::int64_t SqliteDB::GetAffectedRows() const
{
    return connection_->GetAffectedRows();
}

std::int64_t SqliteDB::GetLastInsertId() const
{
    return connection_->GetLastInsertId();
}

void SqliteDB::SetDBErr(const std::string& command, int sqliteCode, const char* message) const
{
    connection_->SetFailure(command, sqliteCode, message);
}

bool SqliteDB::DoExecSqliteCommand(const std::string& command)
{
    return connection_->Execute(command);
}

bool SqliteDB::DoSelectSqliteRecord(const std::string& command, SqliteValueList& record)
{
    bool found = false;
    return DoSelectFirst(*connection_, command, record, found);
}

bool SqliteDB::DoSelectSqliteRecords(const std::string& command,
                                     std::vector<SqliteValueList>& records)
{
    return connection_->Select(command, AppendTo(records));
}

bool SqliteDB::SelectFirst(const std::string& command, SqliteValueList& record, bool& found)
{
    constexpr const char* Function = "SelectByCommand";
    if (command.empty()) {
        connection_->Refuse(ERR::BAD_PARAMETER);
        DR_LOG_AS(Function, Err, "Empty command to select record");
        return false;
    }
    const Attempts attempts =
        connection_->Retry([&] { return DoSelectFirst(*connection_, command, record, found); });
    if (!attempts.succeeded) {
        DR_LOG_AS(Function, Warn,
                  "Reach retry limit [%u], failed to select command with errors[%s] ",
                  attempts.failures, attempts.errors.c_str());
    } else if (attempts.failures > 0) {
        DR_LOG_AS(Function, Info,
                  "After retry [%u] times, success to exec command [%s], previous errs[%s]",
                  attempts.failures, command.c_str(), attempts.errors.c_str());
    }
    return attempts.succeeded;
}

}  // namespace OrvaDRCore
