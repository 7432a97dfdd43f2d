/// \file
/// Values and records: what goes into SQL statements and comes out of them.
///
/// \code
///     SqliteValueList node;
///     node.AddValue("id", 3);
///     node.AddValue("name", SqliteValue::EscapeText("O'Brien's NAS"));
///     node.ToStr();                                   // "id:3, name:'O''Brien''s NAS'"
///     std::string name;
///     if (node.GetValue("name", name)) { ... }
/// \endcode
///
/// Values and records are plain: they own all that they hold, and each is used by one thread at a
/// time. Nothing here throws unless memory runs out; what is refused is logged (file
/// `sqlite_value.cpp`) and answered by false or by an invalid value.
#ifndef ORVADRCORE_SQLITE_VALUE_H
#define ORVADRCORE_SQLITE_VALUE_H

#include <cstddef>
#include <map>
#include <string>
#include <type_traits>
#include <vector>

#include <json/value.h>

#include <orvadrcore/export.h>

namespace OrvaDRCore {

/// One column's value: an `int`, an `unsigned int`, a `bool`, a text, or nothing.
class ORVADRCORE_API SqliteValue {
  public:
    /// No value: IsValid() is false and ToFormatedValue() empty.
    SqliteValue() = default;

    /// A signed integer.
    /// \param number  any of 32 bits
    SqliteValue(int number);

    /// An unsigned integer.
    /// \param number  any of 32 bits; SqliteDB reads integers back as signed ones
    SqliteValue(unsigned int number);

    /// A boolean, written as 1 or 0.
    /// \param truth  the boolean
    SqliteValue(bool truth);

    /// A text.
    /// \param text  the text, copied; see the warning at ToFormatedValue(). One of 2 GiB (2147483643
    ///              bytes) or more makes no value, with ERR
    ///              `text of [%zu] bytes is too long for a value`
    SqliteValue(const std::string& text);

    /// As above.
    /// \param text  the text, copied; no value, without a line, when it is null
    SqliteValue(const char* text);

    SqliteValue(std::nullptr_t) = delete;

    // Any other pointer would become a boolean that is true.
    template <class T, class = std::enable_if_t<!std::is_same_v<std::remove_const_t<T>, char>>>
    SqliteValue(T* pointer) = delete;  // of all pointers, char* and const char* alone are texts
    template <class T, class Class>
    SqliteValue(T Class::*pointer) = delete;  // a pointer to a member is no value

    SqliteValue(const SqliteValue&) = default;      ///< A copy, as valid as the other.
    SqliteValue(SqliteValue&&) noexcept = default;  ///< Takes the value; the other is empty then.
    ~SqliteValue() = default;

    /// Takes over the other's payload and nothing else.
    /// \param other  the value to take from
    /// \return this value
    /// \warning Whether a value is valid is decided when it is built and does not travel with an
    ///          assignment: `SqliteValue v; v = SqliteValue(1);` leaves `v` invalid, and a valid
    ///          value that is assigned an empty one is not valid either. Build values, or put them
    ///          into a SqliteValueList; do not fill empty ones.
    SqliteValue& operator=(const SqliteValue& other);

    /// Whether the value was built from a number, boolean or text and still holds one.
    /// \return true when it was and does
    bool IsValid() const;

    /// Reads the value as `T`: `std::string`, `unsigned int`, `int` or `bool`.
    ///
    /// A text is read from a text only and a number from a number that fits `T`; a boolean also
    /// from the integers 0 and 1. Nothing is converted: the text "12" is no number, true is no 1.
    /// \tparam T        one of those four
    /// \param[out] out  the result; untouched on failure
    /// \return false when the value is of another kind, with WARN `[%s] is not string`,
    ///         `[%s] is not int` (both integer types) or `[%s] is not bool`, filled with the value
    ///         as JSON; the line's function is `GetValue<int>` and the like
    template <class T>
    bool GetValue(T& out) const = delete;  // T: std::string, unsigned int, int or bool

    /// The value as an SQL literal.
    /// \return a text between single quotes, a number in decimals, a boolean as 1 or 0; empty when
    ///         there is no value
    /// \warning A text is quoted but not escaped: a single quote inside it ends the literal, and
    ///          what follows is read as SQL. Pass texts that you do not control through
    ///          EscapeText() when you build the value.
    std::string ToFormatedValue() const;

    /// Doubles every single quote: a value built from the result is written as the literal of the
    /// original text.
    /// \param text  any text
    /// \return the text to build a value from
    /// \code
    ///     SqliteValue(SqliteValue::EscapeText("it's")).ToFormatedValue();   // "'it''s'"
    /// \endcode
    /// \note SQLite ends a statement at the first zero byte, so no literal can hold one.
    static std::string EscapeText(const std::string& text);

  private:
    friend struct SqliteInternals;  // writes the payload into statements

    ORVADRCORE_LOCAL SqliteValue(const char* text, std::size_t length);

