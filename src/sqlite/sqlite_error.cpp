#include "sqlite/sqlite_error.h"

#include <orvadrcore/errors.h>

#include "base/json_helpers.h"

namespace OrvaDRCore {

void SqliteError::Set(int code)
{
    code_ = code;
    sqliteCode_ = 0;
    if (!record_.isNull()) record_ = Json::Value();
}

void SqliteError::SetFailure(const std::string& command, int sqliteCode, const char* message)
{
    // Complete before the old record goes: the message may be a part of it.
    Json::Value record(Json::objectValue);
    if (!command.empty() && FitsJsonText(command.size())) record["command"] = command;
    if (sqliteCode != 0) record["sqlite_errcode"] = sqliteCode;
    record["sqlite_errmsg"] = ToJsonText(message);
    code_ = ERR::ERR_DATABASE_OPERATION;
    sqliteCode_ = sqliteCode;
    record_.swap(record);
}

void SqliteError::SetFailures(Json::Value&& entries)
{
    code_ = ERR::ERR_DATABASE_OPERATION;
    record_.swap(entries);
}

Json::Value SqliteError::AsEntry() const
{
    Json::Value entry(Json::objectValue);
    entry["err_code"] = code_;
    entry["err_code_str"] = ERR::ToString(code_);
    if (!record_.isNull()) entry["err_msg"] = record_;
    return entry;
}

}  // namespace OrvaDRCore
