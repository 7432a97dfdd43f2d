/// \file
/// A connection to one SQLite file, which creates missing tables and retries what fails.
///
/// \code
///     SqliteDB db("/var/dr/nodes.db", 3);
///     if (!db.InsertRecord(insert)) return db.GetErrCode();   // opens, creates the table, inserts
///     std::vector<SqliteValueList> rows;
///     if (!db.SelectRecords(select, rows)) return db.GetErrCode();
/// \endcode
///
/// A failed statement is retried, whatever the failure, and each attempt waits up to a second for a
/// lock: a call may block for long. A failed operation returns false, leaves a code and a record of
/// the error, and logs as `sqlite_db.cpp`. Nothing throws unless memory runs out.
///
/// An object is used by one thread at a time. In a forked child the parent's objects must not be
/// used, closed or destroyed. docs/connection.md explains all this and lists codes and log lines.
#ifndef ORVADRCORE_SQLITE_DB_H
#define ORVADRCORE_SQLITE_DB_H

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include <json/value.h>

#include <orvadrcore/export.h>
#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_row.h>
#include <orvadrcore/sqlite_value.h>

namespace OrvaDRCore {

class SqliteConnection;

/// A connection to an SQLite file.
class ORVADRCORE_API SqliteDB {
  public:
    /// Opens nothing yet. A failed statement will be tried `retryLimit` + 1 times.
    SqliteDB(const std::string& path, unsigned int retryLimit);

    SqliteDB(const SqliteDB&) = delete;
    SqliteDB& operator=(const SqliteDB&) = delete;

    /// Takes the connection and its error. `other` is closed then, but can be opened again.
    /// \warning An open transaction moves along without its SqliteTransaction: end it by Exec().
    /// \note The program terminates if memory runs out here.
    SqliteDB(SqliteDB&& other) noexcept;
    SqliteDB& operator=(SqliteDB&& other) noexcept;  ///< Closes this connection first.

    ~SqliteDB();  ///< Closes the connection.

    // ----------------------------------------------------------------------------------- records
    // These open the file and create the table if it is missing and has a schema. The connection
    // stays open. A command that is not valid gives the code 401.

    /// \note Unlike elsewhere, a command that is not valid gives the code 404.
    bool InsertRecord(const InsertCommand& command);

    /// Inserts all records or none, in one transaction or, inside an open one, in a savepoint. An
    /// attempt is the whole of it. Much faster than one by one; the records may differ in fields.
    /// \note A plain text is stored as it is here, but read as part of a literal by InsertRecord().
    ///       A SqliteValue::Text() is stored as it is by both.
    bool InsertRecords(const SqliteTableHandler& table, const std::vector<SqliteValueList>& records,
                       bool replacable = false);

    /// True also if no row matches the condition.
    bool UpdateRecord(const UpdateCommand& command);

    /// Appends the selected rows to `records`. See SelectByCommand() for what a row becomes.
    bool SelectRecords(const SelectCommand& command, std::vector<SqliteValueList>& records);

    /// Selects the first row. `record` is unchanged when there is none.
    bool SelectRecord(const SelectCommand& command, SqliteValueList& record);

    /// The same, and tells whether there was a row.
    bool SelectRecord(const SelectCommand& command, SqliteValueList& record, bool& found);

    /// Gives each selected row to `take`, without making records. See SelectEachByCommand().
    [[nodiscard]] bool SelectEach(const SelectCommand& command,
                                  const std::function<bool(const SqliteRow&)>& take);

    /// Deletes the rows that meet the condition, which must not be empty. Note the argument order.
    bool DeleteRecord(const std::string& condition, const SqliteTableHandler& table);

    bool DeleteAllRecords(const SqliteTableHandler& table);

    /// Deletes the rows that meet the condition, or all rows if it is empty.
    bool DoDelete(const SqliteTableHandler& table, const std::string& condition);

    // ------------------------------------------------------------------------------------ tables

    /// Looks the table up on the open connection. False also when the lookup fails.
    bool IsTableExisted(const std::string& table);

    /// Creates the table on the open connection if it is missing; does nothing without a schema.
    /// \note A schema without a name is refused, and the error code stays as it was.
    bool CreateTable(const SqliteTableHandler& table);

