#include <orvadrcore/sqlite_transaction.h>

#include <utility>

#include <orvadrcore/errors.h>

#include "base/log.h"
#include "base/scope_guard.h"
#include "sqlite/sqlite_connection.h"

namespace OrvaDRCore {

SqliteTransaction::SqliteTransaction(SqliteDB& db) : db_(db) {}

SqliteTransaction::~SqliteTransaction()
{
    if (!hasBegun_) return;
    SqliteError& error = db_.Connection().Error();
    SqliteError kept = std::exchange(error, SqliteError());
    try {
        Rollback();
    } catch (...) {
        // Memory has run out. Rollback() has closed the connection, which also rolls back.
    }
    error = std::move(kept);
}

bool SqliteTransaction::Begin()
{
    SqliteConnection& connection = db_.Connection();
    if (connection.IsInTransaction()) {
        connection.Refuse(ERR::BAD_PARAMETER);
        DR_LOG(Err, "transaction is already open in db[%s]", connection.GetPath().c_str());
        return false;
    }
    Release();  // a transaction that SQLite has ended
    connection.Error().Set(ERR::ERR_DATABASE_OPERATION);
    if (!db_.Open()) {
        DR_LOG(Err, "Failed to open db [%s]", connection.GetPath().c_str());
        return false;
    }
    if (!Exec("BEGIN IMMEDIATE")) {
        DR_LOG(Err, "Failed to begin transaction in db[%s]", connection.GetPath().c_str());
        return false;
    }
    return true;
}

bool SqliteTransaction::Commit()
{
    SqliteConnection& connection = db_.Connection();
    if (!hasBegun_) {
        connection.Refuse(ERR::BAD_PARAMETER);
        DR_LOG(Err, "no transaction to commit in db[%s]", connection.GetPath().c_str());
        return false;
    }
    if (!IsOpen()) {
        Release();
        connection.Refuse(ERR::ERR_DATABASE_OPERATION);
        DR_LOG(Err, "transaction in db[%s] was rolled back", connection.GetPath().c_str());
        return false;
    }
    if (!Exec("COMMIT")) {
        DR_LOG(Err, "Failed to commit transaction in db[%s]", connection.GetPath().c_str());
        return false;
    }
    return true;
}

bool SqliteTransaction::Rollback()
{
    SqliteConnection& connection = db_.Connection();
    const bool isOpen = IsOpen();
    Release();
    connection.Error().Set(0);
    if (!isOpen) return true;
    ScopeGuard close([&] { connection.Close(); });  // which also rolls back
    if (!connection.Execute("ROLLBACK")) {
        DR_LOG(Err, "Failed to roll back transaction in db[%s]", connection.GetPath().c_str());
        return false;
    }
    close.Dismiss();
    return true;
}

// Whether the transaction that this object began is the one that is open on the connection.
bool SqliteTransaction::IsOpen() const
{
    const SqliteConnection& connection = db_.Connection();
    return connection.GetOwner() == this && connection.IsInTransaction() &&
           connection.CountTransactions() == number_;
}

// Runs BEGIN or COMMIT, with the retries of the connection. A transaction that is open afterwards
// belongs to this object, even when memory has run out.
bool SqliteTransaction::Exec(const char* statement)
{
    const ScopeGuard claim([this] { ClaimWhatIsOpen(); });
    db_.Connection().SetOwner(nullptr);
    return db_.Exec(statement);
}

void SqliteTransaction::ClaimWhatIsOpen()
{
    SqliteConnection& connection = db_.Connection();
    hasBegun_ = connection.IsInTransaction();
    if (!hasBegun_) return;
    connection.SetOwner(this);
    number_ = connection.CountTransactions();
}

void SqliteTransaction::Release()
{
    hasBegun_ = false;
    SqliteConnection& connection = db_.Connection();
    if (connection.GetOwner() == this) connection.SetOwner(nullptr);
}

}  // namespace OrvaDRCore
