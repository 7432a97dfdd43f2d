/// \file
/// A connection to one SQLite file that makes missing tables and retries what fails.
///
/// \code
///     SqliteDB db("/var/dr/nodes.db", 3);
///     if (!db.InsertRecord(insert)) return db.GetErrCode();   // opens, makes the table, inserts
///     std::vector<SqliteValueList> rows;
///     if (!db.SelectRecords(select, rows)) return db.GetErrCode();
/// \endcode
///
/// **Retries.** Each try of a statement may wait up to a second wherever SQLite meets a lock. A
/// statement that fails, for whatever reason, is tried again after a random pause of 500 to 1000
/// milliseconds, as often as the retry limit says: limit + 1 tries in all, so that a call may block
/// for long.
///
/// **Waiting.** Many processes may use one file at the same time, and all of them get their turn. A
/// try that meets a lock tries again after 0.5 to 2.5 milliseconds, or after up to 15 where many
/// wait. A connection that had to wait pauses for up to 2.5 milliseconds when it has written for
/// six, so that others can.
/// `PRAGMA busy_timeout` answers 1000. A program that sets it gets SQLite's own waiting, which looks
/// ever more seldom, on that connection until it is opened anew.
///
/// **Errors.** Operations answer true or false. GetErrCode() and GetErr() describe the last one: 0
/// and null after a success, otherwise an ERR::Code and, for what SQLite refused, the failed
/// tries. Nothing throws unless memory runs out. Log lines name the file `sqlite_db.cpp`.
///
/// **Threads and forks.** An object is used by one thread at a time. A connection must not be used,
/// closed or destroyed in a child made by fork: open a new object there. That one is refused for
/// good where the parent was inside a transaction at the fork.
#ifndef ORVADRCORE_SQLITE_DB_H
#define ORVADRCORE_SQLITE_DB_H

#include <memory>
#include <string>
#include <vector>

#include <json/value.h>

#include <orvadrcore/export.h>
#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_value.h>

namespace OrvaDRCore {

class SqliteConnection;

/// A connection to an SQLite file. The head of sqlite_db.h tells what holds for retries, errors,
/// threads and forks.
///
/// **Error record.** For a single try that failed, the error object:
/// \code
///     {"command": "the statement", "sqlite_errcode": 5, "sqlite_errmsg": "database is locked"}
/// \endcode
/// Where operations with retries gave up, an array with one entry for each try:
/// \code
///     [{"err_code": 404, "err_code_str": "ERR_DATABASE_OPERATION", "err_msg": {"command": ...}}]
/// \endcode
class ORVADRCORE_API SqliteDB {
  public:
    /// Nothing is opened yet.
    /// \param file   the database file; Open() creates a missing one
    /// \param limit  how often a failed statement is tried again; 0 for a single try
    SqliteDB(const std::string& file, unsigned int limit);

    SqliteDB(const SqliteDB&) = delete;
    SqliteDB& operator=(const SqliteDB&) = delete;

    /// Takes the connection over, with error code and record. `other` is closed then, without an
    /// error, and still names its file.
    /// \param other  the connection to take
    /// \note Makes a connection, closed, for `other`: without memory for that the program ends.
    /// \note A transaction that is open moves along, but not the SqliteTransaction that began it,
    ///       which has nothing to commit or to roll back any more: end the transaction by Exec().
    SqliteDB(SqliteDB&& other) noexcept;

    /// Closes this connection and takes the other over, as the constructor does.
    /// \param other  the connection to take
    /// \return this connection
    SqliteDB& operator=(SqliteDB&& other) noexcept;

    /// Closes the connection.
    ~SqliteDB();

    // ------------------------------------------------------------------ records, the usual way in

    /// Opens the file, makes the table when it is missing and its handler has a schema, and
    /// inserts. The connection stays open.
    /// \param command  the statement
    /// \return false, with the error code, the lines below at ERR and those of what was called:
    ///         - 404 and `invalid insert command [%s]` for a command that is not valid (the other
    ///           operations give 401);
    ///         - 404 and `Failed to open db [%s]`, behind the WARN line of Open();
    ///         - 404 and `Failed to create table`, behind the lines of CreateTable();
    ///         - 404 and `Failed to exec [%s] in db[%s]`, behind the WARN line of Exec(); the error
    ///           record holds the failed tries
    /// \warning The look for the table, its creation and the statement are retried one after the
    ///          other: on a file that stays locked the call takes twice as long as one
    ///          statement, under a lock that comes and goes up to three times.
    bool InsertRecord(const InsertCommand& command);

