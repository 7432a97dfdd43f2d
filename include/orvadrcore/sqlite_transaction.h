/// \file
/// A transaction on a SqliteDB: several operations that happen all or not at all.
///
/// \code
///     SqliteTransaction transaction(db);
///     return transaction.Begin() && db.UpdateRecord(update) && db.InsertRecord(insert) &&
///            transaction.Commit();
///     // What is not committed is rolled back when `transaction` goes.
/// \endcode
///
/// **Between Begin() and the end each operation of the connection is a single try**, whatever its
/// retry limit; BEGIN and COMMIT are retried as ever. At some failures, such as a full disk, SQLite
/// rolls back the whole transaction by itself, and a second try would run outside of it. What fails
/// ends the transaction: do not go on to other operations, roll back.
///
/// **An object commits and rolls back what it began itself and nothing else.** Its transaction may
/// end without it: SQLite rolls back, the connection is closed, or somebody runs COMMIT or ROLLBACK
/// as a statement. Another object, or a BEGIN as a statement, may then begin another transaction on
/// the connection. The first object leaves that alone, and its Commit() says that its own is gone.
///
/// The transaction refers to its connection, which must outlive it and must not be moved meanwhile.
/// Both are used by one thread. Log lines name the file `sqlite_transaction.cpp`.
///
/// \warning Other processes cannot write to the file until the end. Do not fork either, nor read a
///          Cache, which forks: see the head of sqlite_db.h.
/// \warning Give the operations tables without a schema and make the tables beforehand. The table
///          lookup is a statement, too: where SQLite rolls back at that one, the operation goes on
///          outside of the transaction, and Commit() is the first to tell.
#ifndef ORVADRCORE_SQLITE_TRANSACTION_H
#define ORVADRCORE_SQLITE_TRANSACTION_H

#include <cstdint>

#include <orvadrcore/export.h>
#include <orvadrcore/sqlite_db.h>

namespace OrvaDRCore {

/// A transaction on a connection; one at a time. The head of sqlite_transaction.h tells what holds
/// while it is open. Error code and record are those of the connection.
class ORVADRCORE_API SqliteTransaction {
  public:
    /// Nothing is opened or begun yet.
    /// \param db  the connection, referred to
    explicit SqliteTransaction(SqliteDB& db);

    SqliteTransaction(const SqliteTransaction&) = delete;
    SqliteTransaction& operator=(const SqliteTransaction&) = delete;

    /// Rolls back what it began, if that is still open. The connection's error code and record stay
    /// as they are, so that they tell why.
    ~SqliteTransaction();

    /// Opens the file, unless it is open, and begins: BEGIN IMMEDIATE, which waits for another
    /// writer, through Exec().
    /// \return false, with the error code and a line at ERR:
    ///         - 401 and `transaction is already open in db[%s]` when one is open on the connection,
    ///           whoever began it; it stays open;
    ///         - 404 and `Failed to open db [%s]`, behind the WARN line of SqliteDB::Open();
    ///         - 404 and `Failed to begin transaction in db[%s]`, behind the WARN line of
    ///           SqliteDB::Exec(); the error record holds the failed tries
    [[nodiscard]] bool Begin();

    /// Commits, through Exec(), which waits for readers.
    /// \return false, with the error code and a line at ERR:
    ///         - 401 and `no transaction to commit in db[%s]` when none was begun, or when it has
    ///           been committed or rolled back already;
    ///         - 404 and `transaction in db[%s] was rolled back` when it is not open any more, as
    ///           the head of this file tells; nothing is run;
    ///         - 404 and `Failed to commit transaction in db[%s]`, behind the WARN line of
    ///           SqliteDB::Exec(). Unless SQLite has ended it by that, the transaction is still open
    ///           and can be committed or rolled back
    [[nodiscard]] bool Commit();

    /// Rolls back, in a single try. A failure closes the connection, which rolls back, too: the
    /// transaction is over in any case.
    /// \return true when that is done, and when there is nothing to roll back: nothing was begun, or
    ///         it is not open any more. False with 404, an error object and ERR
    ///         `Failed to roll back transaction in db[%s]`
    /// \note Like any operation it replaces the error code and record: take those that matter before,
    ///       or leave rolling back to the destructor.
    bool Rollback();

  private:
    ORVADRCORE_LOCAL bool IsOpen() const;
    ORVADRCORE_LOCAL bool Exec(const char* statement);
    ORVADRCORE_LOCAL void ClaimWhatIsOpen();
    ORVADRCORE_LOCAL void Release();

    SqliteDB& db_;
    bool hasBegun_ = false;     // and has not been told that the transaction is over
    std::uint64_t number_ = 0;  // of the transaction, among all that were begun on the connection
};

}  // namespace OrvaDRCore

#endif
