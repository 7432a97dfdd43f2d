/// \file
/// Statement builders: a table, and INSERT, UPDATE and SELECT statements on it.
///
/// \code
///     const SqliteTableHandler nodes("nodes", "id INTEGER PRIMARY KEY, name TEXT");
///     InsertCommand insert;
///     insert.SetTable(nodes);
///     insert.AddFieldValue("id", 1);
///     insert.AddFieldValue("name", SqliteValue::Text("O'Brien"));
///     insert.GetCommand();   // "INSERT INTO nodes (id,name) VALUES (1,'O''Brien');"
/// \endcode
///
/// Builders copy what they are given; each is used by one thread at a time. They throw only when
/// memory runs out. What they refuse changes nothing and gives false or an empty text, mostly with
/// a line at ERR as `sqlite_command.cpp`; docs/records.md lists the lines.
///
/// \warning Names, schemas and conditions are written as they are, and texts are quoted but not
///          escaped, except those of SqliteValue::Text().
#ifndef ORVADRCORE_SQLITE_COMMAND_H
#define ORVADRCORE_SQLITE_COMMAND_H

#include <cstdint>
#include <sstream>
#include <string>
#include <vector>

#include <orvadrcore/export.h>
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_value.h>

namespace OrvaDRCore {

/// A table's name and its columns.
class ORVADRCORE_API SqliteTableHandler {
  public:
    SqliteTableHandler() = default;

    /// The schema is the text between the parentheses of CREATE TABLE. With an empty one
    /// SqliteDB never creates the table.
    SqliteTableHandler(const std::string& name, const std::string& schema);

    SqliteTableHandler(const SqliteTableHandler&) = default;
    SqliteTableHandler& operator=(const SqliteTableHandler&) = default;
    virtual ~SqliteTableHandler();

    const std::string& GetName() const { return name_; }
    const std::string& GetSchema() const { return schema_; }

  private:
    std::string name_;
    std::string schema_;
};

/// What SqliteDB needs of every statement. The order of the virtual operations is part of the
/// binary interface.
class ORVADRCORE_API SqliteCommand {
  public:
    virtual ~SqliteCommand();

    virtual std::string GetCommand() const = 0;  ///< The statement; empty if it is not valid.
    virtual bool IsValid() const = 0;            ///< Whether the statement is complete.

    /// Appends the command's parameters for the log. A stream that an override leaves in a failed
    /// state only loses what is written to it from then on.
    virtual void DumpParam(std::stringstream& out) const = 0;

    bool SetTable(const SqliteTableHandler& handler);  ///< Refuses an empty name.
    const SqliteTableHandler& GetTable() const { return table_; }

    /// The command for the log: the table's name, "]" and the parameters. There is no "[".
    std::string ToStr() const;

  protected:
    SqliteCommand() = default;
    SqliteCommand(const SqliteCommand&) = default;
    SqliteCommand& operator=(const SqliteCommand&) = default;

  private:
    SqliteTableHandler table_;
};

/// An INSERT of one row, with the columns in the byte order of their names.
class ORVADRCORE_API InsertCommand : public SqliteCommand {
  public:
    InsertCommand() = default;
    InsertCommand(const InsertCommand&) = default;
    InsertCommand& operator=(const InsertCommand&) = default;
    ~InsertCommand() override;

    void SetFieldValues(const SqliteValueList& values);  ///< Replaces all columns.
    void SetReplacable(bool replacable);                 ///< True for INSERT OR REPLACE.

    /// Adds a column or replaces its value. Use SqliteValue::Text() for a text from outside.
    /// \return false when the name is empty, the value not valid, or the text too long for a value
    template <class T>
    bool AddFieldValue(  // T: SqliteValue, std::string, bool, int or unsigned int
        const std::string& field, const T& value) = delete;

    bool AddFieldValue(const std::string& field, const char* text);  ///< Refuses null, too.
    bool AddFieldValue(const std::string& field, char* text)
    {
        return AddFieldValue(field, static_cast<const char*>(text));
    }

    bool IsValid() const override;  ///< Whether there are a table and at least one column.

    std::string ToFormatedInsertValues() const;  ///< "(id,name) VALUES (1,'x')"

    std::string GetCommand() const override;                ///< Ends with ";".
    void DumpParam(std::stringstream& out) const override;  ///< "values:[id=1,name='x']"

  private:
    friend struct InsertInternals;