    /// Opens the file and brings its schema to version `steps.size()` (`PRAGMA user_version`). Step n
    /// holds the statements that lead from version n-1 to n. Each is run once, in one transaction
    /// with its version, also when many processes call this at once. An attempt is a whole step.
    /// \return false with 401 for an empty step or inside a transaction; with 404, and nothing
    ///         changed, when the file's version is beyond the last step
    [[nodiscard]] bool Upgrade(const std::vector<std::string>& steps);

    /// Returns "DELETE FROM t WHERE c;", or "DELETE FROM t;" for an empty condition.
    std::string GenerateDeleteCommand(const std::string& table, const std::string& condition) const;

    // -------------------------------------------------------------------------------- statements

    /// Runs statements without rows on the open connection.
    /// \warning A retry repeats the whole text. A failed "BEGIN; ..." leaves its transaction open.
    bool Exec(const std::string& command);

    /// Selects the first row on the open connection. `record` is unchanged when there is none.
    ///
    /// NULL, real and blob columns are left out, with a WARN line, and a text ends at its first
    /// zero byte. Of columns with the same name the last that is not left out counts.
    /// \warning Integers are cut to 32 bits. SelectEachByCommand() reads all of this whole.
    bool SelectByCommand(const std::string& command, SqliteValueList& record);

    /// Appends all rows to `records`.
    /// \warning A failed attempt leaves its rows there, and the next one appends all rows again.
    bool SelectByCommand(const std::string& command, std::vector<SqliteValueList>& records);

    /// Gives each row to `take` on the open connection, in little memory. `take` returns whether it
    /// wants another row; stopping early is a success. Nothing is repeated after the first row, so
    /// no row comes twice. What `take` throws passes through, with the code 404. It may use this
    /// connection for selects, but neither destroy nor assign to this object. An empty `take` gives
    /// the code 401.
    /// \warning Without the write-ahead log nobody else can commit to the file meanwhile.
    [[nodiscard]] bool SelectEachByCommand(const std::string& command,
                                           const std::function<bool(const SqliteRow&)>& take);

    // -------------------------------------------------------------------------------- connection

    /// Opens the file unless it is open, without retries. The error stays as it was.
    /// \note SQLite opens a file that may not be written for reading only.
    bool Open();

    void Close();  ///< Rolls back an open transaction.

    // ------------------------------------------------------------------------------------ errors

    int GetErrCode() const;  ///< An ERR::Code, or 0 after a success.

    /// Null if SQLite reported no failure, an object after a single attempt, an array of all failed
    /// attempts after retries. Valid until the next operation.
    const Json::Value& GetErr() const;

    /// SQLite's extended code of the last failed attempt or Open(), 2067 for a row that is not unique;
    /// 0 after a success.
    int GetSqliteCode() const;

    /// Records a failure of SQLite. Without a message it is SQLite's last one.
    void SetDBErr(const std::string& command, int sqliteCode, const char* message) const;

    // ------------------------------------------------------------------------------------ changes

    /// The rows that the last operation with an INSERT, UPDATE or DELETE has changed, of all its
    /// statements, without those that triggers change. 0 after a failure; a select leaves it.
    std::int64_t GetAffectedRows() const;

    std::int64_t GetLastInsertId() const;  ///< The row id; 0 if this connection inserted nothing.

    // --------------------------------------------------------------------------- single attempts
    // One attempt of the operations above, without checks, retries and log lines.

    bool DoExecSqliteCommand(const std::string& command);  ///< Success leaves the error as it was.

    bool DoSelectSqliteRecord(const std::string& command, SqliteValueList& record);  ///< One row.

    /// All rows; those before a failure stay in `records`.
    bool DoSelectSqliteRecords(const std::string& command, std::vector<SqliteValueList>& records);

    /// \cond INTERNAL
    // For the library's own classes.
    ORVADRCORE_LOCAL SqliteConnection& Connection() const;
    /// \endcond

  private:
    ORVADRCORE_LOCAL bool SelectFirst(const std::string& command, SqliteValueList& record,
                                      bool& found);

    std::unique_ptr<SqliteConnection> connection_;
};

}  // namespace OrvaDRCore

#endif
