#include <orvadrcore/sqlite_transaction.h>

#include <utility>

#include <orvadrcore/errors.h>

#include "log.h"

namespace OrvaDRCore {

SqliteTransaction::SqliteTransaction(SqliteDB& connection) : db(connection) {}

SqliteTransaction::~SqliteTransaction()
{
    if (!begun) return;
    const int errCode = db.errCode;
    Json::Value errRecord;
    errRecord.swap(db.errRecord);
    try {
        Rollback();
    } catch (...) {
        // Memory is short. The connection is closed, and with it the transaction.
    }
    db.errCode = errCode;
    db.errRecord.swap(errRecord);
}

bool SqliteTransaction::Begin()
{
    if (db.IsInTransaction()) {
        db.SetErr(ERR::BAD_PARAMETER);
        DR_LOG(Err, "transaction is already open in db[%s]", db.path.c_str());
        return false;
    }
    SetBegun(false);  // one that SQLite has ended by itself
    db.SetErr(ERR::ERR_DATABASE_OPERATION);
    if (!db.Open()) {
        DR_LOG(Err, "Failed to open db [%s]", db.path.c_str());
        return false;
    }
    if (!Exec("BEGIN IMMEDIATE")) {
        DR_LOG(Err, "Failed to begin transaction in db[%s]", db.path.c_str());
        return false;
    }
    SetBegun(true);
    return true;
}

bool SqliteTransaction::Commit()
{
    if (!begun) {
        db.SetErr(ERR::BAD_PARAMETER);
        DR_LOG(Err, "no transaction to commit in db[%s]", db.path.c_str());
        return false;
    }
    SetBegun(false);
    if (!db.IsInTransaction()) {
        db.SetErr(ERR::ERR_DATABASE_OPERATION);
        DR_LOG(Err, "transaction in db[%s] was rolled back", db.path.c_str());
        return false;
    }
    if (!Exec("COMMIT")) {
        SetBegun(db.IsInTransaction());
        DR_LOG(Err, "Failed to commit transaction in db[%s]", db.path.c_str());
        return false;
    }
    return true;
}

bool SqliteTransaction::Rollback()
{
    const bool isOpen = begun && db.IsInTransaction();
    SetBegun(false);
    db.SetErr(0);
    bool isDone = true;
    try {
        isDone = !isOpen || db.DoExecSqliteCommand("ROLLBACK");
    } catch (...) {  // memory is short
        db.Close();
        throw;
    }
    if (!isDone) {
        db.Close();
        DR_LOG(Err, "Failed to roll back transaction in db[%s]", db.path.c_str());
        return false;
    }
    return true;
}

// Where memory runs out, too, what has been begun and not ended is this object's to roll back.
bool SqliteTransaction::Exec(const char* statement)
{
    try {
        return db.Exec(statement);
    } catch (...) {
        SetBegun(db.IsInTransaction());
        throw;
    }
}

// The connection's own limit holds for BEGIN and COMMIT, and for nothing between.
void SqliteTransaction::SetBegun(bool isBegun)
{
    if (begun == isBegun) return;
    begun = isBegun;
    std::swap(retryLimit, db.retryLimit);
}

}  // namespace OrvaDRCore
