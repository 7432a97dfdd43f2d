/// \file
/// Statement builders: a table, and INSERT, UPDATE and SELECT statements on it.
///
/// \code
///     const SqliteTableHandler nodes("nodes", "id INTEGER PRIMARY KEY, name TEXT");
///     InsertCommand insert;
///     insert.SetTable(nodes);
///     insert.AddFieldValue("id", 1);
///     insert.AddFieldValue("name", "backup");
///     insert.GetCommand();   // "INSERT INTO nodes (id,name) VALUES (1,'backup');"
/// \endcode
///
/// Builders own copies of all that they are given and keep no pointers; each is used by one thread
/// at a time. Nothing throws; what is refused is logged (file `sqlite_command.cpp`), answered by
/// false or an empty text, and changes nothing.
///
/// \warning Table names, field names, schemas and condition texts are written into the statement as
///          they stand, and text values are quoted but not escaped: see
///          SqliteValue::ToFormatedValue().
#ifndef ORVADRCORE_SQLITE_COMMAND_H
#define ORVADRCORE_SQLITE_COMMAND_H

#include <sstream>
#include <string>
#include <vector>

#include <orvadrcore/export.h>
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_value.h>

namespace OrvaDRCore {

/// A table: its name, and the definition of its columns, from which SqliteDB makes it when it is
/// missing. Nothing is checked here; operations refuse an empty name.
class ORVADRCORE_API SqliteTableHandler {
  public:
    SqliteTableHandler() = default;

    /// \param tableName    the table's name
    /// \param tableSchema  what stands between the parentheses of CREATE TABLE; with an empty text
    ///                     the table is never created
    SqliteTableHandler(const std::string& tableName, const std::string& tableSchema);

    SqliteTableHandler(const SqliteTableHandler&) = default;
    SqliteTableHandler& operator=(const SqliteTableHandler&) = default;
    virtual ~SqliteTableHandler();

    const std::string& GetName() const { return name; }      ///< The table's name.
    const std::string& GetSchema() const { return schema; }  ///< The definition of its columns.

  private:
    std::string name;
    std::string schema;
};

/// What SqliteDB asks of every statement. The order of the virtual operations is part of the binary
/// interface.
class ORVADRCORE_API SqliteCommand {
  public:
    virtual ~SqliteCommand();

    /// The statement; empty, with a line at ERR, when the command is not valid.
    virtual std::string GetCommand() const = 0;

    /// Whether everything is there that the statement needs.
    virtual bool IsValid() const = 0;

    /// Writes the command's parameters for a reader of the log.
    virtual void DumpParam(std::stringstream& out) const = 0;

    /// Sets the table.
    /// \return false when its name is empty, with ERR "Invalid table [%s]"
    bool SetTable(const SqliteTableHandler& handler);

    /// The table; without a name until SetTable() succeeded.
    const SqliteTableHandler& GetTable() const { return table; }

    /// The command for a reader of the log: the table's name, "]" and the parameters. The bracket
    /// has no partner, on purpose. Works on commands that are not valid, too.
    std::string ToStr() const;

  protected:
    SqliteCommand() = default;
    SqliteCommand(const SqliteCommand&) = default;
    SqliteCommand& operator=(const SqliteCommand&) = default;

  private:
    SqliteTableHandler table;
};

/// An INSERT of one row. Columns stand in the byte order of their names.
class ORVADRCORE_API InsertCommand : public SqliteCommand {
  public:
    InsertCommand() = default;
    InsertCommand(const InsertCommand&) = default;
    InsertCommand& operator=(const InsertCommand&) = default;
    ~InsertCommand() override;

    /// Replaces all columns by the record's.
    void SetFieldValues(const SqliteValueList& values);

    /// With true the statement becomes INSERT OR REPLACE.
    void SetReplacable(bool allowed);

    /// Adds a column; of two with the same name the later counts.
    /// \tparam T  `std::string`, `bool`, `int` or `unsigned int`
    /// \return false when `field` is empty (or a text null), with ERR
    ///         "Bad Field [%s] /value[%s]"
    template <class T>
    bool AddFieldValue(const std::string& field, const T& value);
    bool AddFieldValue(const std::string& field, const char* text);  ///< A text, as above.