    /// Inserts records, all of them or none, in one transaction and hundreds of times faster than
    /// one by one. Opens the file and makes the table as InsertRecord() does; a table that was made
    /// stays. Records may differ in their fields; their order is kept.
    ///
    /// A try is everything: BEGIN IMMEDIATE, which waits for another writer, the rows, and COMMIT;
    /// what fails is rolled back whole before the next try. Inside a transaction that is open on
    /// the connection it is a savepoint, and committing is left to whoever began.
    /// \param table       the table; its name and the fields' names are written as they stand
    /// \param records     the rows; for none nothing is opened, and the answer is true
    /// \param replacable  true for INSERT OR REPLACE, false, the default, for INSERT
    /// \return false, with the error code and a line at ERR:
    ///         - 401 and `invalid insert records: table[%s]`, before anything is opened, for a table
    ///           without a name or a record without a field;
    ///         - 404 and `Failed to open db [%s]` or `Failed to create table`, as InsertRecord();
    ///         - 404 and `Failed to insert [%zu] records in db[%s]`; the error record holds the
    ///           failed tries, and the command of each is the statement that failed: the INSERT with
    ///           its placeholders, `INSERT INTO nodes (id,name) VALUES (?,?);`, or what begins or
    ///           ends the transaction
    /// \note Where rolling back fails, for want of memory, the connection is closed to the same end.
    /// \warning Texts are stored as they are, byte for byte: unlike everywhere else they must *not*
    ///          go through SqliteValue::EscapeText(), or each quote is stored twice.
    /// \warning At some failures, such as a full disk, SQLite rolls back the whole transaction by
    ///          itself. Where that was the caller's the further tries fail without doing anything, so
    ///          that no row is stored outside of it.
    bool InsertRecords(const SqliteTableHandler& table, const std::vector<SqliteValueList>& records,
                       bool replacable = false);

    /// Updates rows; otherwise as InsertRecord().
    /// \param command  the statement
    /// \return false as InsertRecord(); but a command that is not valid gives 401 and
    ///         ERR `invalid update command [%s]`. True also when no row meets the condition
    bool UpdateRecord(const UpdateCommand& command);

    /// Selects rows; otherwise as InsertRecord(). What comes out of a row, and the warnings, stand
    /// at SelectByCommand().
    /// \param command          the statement
    /// \param[in,out] records  the rows are appended to it; a failure may leave rows there, too
    /// \return false as InsertRecord(); but a command that is not valid gives 401 and
    ///         ERR `invalid select command [%s]`, and a statement that fails
    ///         404 and ERR `Failed to select by command [%s]`. True also without a row
    bool SelectRecords(const SelectCommand& command, std::vector<SqliteValueList>& records);

    /// As SelectRecords(), for the first row alone.
    /// \param command      the statement
    /// \param[out] record  the row; untouched when there is none, and on failure
    /// \return as above
    bool SelectRecord(const SelectCommand& command, SqliteValueList& record);

    /// Deletes the rows that meet a condition. Note the order of the arguments.
    /// \param condition  the condition without the word WHERE, written as it stands
    /// \param table      the table
    /// \return false with 401 and ERR `invalid delete command: condition[%s]` for an empty
    ///         condition, otherwise as DoDelete()
    bool DeleteRecord(const std::string& condition, const SqliteTableHandler& table);

    /// Deletes all rows. As DoDelete() without a condition.
    /// \param table  the table
    /// \return as DoDelete()
    bool DeleteAllRecords(const SqliteTableHandler& table);

    /// Opens the file, makes the table when it is missing, and deletes the rows that meet the
    /// condition, or all rows when it is empty.
    /// \param table      the table
    /// \param condition  the condition without the word WHERE, written as it stands
    /// \return false, with the error code and a line at ERR: 401 and `invalid table:[%s]` for a
    ///         table without a name; 404 and `Failed to open db [%s]`,
    ///         `Failed to create table [%s]` or `Failed to exec [%s] in db[%s]`, each behind the
    ///         lines of what was called. True also when no row meets the condition
    bool DoDelete(const SqliteTableHandler& table, const std::string& condition);

    // ------------------------------------------------------------------------------------- tables

    /// Whether a table is there: one query with retries, on an open connection.
    /// \param table  the table's name
    /// \return true when it is; false also when the query fails, with the code and the line of
    ///         SelectByCommand()
    /// \warning The name is not escaped.
    bool IsTableExisted(const std::string& table);

    /// Makes a table that is missing, on an open connection. Without a schema it does nothing.
    /// \param table  the table
    /// \return false when there is a schema but no name, with ERR `Invalid table [%s]` and the
    ///         error code left as it was; and when the creation fails, with the code of Exec() and
    ///         ERR `Failed to create table [%s] with cmd[%s]` behind its line
    bool CreateTable(const SqliteTableHandler& table);

    /// The statement that deletes.
    /// \param table      the table's name, written as it stands
    /// \param condition  the condition without the word WHERE, likewise; empty for all rows
    /// \return "DELETE FROM t WHERE c;", or "DELETE FROM t;" for an empty condition; empty for an
    ///         empty table name, with ERR `empty table`
    std::string GenerateDeleteCommand(const std::string& table, const std::string& condition) const;

    // --------------------------------------------------------------------------------- statements

    /// Runs a statement that gives no rows, on an open connection, with retries.
    /// \param command  the statement
    /// \return false, with the error code and a line: 403 and ERR `DB[%s] is not opened`; 401 and
    ///         ERR `empty command to exec db[%s]`; 404 and WARN
    ///         `Reach retry limit [%u], failed to exec command [%s] with err[%s]` (the number is
    ///         that of the tries)
    /// \note A success after failures says so at INFO:
    ///       `After retry [%u] times, success to exec command [%s], previous errors[%s]`.
    /// \warning The whole text is run on each try. Of several statements in one text the first ones
    ///          are repeated when a later one fails, and a failing "BEGIN; ..." leaves its
    ///          transaction open: run BEGIN, the statements and COMMIT one by one.
    bool Exec(const std::string& command);