    bool valid_ = false;
    Json::Value value_;
};

/// \cond SPECIALISATIONS
template <>
ORVADRCORE_API bool SqliteValue::GetValue<std::string>(std::string& out) const;
template <>
ORVADRCORE_API bool SqliteValue::GetValue<unsigned int>(unsigned int& out) const;
template <>
ORVADRCORE_API bool SqliteValue::GetValue<int>(int& out) const;
template <>
ORVADRCORE_API bool SqliteValue::GetValue<bool>(bool& out) const;
/// \endcond

/// One record: values by field name, in the byte order of the names, whatever the order of adding.
/// No name is empty and every value is valid.
class ORVADRCORE_API SqliteValueList {
  public:
    SqliteValueList() = default;
    SqliteValueList(const SqliteValueList&) = default;  ///< A copy of all fields.

    /// Takes all fields of another record.
    /// \param other  the record to take from, which is empty then
    SqliteValueList(SqliteValueList&& other) noexcept;

    virtual ~SqliteValueList();

    /// Replaces all fields by copies of the other's.
    /// \param other  the record to copy; for this record itself nothing happens, and references to
    ///               its values stay good
    /// \return this record
    SqliteValueList& operator=(const SqliteValueList& other);

    /// Takes all fields of the other, which gets those of this record for them.
    /// \param other  the record to take from
    /// \return this record
    SqliteValueList& operator=(SqliteValueList&& other) noexcept;

    /// Adds a field, or replaces the value of a field that is there already.
    /// \param field  the field's name
    /// \param value  its value, copied
    /// \return false when `field` is empty or `value` not valid, with ERR
    ///         `Bad Field[%s] or value [%s]`; the record is unchanged then
    bool AddValue(const std::string& field, const SqliteValue& value);

    /// As above, without a copy of the value.
    /// \param field  the field's name
    /// \param value  its value; empty afterwards if it was taken
    /// \return as above
    bool AddValue(const std::string& field, SqliteValue&& value);

    /// Adds every field of the other record; where both have a field, the other's value wins.
    /// \param other  the record to copy from
    /// \return this record
    SqliteValueList& operator+=(const SqliteValueList& other);

    /// Whether a field is there.
    /// \param field  the field's name
    /// \return true when it is; false for an empty name, with ERR `Invalid field [%s]`
    bool HasField(const std::string& field) const;

    /// The value of a field.
    /// \param field  the field's name
    /// \return a reference that is good until the record changes; to a value that is not valid when
    ///         there is none, with ERR `Invalid field [%s]` for an empty name and WARN
    ///         `Failed to find field [%s]` for a missing field
    const SqliteValue& GetValue(const std::string& field) const;

    /// Reads a field as `T`, as SqliteValue::GetValue() does.
    /// \tparam T        `std::string`, `bool`, `int` or `unsigned int`
    /// \param field     the field's name
    /// \param[out] out  the result; untouched on failure
    /// \return false for an empty name, with ERR `Invalid field [%s]`; for a missing field, with
    ///         DEBUG `field [%s] is not existed`; for a value of another kind, with the line of
    ///         SqliteValue::GetValue()
    template <class T>
    bool GetValue(  // T: std::string, unsigned int, int or bool
        const std::string& field, T& out) const = delete;

    /// All fields, for walking over a record whose columns are not known beforehand.
    /// \return values by name; a reference that is good until the record goes
    const std::map<std::string, SqliteValue>& GetValues() const { return values_; }

    /// The record for a reader.
    /// \return a text like "id:3, name:'abc'"; empty for a record without fields
    std::string ToStr() const;

  private:
    friend struct SqliteInternals;  // fills records with rows

    template <class T>
    ORVADRCORE_LOCAL bool ReadField(const std::string& field, T& out) const;

    // Behind the reference that is given out for what is not there; never changes.
    SqliteValue invalidValue_;
    std::map<std::string, SqliteValue> values_;
};

/// \cond SPECIALISATIONS
template <>
ORVADRCORE_API bool SqliteValueList::GetValue<std::string>(const std::string& field,
                                                           std::string& out) const;
template <>
ORVADRCORE_API bool SqliteValueList::GetValue<unsigned int>(const std::string& field,
                                                            unsigned int& out) const;
template <>
ORVADRCORE_API bool SqliteValueList::GetValue<int>(const std::string& field, int& out) const;
template <>
ORVADRCORE_API bool SqliteValueList::GetValue<bool>(const std::string& field, bool& out) const;
/// \endcond

/// Base of a program's own record types, which turn themselves into a SqliteValueList.
///
/// The order of the virtual operations is part of the binary interface.
class ORVADRCORE_API SqliteRecord {
  public:
    /// The record with the named fields.
    /// \param fields  the names, of those that GetRecordFields() gives
    /// \return the record
    virtual SqliteValueList BuildRecord(const std::vector<std::string>& fields) const = 0;

    /// Takes the object's content from a record. The library never calls it.
    /// \param record  the record, as a SELECT gave it
    /// \return whether the record was taken; false by default
    virtual bool LoadRecord(const SqliteValueList& record);

    /// The names of all fields of this type.
    /// \return the names, in any order
    virtual std::vector<std::string> GetRecordFields() const = 0;

    virtual ~SqliteRecord();

    /// The record with all fields: BuildRecord() with all of GetRecordFields().
    /// \return the record
    SqliteValueList ToSqliteRecord() const;

  protected:
    SqliteRecord() = default;
    SqliteRecord(const SqliteRecord&) = default;             ///< Nothing to copy here.
    SqliteRecord& operator=(const SqliteRecord&) = default;  ///< \return this object
};

}  // namespace OrvaDRCore

#endif
