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
/// at a time. Nothing throws unless memory runs out; what is refused is logged (file
/// `sqlite_command.cpp`), answered by false or an empty text, and changes nothing.
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

    /// A table of that name.
    /// \param name    the table's name
    /// \param schema  what stands between the parentheses of CREATE TABLE; with an empty text
    ///                     the table is never created
    SqliteTableHandler(const std::string& name, const std::string& schema);

    SqliteTableHandler(const SqliteTableHandler&) = default;             ///< A copy of both.
    SqliteTableHandler& operator=(const SqliteTableHandler&) = default;  ///< \return this, a copy
    virtual ~SqliteTableHandler();

    /// The table's name.
    /// \return the name as it was given
    const std::string& GetName() const { return name_; }

    /// The definition of its columns.
    /// \return the schema as it was given; empty for a table that is never created
    const std::string& GetSchema() const { return schema_; }

  private:
    std::string name_;
    std::string schema_;
};

/// What SqliteDB asks of every statement. The order of the virtual operations is part of the binary
/// interface.
class ORVADRCORE_API SqliteCommand {
  public:
    virtual ~SqliteCommand();

    /// The statement.
    /// \return SQL text; empty, with a line at ERR, when the command is not valid
    virtual std::string GetCommand() const = 0;

    /// Whether everything is there that the statement needs.
    /// \return true when GetCommand() has a statement
    virtual bool IsValid() const = 0;

    /// Writes the command's parameters for a reader of the log.
    /// \param[out] out  takes the text, after what it holds already. An override may leave the stream
    ///                  in a failed state, as writing a null `const char*` does: what its operators
    ///                  write from then on is missing, and nothing else follows from it
    virtual void DumpParam(std::stringstream& out) const = 0;

    /// Sets the table.
    /// \param handler  the table, copied
    /// \return false when its name is empty, with ERR `Invalid table [%s]`; the previous one stays
    bool SetTable(const SqliteTableHandler& handler);

    /// The table.
    /// \return the table; without a name until SetTable() succeeded
    const SqliteTableHandler& GetTable() const { return table_; }

    /// The command for a reader of the log. Works on commands that are not valid, too.
    /// \return the table's name, "]" and the parameters; the bracket has no partner, on purpose
    std::string ToStr() const;

  protected:
    SqliteCommand() = default;
    SqliteCommand(const SqliteCommand&) = default;             ///< A copy of the table.
    SqliteCommand& operator=(const SqliteCommand&) = default;  ///< \return this, now such a copy

  private:
    SqliteTableHandler table_;
};

/// An INSERT of one row. Columns stand in the byte order of their names.
class ORVADRCORE_API InsertCommand : public SqliteCommand {
  public:
    InsertCommand() = default;
    InsertCommand(const InsertCommand&) = default;             ///< A copy of the command.
    InsertCommand& operator=(const InsertCommand&) = default;  ///< \return this, now such a copy
    ~InsertCommand() override;

    /// Replaces all columns by the record's.
    /// \param values  the columns and their values, copied; an empty record leaves none
    void SetFieldValues(const SqliteValueList& values);

    /// Decides what happens where a row with the same key is there.
    /// \param replacable  true for INSERT OR REPLACE, false, the default, for INSERT
    void SetReplacable(bool replacable);

    /// Adds a column; of two with the same name the later counts.
    /// \tparam T     `std::string`, `bool`, `int` or `unsigned int`
    /// \param field  the column's name, written as it stands
    /// \param value  its value; a text is quoted but not escaped
    /// \return false when `field` is empty or a text too long for a SqliteValue, with
    ///         ERR `Bad Field [%s] /value[%s]`; the columns are unchanged then
    template <class T>
    bool AddFieldValue(  // T: std::string, bool, int or unsigned int
        const std::string& field, const T& value) = delete;

    /// As above, for a text.
    /// \param field  the column's name
    /// \param text   its value
    /// \return as above; false also when `text` is null
    bool AddFieldValue(const std::string& field, const char* text);

    /// As above, for a text in a buffer.
    /// \param field  the column's name
    /// \param text   its value
    /// \return as above
    bool AddFieldValue(const std::string& field, char* text)
    {
        return AddFieldValue(field, static_cast<const char*>(text));
    }

    /// Whether there are a table and at least one column.
    /// \return true when both are there
    bool IsValid() const override;

    /// The columns and values, as they stand in the statement.
    /// \return a text like "(id,name) VALUES (1,'x')"; "() VALUES ()" without columns
    std::string ToFormatedInsertValues() const;

    /// The statement.
    /// \return SQL text, ended by ";"; when not valid, empty with ERR `Bad insert parameter`
    std::string GetCommand() const override;

    /// Writes the values for a reader of the log: "values:[id=1,name='x']".
    /// \param[out] out  takes the text
    void DumpParam(std::stringstream& out) const override;

  private:
    bool replacable_ = false;
    SqliteValueList fieldValues_;
};

/// An UPDATE of all rows that meet a condition; without a condition it is not valid.
class ORVADRCORE_API UpdateCommand : public SqliteCommand {
  public:
    UpdateCommand() = default;
    UpdateCommand(const UpdateCommand&) = default;             ///< A copy of the command.
    UpdateCommand& operator=(const UpdateCommand&) = default;  ///< \return this, now such a copy
    ~UpdateCommand() override;