    /// Whether there are a table and at least one column.
    bool IsValid() const override;

    /// The columns and values: "(id,name) VALUES (1,'x')".
    std::string ToFormatedInsertValues() const;

    /// The statement, ended by ";"; when not valid, empty with ERR "Bad insert parameter".
    std::string GetCommand() const override;

    void DumpParam(std::stringstream& out) const override;

  private:
    bool replacable = false;
    SqliteValueList fieldValues;
};

/// An UPDATE of all rows that meet a condition; without a condition it is not valid.
class ORVADRCORE_API UpdateCommand : public SqliteCommand {
  public:
    UpdateCommand() = default;
    UpdateCommand(const UpdateCommand&) = default;
    UpdateCommand& operator=(const UpdateCommand&) = default;
    ~UpdateCommand() override;

    /// Replaces all columns by the record's.
    void SetFieldValues(const SqliteValueList& values);

    /// As InsertCommand::AddFieldValue().
    template <class T>
    bool AddFieldValue(const std::string& field, const T& value);
    bool AddFieldValue(const std::string& field, const char* text);  ///< A text, as above.

    /// Sets the condition, given without the word WHERE.
    /// \return false when it is empty; nothing is logged, unlike in SelectCommand
    bool SetCondition(const std::string& text);

    /// Sets the condition to the text of `object`.
    /// \return false when it is not valid, with ERR "Invalid condition", or when its text is empty
    bool SetCondition(const SqliteCondition& object);

    /// Whether there are a table, a condition and at least one column.
    bool IsValid() const override;

    /// The statement, without ";" at its end; when not valid, empty with ERR "Bad update command".
    std::string GetCommand() const override;

    void DumpParam(std::stringstream& out) const override;

  private:
    std::string condition;
    SqliteValueList fieldValues;
};

/// A SELECT of some or all columns of the rows that meet a condition, or of all rows.
class ORVADRCORE_API SelectCommand : public SqliteCommand {
  public:
    SelectCommand() = default;
    SelectCommand(const SelectCommand&) = default;
    SelectCommand& operator=(const SelectCommand&) = default;
    ~SelectCommand() override;

    /// Selects all columns; columns added before are dropped.
    void SelectAll();

    /// Adds a column, behind those added before; takes back SelectAll(). Any expression will do:
    /// `CAST(size AS TEXT) AS size`.
    /// \return false when `field` is empty; nothing is logged
    bool AddField(const std::string& field);

    /// Sets the condition, given without the word WHERE.
    /// \return false when it is empty, with ERR "Empty condition"; the previous one stays
    bool SetCondition(const std::string& text);

    /// Sets the condition to the text of `object`.
    /// \return false when it is not valid, with ERR "Invalid condition", or when its text is empty,
    ///         with ERR "Empty condition"; the previous condition stays
    bool SetCondition(const SqliteCondition& object);

    /// Whether there are a table and columns. The condition may be missing.
    bool IsValid() const override;

    /// The statement, without ";" at its end; when not valid, empty with ERR "Bad select command".
    std::string GetCommand() const override;

    void DumpParam(std::stringstream& out) const override;

  private:
    bool selectAll = false;
    std::vector<std::string> fields;
    std::string condition;
};

extern template bool InsertCommand::AddFieldValue(const std::string&, const std::string&);
extern template bool InsertCommand::AddFieldValue(const std::string&, const bool&);
extern template bool InsertCommand::AddFieldValue(const std::string&, const int&);
extern template bool InsertCommand::AddFieldValue(const std::string&, const unsigned int&);
extern template bool UpdateCommand::AddFieldValue(const std::string&, const std::string&);
extern template bool UpdateCommand::AddFieldValue(const std::string&, const bool&);
extern template bool UpdateCommand::AddFieldValue(const std::string&, const int&);
extern template bool UpdateCommand::AddFieldValue(const std::string&, const unsigned int&);

}  // namespace OrvaDRCore

#endif
