#include <orvadrcore/sqlite_db.h>

#include <sqlite3.h>

#include <algorithm>
#include <map>
#include <memory>
#include <optional>
#include <utility>

#include <orvadrcore/errors.h>
#include <orvadrcore/utils.h>

#include "base/json_helpers.h"
#include "base/log.h"
#include "base/retry.h"
#include "sqlite/sqlite_internals.h"
#include "sqlite/sqlite_state.h"

namespace OrvaDRCore {

namespace {

// The pause between tries: random, so that competing writers come apart.
constexpr unsigned int MinPauseMSec = 500;
constexpr unsigned int MaxPauseMSec = 1000;

struct FreeText {
    void operator()(char* text) const { sqlite3_free(text); }
};

// Whether SQLite can store a record: a field at least, and values that are there. A list holds no
// others, unless somebody has written into it through a reference that promised not to be.
bool IsStorable(const SqliteValueList& record)
{
    const auto& values = record.GetValues();
    return !values.empty() && std::all_of(values.begin(), values.end(),
                                          [](const auto& field) { return field.second.IsValid(); });
}

bool HaveSameFields(const SqliteValueList& one, const SqliteValueList& other)
{
    const auto& left = one.GetValues();
    const auto& right = other.GetValues();
    return std::equal(left.begin(), left.end(), right.begin(), right.end(),
                      [](const auto& a, const auto& b) { return a.first == b.first; });
}

// Orders records by the names of their fields: statements are kept by the first record of a kind.
struct ByFields {
    bool operator()(const SqliteValueList* one, const SqliteValueList* other) const
    {
        const auto& left = one->GetValues();
        const auto& right = other->GetValues();
        return std::lexicographical_compare(
            left.begin(), left.end(), right.begin(), right.end(),
            [](const auto& a, const auto& b) { return a.first < b.first; });
    }
};

// What begins, ends and undoes work that happens whole or not at all.
struct Bracket {
    const char* begin;
    const char* end;
    const char* undo;
};
// IMMEDIATE: another writer is met, and waited for, before the first row.
constexpr Bracket Transaction{"BEGIN IMMEDIATE", "COMMIT", "ROLLBACK"};
constexpr Bracket Savepoint{"SAVEPOINT orvadr_insert", "RELEASE orvadr_insert",
                            "ROLLBACK TO orvadr_insert; RELEASE orvadr_insert"};

// The names of a statement's columns, which are the same for all of its rows.
std::vector<std::string> ColumnNames(sqlite3_stmt* statement)
{
    std::vector<std::string> names;
    const int columns = sqlite3_column_count(statement);
    for (int column = 0; column < columns; ++column) {
        const char* name = sqlite3_column_name(statement, column);  // null when memory is short
        names.emplace_back(name != nullptr ? name : "");
    }
    return names;
}

// The current row of a statement.
SqliteValueList ParseRecord(sqlite3_stmt* statement, const std::vector<std::string>& names)
{
    SqliteValueList record;
    if (statement == nullptr) {
        DR_LOG(Err, "Null Pointer");
        return record;
    }
    int column = 0;
    for (const std::string& name : names) {
        const int type = sqlite3_column_type(statement, column);
        // The pointer is null for a text when memory is short.
        const unsigned char* text =
            type == SQLITE_TEXT ? sqlite3_column_text(statement, column) : nullptr;
        if (type == SQLITE_INTEGER) {
            SqliteInternals::Add(record, name, sqlite3_column_int(statement, column));
        } else if (text != nullptr) {
            SqliteInternals::Add(record, name, reinterpret_cast<const char*>(text));
        } else if (type == SQLITE_NULL || type == SQLITE_TEXT) {
            DR_LOG(Warn, "field [%s] has null value", name.c_str());
        } else {
            DR_LOG(Warn, "Not supported type [%d] with field [%s]", type, name.c_str());
        }
        ++column;
    }
    return record;
}

// What takes all rows.
auto AppendTo(std::vector<SqliteValueList>& records)
{
    return [&records](sqlite3_stmt* statement, const std::vector<std::string>& names) {
        records.push_back(ParseRecord(statement, names));
        return true;
    };
}

}  // namespace

// How a statement with retries went.
struct SqliteDB::Tries {
    bool succeeded;
    unsigned int failures;
    std::string errors;  // the failed tries, as text for the log; empty when there are none
};

// What the record operations differ in.
struct SqliteDB::Operation {
    const char* function;  // the name that log lines carry
    const char* kind;      // the word for an invalid command
    int invalidCode;       // the error code for an invalid command
};

SqliteDB::SqliteDB(const std::string& file, unsigned int limit) : path(file), retryLimit(limit) {}

SqliteDB::SqliteDB(SqliteDB&& other) noexcept
    : errCode(std::exchange(other.errCode, 0)),
      errRecord(std::move(other.errRecord)),
      handle(std::exchange(other.handle, nullptr)),
      // A copy: for an empty path SQLite would open a temporary file.
      path(other.path),  // NOLINT(performance-move-constructor-init)
      retryLimit(other.retryLimit),
      state(std::move(other.state))
{
    other.transaction = nullptr;  // it refers to the other object, which has no connection now
}

SqliteDB& SqliteDB::operator=(SqliteDB&& other) noexcept
{
    if (this != &other) {
        Close();
        errCode = std::exchange(other.errCode, 0);
        errRecord = std::exchange(other.errRecord, Json::Value());
        handle = std::exchange(other.handle, nullptr);
        path = other.path;
        retryLimit = other.retryLimit;
        state = std::move(other.state);
        transaction = other.transaction = nullptr;
    }
    return *this;
}

SqliteDB::~SqliteDB()
{
    Close();
}

bool SqliteDB::InsertRecord(const InsertCommand& command)
{
    // An invalid insert stays at 404 where the other operations answer 401, on purpose.
    return ExecCommand({__func__, "insert", ERR::ERR_DATABASE_OPERATION}, command);
}

bool SqliteDB::InsertRecords(const SqliteTableHandler& table,
                             const std::vector<SqliteValueList>& records, bool replacable)
{
    SetErr(0);
    if (records.empty()) return true;
    if (table.GetName().empty() || !std::all_of(records.begin(), records.end(), IsStorable)) {
        SetErr(ERR::BAD_PARAMETER);
        DR_LOG(Err, "invalid insert records: table[%s]", table.GetName().c_str());
        return false;
    }
    // Checked first: SQLite may end the transaction during the table lookup.
    const bool isNested = IsInTransaction();
    SetErr(ERR::ERR_DATABASE_OPERATION);
    if (!OpenWithTable(__func__, table)) return false;
    const Tries tries = TryRepeatedly([&] {
        return DoWhole(isNested, [&] { return InsertRows(table.GetName(), records, replacable); });
    });
    if (!tries.succeeded) {
        DR_LOG(Err, "Failed to insert [%zu] records in db[%s]", records.size(), path.c_str());
    }
    return tries.succeeded;
}

bool SqliteDB::UpdateRecord(const UpdateCommand& command)
{
    return ExecCommand({__func__, "update", ERR::BAD_PARAMETER}, command);
}

bool SqliteDB::SelectRecords(const SelectCommand& command, std::vector<SqliteValueList>& records)
{
    return SelectCommandInto({__func__, "select", ERR::BAD_PARAMETER}, command, records);
}

bool SqliteDB::SelectRecord(const SelectCommand& command, SqliteValueList& record)
{
    return SelectCommandInto({__func__, "select", ERR::BAD_PARAMETER}, command, record);
}

bool SqliteDB::DeleteRecord(const std::string& condition, const SqliteTableHandler& table)
{
    if (condition.empty()) {
        SetErr(ERR::BAD_PARAMETER);
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
        SetErr(ERR::BAD_PARAMETER);
        DR_LOG(Err, "invalid table:[%s]", table.GetName().c_str());
        return false;
    }
    SetErr(ERR::ERR_DATABASE_OPERATION);
    if (!OpenFor(__func__)) return false;
    if (!CreateTable(table)) {
        DR_LOG(Err, "Failed to create table [%s]", table.GetName().c_str());
        return false;
    }
    const std::string statement = GenerateDeleteCommand(table.GetName(), condition);
    if (!Exec(statement)) {
        DR_LOG(Err, "Failed to exec [%s] in db[%s]", statement.c_str(), path.c_str());
        return false;
    }
    return true;
}

bool SqliteDB::IsTableExisted(const std::string& table)
{
    // The rows alone decide: a failed query counts as a missing table.
    bool isFound = false;
    SelectRows("SELECT 1 FROM sqlite_master WHERE type='table' AND name='" + table + "';",
               [&](sqlite3_stmt*, const std::vector<std::string>&) { return isFound = true; });
    return isFound;
}

bool SqliteDB::CreateTable(const SqliteTableHandler& table)
{
    // The schema comes first, on purpose: without one nothing is asked for, not even a name.
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
    std::string text = "DELETE FROM " + table;
    if (!condition.empty()) text += " WHERE " + condition;
    return text + ";";
}

bool SqliteDB::Exec(const std::string& command)
{
    if (handle == nullptr) {
        SetErr(ERR::ERR_NULL_POINTER);
        DR_LOG(Err, "DB[%s] is not opened", path.c_str());
        return false;
    }
    if (command.empty()) {
        SetErr(ERR::BAD_PARAMETER);
        DR_LOG(Err, "empty command to exec db[%s]", path.c_str());
        return false;
    }
    const Tries tries = TryRepeatedly([&] { return DoExecSqliteCommand(command); });
    if (!tries.succeeded) {
        DR_LOG(Warn, "Reach retry limit [%u], failed to exec command [%s] with err[%s]",
               tries.failures, command.c_str(), tries.errors.c_str());
    } else if (tries.failures > 0) {
        DR_LOG(Info, "After retry [%u] times, success to exec command [%s], previous errors[%s]",
               tries.failures, command.c_str(), tries.errors.c_str());
    }
    return tries.succeeded;
}

bool SqliteDB::SelectByCommand(const std::string& command, SqliteValueList& record)
{
    if (command.empty()) {
        SetErr(ERR::BAD_PARAMETER);
        DR_LOG(Err, "Empty command to select record");
        return false;
    }
    const Tries tries = TryRepeatedly([&] { return DoSelectSqliteRecord(command, record); });
    if (!tries.succeeded) {
        DR_LOG(Warn, "Reach retry limit [%u], failed to select command with errors[%s] ",
               tries.failures, tries.errors.c_str());
    } else if (tries.failures > 0) {
        DR_LOG(Info, "After retry [%u] times, success to exec command [%s], previous errs[%s]",
               tries.failures, command.c_str(), tries.errors.c_str());
    }
    return tries.succeeded;
}

bool SqliteDB::SelectByCommand(const std::string& command, std::vector<SqliteValueList>& records)
{
    if (command.empty()) {
        SetErr(ERR::BAD_PARAMETER);
        DR_LOG(Err, "Empty command to select records");
        return false;
    }
    return SelectRows(command, AppendTo(records));
}

// The many-rows form, which gives each row to `takeRow`.
template <class TakeRow>
bool SqliteDB::SelectRows(const std::string& command, TakeRow takeRow)
{
    constexpr const char* Function = "SelectByCommand";
    const Tries tries = TryRepeatedly([&] { return DoSelect(command, takeRow); });
    if (!tries.succeeded) {
        DR_LOG_AS(Function, Warn,
                  "Reach retry limit [%u], failed to exec command [%s] with errors [%s]",
                  tries.failures, command.c_str(), tries.errors.c_str());
    } else if (tries.failures > 0) {
        DR_LOG_AS(Function, Info,
                  "After retry [%u] times, success to select command, previous errs [%s]",
                  tries.failures, tries.errors.c_str());
    }
    return tries.succeeded;
}

bool SqliteDB::Open()
{
    if (handle != nullptr) return true;
    ConnectionState& own = State();
    if (sqlite3_open(path.c_str(), &handle) != SQLITE_OK) {
        Close();  // SQLite may hand out a handle also when it fails
        DR_LOG(Warn, "Failed to open db[%s]", path.c_str());
        return false;
    }
    own.watch.Start(handle);
    if (sqlite3_busy_timeout(handle, BusyTimeoutMSec) != SQLITE_OK) {
        // The connection stays open, on purpose: the next call answers true.
        DR_LOG(Warn, "Failed to set busy timeout with error");
        return false;
    }
    own.wait.Install(handle);
    return true;
}

void SqliteDB::Close()
{
    if (handle == nullptr) return;
    state->wait.Forget();
    state->cache.Clear();  // SQLite closes no connection that has statements
    sqlite3_close(handle);
    handle = nullptr;
}

void SqliteDB::SetDBErr(const std::string& command, int sqliteCode, const char* message) const
{
    Json::Value record(Json::objectValue);
    if (!command.empty() && FitsJsonText(command.size())) record["command"] = command;
    if (sqliteCode != SQLITE_OK) record["sqlite_errcode"] = sqliteCode;
    record["sqlite_errmsg"] = ToJsonText(message != nullptr ? message : sqlite3_errmsg(handle));
    errCode = ERR::ERR_DATABASE_OPERATION;
    errRecord.swap(record);
}

bool SqliteDB::DoExecSqliteCommand(const std::string& command)
{
    ConnectionState& own = State();
    const BusyTimeoutAccess access(own.wait, own.watch, command);
    if (!IsInTransaction()) own.wait.GiveWay();
    char* text = nullptr;  // SQLite leaves it alone when the handle is null
    Statement refused;
    const int code = IsTooLong(command)
                         ? PrepareStatement(handle, command, refused)
                         : sqlite3_exec(handle, command.c_str(), nullptr, nullptr, &text);
    const std::unique_ptr<char, FreeText> message(text);
    if (!IsInTransaction()) own.wait.NoteRelease();
    if (code != SQLITE_OK) SetDBErr(command, code, message.get());
    return code == SQLITE_OK;
}

bool SqliteDB::DoSelectSqliteRecord(const std::string& command, SqliteValueList& record)
{
    std::optional<SqliteValueList> first;  // a row that is not committed is none
    const auto takeFirst = [&](sqlite3_stmt* statement, const auto& names) {
        first = ParseRecord(statement, names);
        return false;
    };
    if (!DoSelect(command, takeFirst)) return false;
    if (first) record = std::move(*first);
    return true;
}

bool SqliteDB::DoSelectSqliteRecords(const std::string& command,
                                     std::vector<SqliteValueList>& records)
{
    return DoSelect(command, AppendTo(records));
}

void SqliteDB::SetErr(int code) const
{
    errCode = code;
    if (!errRecord.isNull()) errRecord = Json::Value();
}

// The retry discipline of Exec and both selects: only their single tries and their words differ.
template <class Attempt>
SqliteDB::Tries SqliteDB::TryRepeatedly(Attempt attempt)
{
    Json::Value errors;
    const auto attemptAndNote = [&] {
        SetErr(0);
        if (attempt()) return true;
        Json::Value entry(Json::objectValue);
        entry["err_code"] = errCode;
        entry["err_code_str"] = ERR::ToString(errCode);
        if (!errRecord.isNull()) entry["err_msg"] = errRecord;
        errors.append(std::move(entry));
        return false;
    };
    const auto pause = [] { RandomSleepInMSec(MinPauseMSec, MaxPauseMSec); };
    const unsigned int limit = transaction != nullptr ? 0 : retryLimit;
    const RetryOutcome outcome = Retry(limit, attemptAndNote, pause);

    Tries tries{outcome.succeeded, static_cast<unsigned int>(outcome.failures), {}};
    if (outcome.failures > 0) tries.errors = toString(errors);
    if (!outcome.succeeded) {
        errCode = ERR::ERR_DATABASE_OPERATION;
        errRecord.swap(errors);
    }
    return tries;
}

// One try of a select: gives the statement at each row, and the names of its columns, to `takeRow`,
// which answers whether it wants another.
template <class TakeRow>
bool SqliteDB::DoSelect(const std::string& command, TakeRow takeRow)
{
    SetErr(ERR::ERR_DATABASE_OPERATION);
    ConnectionState& own = State();
    const BusyTimeoutAccess access(own.wait, own.watch, command);
    Statement statement;
    int code = own.cache.Take(handle, command, statement);
    if (code == SQLITE_OK) code = sqlite3_step(statement.get());
    // Read after the first step, which prepares a cached statement again if the schema changed.
    const auto names = ColumnNames(statement.get());
    while (code == SQLITE_ROW && takeRow(statement.get(), names)) {
        code = sqlite3_step(statement.get());
    }
    if (code == SQLITE_ROW) code = EndBeforeLastRow(statement.get());
    if (!IsInTransaction()) own.wait.NoteRelease();
    if (code != SQLITE_OK && code != SQLITE_DONE) {
        SetDBErr(command, code, nullptr);
        return false;
    }
    own.cache.Keep(command, std::move(statement));
    SetErr(0);
    return true;
}

ConnectionState& SqliteDB::State()
{
    if (state == nullptr) state = std::make_unique<ConnectionState>();
    return *state;
}

bool SqliteDB::IsInTransaction() const
{
    return handle != nullptr && sqlite3_get_autocommit(handle) == 0;
}

std::uint64_t SqliteDB::CountTransactions() const
{
    return state != nullptr ? state->watch.CountTransactions() : 0;
}

// Inserts row by row, up to the first that fails, with one statement for all records of a kind.
bool SqliteDB::InsertRows(const std::string& table, const std::vector<SqliteValueList>& records,
                          bool replacable)
{
    std::map<const SqliteValueList*, Statement, ByFields> statements;
    Statement* insert = nullptr;
    const SqliteValueList* last = nullptr;
    for (const SqliteValueList& record : records) {
        if (last == nullptr || !HaveSameFields(*last, record)) insert = &statements[&record];
        last = &record;
        int code = SQLITE_OK;
        if (*insert == nullptr) {
            code = PrepareStatement(handle, InsertStatement(table, record, replacable), *insert);
        }
        if (code == SQLITE_OK) code = InsertRow(insert->get(), record);
        if (code != SQLITE_OK) {
            SetDBErr(InsertStatement(table, record, replacable), code, nullptr);
            return false;
        }
    }
    return true;
}

// One try of work that happens whole or not at all; nested, within the caller's transaction.
template <class Work>
bool SqliteDB::DoWhole(bool isNested, Work work)
{
    const Bracket& bracket = isNested ? Savepoint : Transaction;
    if (isNested && !IsInTransaction()) {
        // SQLite has ended it by itself. A savepoint would begin another, which nobody asked for.
        SetDBErr(bracket.begin, SQLITE_ABORT, "the transaction was rolled back");
        return false;
    }
    if (!DoExecSqliteCommand(bracket.begin)) return false;
    // The error record stays that of the failure. What cannot be undone ends with the connection.
    const auto undo = [&] {
        if (IsInTransaction() &&
            sqlite3_exec(handle, bracket.undo, nullptr, nullptr, nullptr) != SQLITE_OK) {
            Close();
        }
    };
    try {
        if (work() && DoExecSqliteCommand(bracket.end)) return true;
    } catch (...) {  // memory is short
        undo();
        throw;
    }
    undo();
    return false;
}

bool SqliteDB::OpenFor(const char* function)
{
    if (Open()) return true;
    DR_LOG_AS(function, Err, "Failed to open db [%s]", path.c_str());
    return false;
}

// What comes before the statement in nearly every record operation; deletes have words of their own.
bool SqliteDB::OpenWithTable(const char* function, const SqliteTableHandler& table)
{
    if (!OpenFor(function)) return false;
    if (!CreateTable(table)) {
        DR_LOG_AS(function, Err, "Failed to create table");
        return false;
    }
    return true;
}

// What comes before the statement in the record operations that take a command.
bool SqliteDB::Prepare(const Operation& operation, const SqliteCommand& command)
{
    SetErr(ERR::ERR_DATABASE_OPERATION);
    if (!command.IsValid()) {
        errCode = operation.invalidCode;
        DR_LOG_AS(operation.function, Err, "invalid %s command [%s]", operation.kind,
                  command.ToStr().c_str());
        return false;
    }
    return OpenWithTable(operation.function, command.GetTable());
}

bool SqliteDB::ExecCommand(const Operation& operation, const SqliteCommand& command)
{
    if (!Prepare(operation, command)) return false;
    if (!Exec(command.GetCommand())) {
        DR_LOG_AS(operation.function, Err, "Failed to exec [%s] in db[%s]",
                  command.GetCommand().c_str(), path.c_str());
        return false;
    }
    return true;
}

// `Output` is a record or a vector of records.
template <class Output>
bool SqliteDB::SelectCommandInto(const Operation& operation, const SelectCommand& command,
                                 Output& output)
{
    if (!Prepare(operation, command)) return false;
    const std::string statement = command.GetCommand();
    if (!SelectByCommand(statement, output)) {
        DR_LOG_AS(operation.function, Err, "Failed to select by command [%s]", statement.c_str());
        return false;
    }
    return true;
}

}  // namespace OrvaDRCore
