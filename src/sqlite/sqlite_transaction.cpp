#include <orvadrcore/sqlite_transaction.h>

#include <orvadrcore/errors.h>

#include "base/log.h"

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
        // Ran out of memory. The connection is closed, which has rolled back, too.
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
    Release();  // one that SQLite has ended
    db.SetErr(ERR::ERR_DATABASE_OPERATION);
    if (!db.Open()) {
        DR_LOG(Err, "Failed to open db [%s]", db.path.c_str());
        return false;
    }
    if (!Exec("BEGIN IMMEDIATE")) {
        DR_LOG(Err, "Failed to begin transaction in db[%s]", db.path.c_str());
        return false;
    }
    return true;
}

bool SqliteTransaction::Commit()
{
    if (!begun) {
        db.SetErr(ERR::BAD_PARAMETER);
        DR_LOG(Err, "no transaction to commit in db[%s]", db.path.c_str());
        return false;
    }
    if (!IsOpen()) {
        Release();
        db.SetErr(ERR::ERR_DATABASE_OPERATION);
        DR_LOG(Err, "transaction in db[%s] was rolled back", db.path.c_str());
        return false;
    }
    if (!Exec("COMMIT")) {
        DR_LOG(Err, "Failed to commit transaction in db[%s]", db.path.c_str());
        return false;
    }
    return true;
}

bool SqliteTransaction::Rollback()
{
    const bool isOpen = IsOpen();
    Release();
    db.SetErr(0);
    bool isDone = true;
    try {
        isDone = !isOpen || db.DoExecSqliteCommand("ROLLBACK");
    } catch (...) {  // ran out of memory
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

// Whether the transaction that this object began is the one that is open on the connection.
bool SqliteTransaction::IsOpen() const
{
    return db.transaction == this && db.IsInTransaction() && db.CountTransactions() == number;
}

// Begins or commits, with the retries of the connection. What is open afterwards is this object's,
// also where memory runs out.
bool SqliteTransaction::Exec(const char* statement)
{
    struct Claim {
        SqliteTransaction& transaction;
        ~Claim() { transaction.ClaimWhatIsOpen(); }
    };
    const Claim claim{*this};
    db.transaction = nullptr;
    return db.Exec(statement);
}

void SqliteTransaction::ClaimWhatIsOpen()
{
    begun = db.IsInTransaction();
    if (!begun) return;
    db.transaction = this;
    number = db.CountTransactions();
}

void SqliteTransaction::Release()
{
    begun = false;
    if (db.transaction == this) db.transaction = nullptr;
}

}  // namespace OrvaDRCore