    /// Runs a SELECT, on an open connection, with retries, and gives its first row.
    ///
    /// A row becomes a record by column name, `AS` included. A text is read up to its first zero
    /// byte. NULL columns are left out, with WARN `field [%s] has null value`, and so are real
    /// numbers and blobs, with WARN `Not supported type [%d] with field [%s]` (SQLite's number of
    /// the type), both in the function `ParseRecord`. Of two columns with one name the later that
    /// is not NULL counts. A column whose name is empty is left out with the line of
    /// SqliteValueList::AddValue().
    /// \param command      the statement
    /// \param[out] record  the first row; untouched when there is none, and on failure
    /// \return true also without a row. False with 401 and ERR `Empty command to select record`; or
    ///         404 and WARN `Reach retry limit [%u], failed to select command with errors[%s] `,
    ///         with a blank at the end (a closed connection ends here, too)
    /// \note A success after failures says so at INFO:
    ///       `After retry [%u] times, success to exec command [%s], previous errs[%s]`.
    /// \note The line ERR `Null Pointer` (function `ParseRecord`) guards the reading of rows; no
    ///       statement leads to it.
    /// \warning Integers are read as 32 bits: larger ones arrive truncated. Select such a column as
    ///          text, `CAST(size AS TEXT) AS size`.
    /// \note A statement that changes the file runs through here, too. Its row, of a `RETURNING`
    ///       clause, counts only when the change is committed: where committing fails, the try does.
    bool SelectByCommand(const std::string& command, SqliteValueList& record);

    /// As above, for all rows.
    /// \param command          the statement
    /// \param[in,out] records  the rows are appended to it
    /// \return true also without a row. False with 401 and ERR `Empty command to select records`;
    ///         or 404 and WARN
    ///         `Reach retry limit [%u], failed to exec command [%s] with errors [%s]`
    /// \note A success after failures says so at INFO:
    ///       `After retry [%u] times, success to select command, previous errs [%s]`.
    /// \warning The vector is never emptied. A try that fails in the middle leaves its rows there
    ///          and the next try appends all rows again: where a row must not come twice, compare
    ///          keys, or take GetErrCode() and a fresh vector and call again.
    bool SelectByCommand(const std::string& command, std::vector<SqliteValueList>& records);

    // --------------------------------------------------------------------------------- connection

    /// Opens the file, unless it is open, and sets the busy timeout of a second. The error code and
    /// record stay as they are. A file that cannot be opened for writing, for want of rights or of
    /// descriptors, SQLite opens for reading: statements that write then fail until the connection
    /// is closed.
    /// \return false, with WARN `Failed to open db[%s]`, the connection closed; or with WARN
    ///         `Failed to set busy timeout with error`, the connection open: the next call answers
    ///         true
    bool Open();

    /// Closes the connection, if there is one. A transaction that is open is rolled back.
    void Close();

    // ------------------------------------------------------------------------------------- errors

    /// The error code of the last operation.
    /// \return 0 after a success, otherwise an ERR::Code
    int GetErrCode() const;

    /// The error record of the last operation.
    /// \return null after a success and where SQLite was not asked, otherwise the record; good
    ///         until the next operation
    const Json::Value& GetErr() const;

    /// Records a failure of SQLite: code 404 and an error object.
    /// \param command     the statement; left out of the object when empty, and when it has 2 GiB or
    ///                    more, which no JSON value can hold
    /// \param sqliteCode  SQLite's result code; left out when 0
    /// \param message     SQLite's text; null takes the connection's last one. In the object it is
    ///                    null when it has 2 GiB or more
    void SetDBErr(const std::string& command, int sqliteCode, const char* message) const;

    // ---------------------------------------------------------------------------- single tries

    /// One try of Exec(): no checks, no retries and no line.
    /// \param command  the statement
    /// \return false with 404 and the error object. On success the error code stays as it was
    bool DoExecSqliteCommand(const std::string& command);

    /// One try of the one-row SelectByCommand(), without its checks and its line.
    /// \param command      the statement
    /// \param[out] record  the first row; untouched when there is none, and on failure
    /// \return true, with 0, also without a row; false with 404 and the error object
    bool DoSelectSqliteRecord(const std::string& command, SqliteValueList& record);

    /// One try of the many-rows SelectByCommand(), without its checks and its line.
    /// \param command          the statement
    /// \param[in,out] records  the rows are appended to it, those before a failure, too
    /// \return as above
    bool DoSelectSqliteRecords(const std::string& command, std::vector<SqliteValueList>& records);

    /// \cond INTERNAL
    /// For the library's own sources, which alone know the type.
    ORVADRCORE_LOCAL SqliteConnection& Connection() const;
    /// \endcond

  private:
    std::unique_ptr<SqliteConnection> connection_;
};

}  // namespace OrvaDRCore

#endif
