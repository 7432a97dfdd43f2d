/// \file
/// A transaction on a SqliteDB: several operations that all happen or none.
///
/// \code
///     SqliteTransaction transaction(db);
///     return transaction.Begin() && db.UpdateRecord(update) && db.InsertRecord(insert) &&
///            transaction.Commit();
///     // The destructor rolls back what is not committed.
/// \endcode
///
/// While the transaction is open, each operation of the connection is a single attempt. When one
/// fails, roll back: SQLite may have rolled back the whole transaction by itself, and the next
/// operation would run outside of it. See "All or nothing" in docs/recipes.md.
///
/// \warning Other processes cannot write to the file meanwhile. Do not fork, and do not read a
///          Cache, which forks.
/// \warning Create the tables before, and use table handlers without a schema. The table lookup is
///          a statement, too: if SQLite rolls back there, the operation runs outside of the
///          transaction.
#ifndef ORVADRCORE_SQLITE_TRANSACTION_H
#define ORVADRCORE_SQLITE_TRANSACTION_H

#include <cstdint>

#include <orvadrcore/export.h>
#include <orvadrcore/sqlite_db.h>

namespace OrvaDRCore {

/// Ends only the transaction that it began itself. The connection holds the error code and record,
/// must outlive this object, and must not be moved meanwhile. Logs as `sqlite_transaction.cpp`.
class ORVADRCORE_API SqliteTransaction {
  public:
    explicit SqliteTransaction(SqliteDB& db);  ///< Begins nothing yet.

    SqliteTransaction(const SqliteTransaction&) = delete;
    SqliteTransaction& operator=(const SqliteTransaction&) = delete;

    ~SqliteTransaction();  ///< Rolls back what is open. The error stays as it was.

    /// Opens the file if necessary and begins, with retries: other writers are waited for.
    /// \return false with 401 when a transaction is open on the connection, whoever began it
    [[nodiscard]] bool Begin();

    /// Commits, with retries: readers are waited for. The transaction may still be open after a
    /// failure, and can be committed or rolled back.
    /// \return false with 401 when there is none, and with 404 when it has ended without this
    ///         object
    [[nodiscard]] bool Commit();

    /// Rolls back in a single attempt. If that fails, closes the connection, which also rolls back.
    /// True also when nothing is open.
    /// \note Sets the error code and record like any operation.
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
