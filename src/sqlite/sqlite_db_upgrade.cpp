// SqliteDB::Upgrade().
#define DR_LOG_FILE "sqlite_db.cpp"

#include <algorithm>

#include <orvadrcore/errors.h>
#include <orvadrcore/sqlite_db.h>

#include "base/log.h"
#include "sqlite/sqlite_connection.h"

namespace OrvaDRCore {

namespace {

using Steps = std::vector<std::string>;

// Whether there is a step for a file of this version. SQLite also stores negative versions.
bool IsBelow(int version, const Steps& steps)
{
    return version < 0 || static_cast<std::size_t>(version) < steps.size();
}

// One attempt.
bool ReadVersion(SqliteConnection& connection, int& version)
{
    return connection.Select("PRAGMA user_version", [&version](const RowReader& row) {
        version = sqlite3_value_int(row.GetValue(row.GetColumns().front()));
        return false;
    });
}

// One attempt to run the step after a version, which becomes the new version.
bool RunStep(SqliteConnection& connection, const Steps& steps, int& version)
{
    const int next = std::max(version, 0) + 1;
    connection.SetAffectedRows(0);
    if (!connection.ExecuteInTransaction(steps[static_cast<std::size_t>(next - 1)]) ||
        !connection.Execute("PRAGMA user_version=" + std::to_string(next))) {
        return false;
    }
    version = next;
    return true;
}

// Runs the step after a version, with the retries of the connection, and adds the rows that it
// has changed.
Attempts RunNextStep(SqliteConnection& connection, const Steps& steps, int& version,
                     std::int64_t& rows)
{
    bool isRun = false;
    const auto attempt = [&] {
        isRun = false;
        return connection.RunAtomically(false, [&] {
            // Another process may have upgraded the file meanwhile.
            if (!ReadVersion(connection, version)) return false;
            isRun = IsBelow(version, steps);
            return !isRun || RunStep(connection, steps, version);
        });
    };
    Attempts attempts = connection.Retry(attempt);
    if (attempts.succeeded && isRun) rows += connection.GetAffectedRows();
    return attempts;
}

}  // namespace

bool SqliteDB::Upgrade(const std::vector<std::string>& steps)
{
    SqliteConnection& connection = *connection_;
    const char* const path = connection.GetPath().c_str();
    const auto empty = std::find(steps.begin(), steps.end(), "");
    if (empty != steps.end()) {
        connection.Refuse(ERR::BAD_PARAMETER);
        DR_LOG(Err, "empty step [%td] to upgrade db[%s]", empty - steps.begin() + 1, path);
        return false;
    }
    if (connection.IsInTransaction()) {
        connection.Refuse(ERR::BAD_PARAMETER);
        DR_LOG(Err, "transaction is already open in db[%s]", path);
        return false;
    }
    connection.Refuse(ERR::ERR_DATABASE_OPERATION);
    if (!Open()) {
        DR_LOG(Err, "Failed to open db [%s]", path);
        return false;
    }
    int version = 0;
    std::int64_t rows = 0;
    Attempts attempts = connection.Retry([&] { return ReadVersion(connection, version); });
    while (attempts.succeeded && IsBelow(version, steps)) {
        attempts = RunNextStep(connection, steps, version, rows);
    }
    if (!attempts.succeeded) {
        DR_LOG(Err, "Failed to upgrade db[%s] to version [%zu] with errors[%s]", path, steps.size(),
               attempts.errors.c_str());
        return false;
    }
    if (version >= 0 && static_cast<std::size_t>(version) > steps.size()) {
        connection.Refuse(ERR::ERR_DATABASE_OPERATION);
        DR_LOG(Err, "db[%s] has version [%d], newer than [%zu]", path, version, steps.size());
        return false;
    }
    connection.SetAffectedRows(rows);
    return true;
}

}  // namespace OrvaDRCore