    /// Replaces all columns by the record's.
    /// \param values  the columns and their values, copied; an empty record leaves none
    void SetFieldValues(const SqliteValueList& values);

    /// Adds a column; of two with the same name the later counts.
    /// \tparam T     `std::string`, `bool`, `int` or `unsigned int`
    /// \param field  the column's name, written as it stands
    /// \param value  its new value; a text is quoted but not escaped
    /// \return false as InsertCommand::AddFieldValue(), with the same line
    template <class T>
    bool AddFieldValue(  // T: std::string, bool, int or unsigned int
        const std::string& field, const T& value) = delete;

    /// As above, for a text.
    /// \param field  the column's name
    /// \param text   its new value
    /// \return as above; false also when `text` is null
    bool AddFieldValue(const std::string& field, const char* text);

    /// As above, for a text in a buffer.
    /// \param field  the column's name
    /// \param text   its value
    /// \return as above
    bool AddFieldValue(const std::string& field, char* text)
    {
        return AddFieldValue(field, static_cast<const char*>(text));
    }

    /// Sets the condition.
    /// \param text  the condition without the word WHERE, written as it stands
    /// \return false when it is empty; the previous one stays and nothing is logged, unlike in
    ///         SelectCommand
    bool SetCondition(const std::string& text);

    /// Sets the condition to the text of `object`.
    /// \param object  the condition, copied
    /// \return false when it is not valid, with ERR `Invalid condition`, or when its text is empty,
    ///         without a line; the previous condition stays
    bool SetCondition(const SqliteCondition& object);

    /// Whether there are a table, a condition and at least one column.
    /// \return true when all three are there
    bool IsValid() const override;

    /// The statement.
    /// \return SQL text without ";" at its end; when not valid, empty with ERR `Bad update command`
    std::string GetCommand() const override;

    /// Writes condition and values for a reader of the log: "condition:[id=1]/values:[name='x']".
    /// \param[out] out  takes the text
    void DumpParam(std::stringstream& out) const override;

  private:
    std::string condition_;
    SqliteValueList fieldValues_;
};

/// A SELECT of some or all columns of the rows that meet a condition, or of all rows.
class ORVADRCORE_API SelectCommand : public SqliteCommand {
  public:
    SelectCommand() = default;
    SelectCommand(const SelectCommand&) = default;             ///< A copy of the command.
    SelectCommand& operator=(const SelectCommand&) = default;  ///< \return this, now such a copy
    ~SelectCommand() override;

    /// Selects all columns; columns added before are dropped.
    void SelectAll();

    /// Adds a column, behind those added before; takes back SelectAll().
    /// \param field  the column's name, or any expression: `CAST(size AS TEXT) AS size`
    /// \return false when `field` is empty; nothing is logged
    bool AddField(const std::string& field);

    /// Sets the condition.
    /// \param text  the condition without the word WHERE, written as it stands
    /// \return false when it is empty, with ERR `Empty condition`; the previous one stays
    bool SetCondition(const std::string& text);

    /// Sets the condition to the text of `object`.
    /// \param object  the condition, copied
    /// \return false when it is not valid, with ERR `Invalid condition`, or when its text is empty,
    ///         with ERR `Empty condition`; the previous condition stays
    bool SetCondition(const SqliteCondition& object);

    /// Whether there are a table and columns. The condition may be missing.
    /// \return true when both are there
    bool IsValid() const override;

    /// The statement.
    /// \return SQL text without ";" at its end; when not valid, empty with ERR `Bad select command`
    std::string GetCommand() const override;

    /// Writes condition and columns for a reader of the log: "condition:[id=1]/fields:[id, name]",
    /// with "all" for all columns.
    /// \param[out] out  takes the text
    void DumpParam(std::stringstream& out) const override;

  private:
    bool selectAll_ = false;
    std::vector<std::string> fields_;
    std::string condition_;
};

/// \cond SPECIALISATIONS
template <>
ORVADRCORE_API bool InsertCommand::AddFieldValue<std::string>(const std::string& field,
                                                              const std::string& value);
template <>
ORVADRCORE_API bool InsertCommand::AddFieldValue<bool>(const std::string& field, const bool& value);
template <>
ORVADRCORE_API bool InsertCommand::AddFieldValue<int>(const std::string& field, const int& value);
template <>
ORVADRCORE_API bool InsertCommand::AddFieldValue<unsigned int>(const std::string& field,
                                                               const unsigned int& value);
template <>
ORVADRCORE_API bool UpdateCommand::AddFieldValue<std::string>(const std::string& field,
                                                              const std::string& value);
template <>
ORVADRCORE_API bool UpdateCommand::AddFieldValue<bool>(const std::string& field, const bool& value);
template <>
ORVADRCORE_API bool UpdateCommand::AddFieldValue<int>(const std::string& field, const int& value);
template <>
ORVADRCORE_API bool UpdateCommand::AddFieldValue<unsigned int>(const std::string& field,
                                                               const unsigned int& value);
/// \endcond

}  // namespace OrvaDRCore

#endif