    bool replacable_ = false;
    SqliteValueList fieldValues_;
};

/// An UPDATE of all rows that meet a condition. Without a condition it is not valid.
class ORVADRCORE_API UpdateCommand : public SqliteCommand {
  public:
    UpdateCommand() = default;
    UpdateCommand(const UpdateCommand&) = default;
    UpdateCommand& operator=(const UpdateCommand&) = default;
    ~UpdateCommand() override;

    void SetFieldValues(const SqliteValueList& values);  ///< Replaces all columns.

    /// As InsertCommand::AddFieldValue().
    template <class T>
    bool AddFieldValue(  // T: SqliteValue, std::string, bool, int or unsigned int
        const std::string& field, const T& value) = delete;

    bool AddFieldValue(const std::string& field, const char* text);  ///< Refuses null, too.
    bool AddFieldValue(const std::string& field, char* text)
    {
        return AddFieldValue(field, static_cast<const char*>(text));
    }

    /// Sets the condition, without WHERE. Refuses an empty one, without a log line; the previous
    /// one stays.
    bool SetCondition(const std::string& text);
    bool SetCondition(const SqliteCondition& object);  ///< Logs one that is not valid.

    bool IsValid() const override;  ///< Whether there are a table, a condition and a column.
    std::string GetCommand() const override;                ///< Does not end with ";".
    void DumpParam(std::stringstream& out) const override;  ///< "condition:[id=1]/values:[a='x']"

  private:
    std::string condition_;
    SqliteValueList fieldValues_;
};

/// The order of the rows of a SELECT by one of its keys.
enum class SqliteOrder { Ascending, Descending };

/// A SELECT of the rows that meet a condition, or of all rows:
/// `SELECT node,sum(bytes) FROM volumes WHERE state=1 GROUP BY node ORDER BY node DESC LIMIT 20`.
class ORVADRCORE_API SelectCommand : public SqliteCommand {
  public:
    SelectCommand() = default;
    SelectCommand(const SelectCommand&) = default;
    SelectCommand& operator=(const SelectCommand&) = default;
    ~SelectCommand() override;

    void SelectAll();  ///< Selects all columns and forgets those added before.

    /// Adds a column or an expression, `sum(size) AS size`, and takes back SelectAll().
    /// Refuses an empty text, without a log line.
    bool AddField(const std::string& field);

    /// Sets the condition, without WHERE. Refuses an empty one; the previous one stays.
    bool SetCondition(const std::string& text);
    bool SetCondition(const SqliteCondition& object);  ///< Refuses one that is not valid, too.

    /// Makes one row of all rows in which the field, and those of earlier calls, are equal.
    /// \return false, with an ERR line and nothing changed, for an empty field
    bool GroupBy(const std::string& field);

    /// Sorts the rows by a field or an expression; those that are equal in it by the field of the next
    /// call. NULL comes first, then numbers by their value, then texts by their bytes. Without any
    /// call the order is SQLite's choice.
    /// \return false, with an ERR line and nothing changed, for an empty field
    /// \warning A name given by AS comes first: with `CAST(size AS TEXT) AS size` the rows are sorted
    ///          as texts, "5000000000" before "900". Sort by `nodes.size` then, with the table's name.
    bool OrderBy(const std::string& field, SqliteOrder order = SqliteOrder::Ascending);

    /// Selects this many rows at most, after skipping the first `offset` ones. 0 rows is a limit, too.
    /// Numbers beyond the 64-bit integers of SQLite are lowered to the largest of these. The last
    /// call counts.
    void Limit(std::uint64_t rows, std::uint64_t offset = 0);

    bool IsValid() const override;            ///< Whether there are a table and columns.
    std::string GetCommand() const override;  ///< Does not end with ";".

    /// "condition:[id=1]/fields:[a, b]", and what is used of "/group:[a,b]", "/order:[c DESC,d]" and
    /// "/limit:[20 OFFSET 5]".
    void DumpParam(std::stringstream& out) const override;

  private:
    bool selectAll_ = false;
    std::vector<std::string> fields_;
    std::string condition_;
    // What follows the words GROUP BY, ORDER BY and LIMIT; empty without them.
    std::string groups_;
    std::string orders_;
    std::string limit_;
};

/// \cond SPECIALISATIONS
template <>
ORVADRCORE_API bool InsertCommand::AddFieldValue<std::string>(const std::string& field,
                                                              const std::string& value);
template <>
ORVADRCORE_API bool InsertCommand::AddFieldValue<SqliteValue>(const std::string& field,
                                                              const SqliteValue& value);
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
ORVADRCORE_API bool UpdateCommand::AddFieldValue<SqliteValue>(const std::string& field,
                                                              const SqliteValue& value);
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
