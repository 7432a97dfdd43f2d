/// \file
/// Values and records: what goes into SQL statements and comes out of them.
///
/// \code
///     SqliteValueList node;
///     node.AddValue("id", 3);
///     node.AddValue("name", SqliteValue::Text("O'Brien's NAS"));
///     node.AddValue("bytes", SqliteValue::Integer(5'000'000'000));
///     node.ToStr();                  // "bytes:5000000000, id:3, name:'O''Brien''s NAS'"
///     std::string name;
///     if (node.GetValue("name", name)) { ... }
/// \endcode
///
/// Values and records own what they hold; each is used by one thread at a time. Nothing throws
/// unless memory runs out. Refusals are logged as `sqlite_value.cpp`; docs/records.md lists them.
#ifndef ORVADRCORE_SQLITE_VALUE_H
#define ORVADRCORE_SQLITE_VALUE_H

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include <orvadrcore/export.h>

namespace OrvaDRCore {

/// The value of one column: a number, a `bool`, a text, a blob, NULL, or nothing.
class ORVADRCORE_API SqliteValue {
  public:
    SqliteValue() = default;  ///< No value. It is not valid.
    SqliteValue(int number);
    SqliteValue(unsigned int number);  ///< SqliteDB reads it back as a signed integer.
    SqliteValue(bool truth);           ///< Written as 1 or 0.

    /// A text that is quoted in statements but not escaped: see ToFormatedValue(). Use Text() for
    /// one that comes from outside. One of 2 GiB or more makes no value and is logged at ERR.
    SqliteValue(const std::string& text);
    SqliteValue(const char* text);  ///< No value when it is null.

    // Any other pointer would become the boolean true. Compilers show these lines.
    SqliteValue(std::nullptr_t) = delete;
    template <class T, class = std::enable_if_t<!std::is_same_v<std::remove_const_t<T>, char>>>
    SqliteValue(T* pointer) = delete;  // of all pointers, only char* and const char* are texts
    template <class T, class Class>
    SqliteValue(T Class::*pointer) = delete;  // a pointer to a member is not a value

    SqliteValue(const SqliteValue&) = default;
    SqliteValue(SqliteValue&& other) noexcept;  ///< `other` holds nothing then.
    ~SqliteValue() = default;

    // ------------------------------------------------------------------------------------ makers
    // Values that SQLite stores without loss, whether they are written as a literal or passed to
    // SqliteDB::InsertRecords().

    /// A text with any bytes. Its literal doubles the quotes, so it always stands for this text.
    /// One of 2 GiB or more makes no value and is logged at ERR.
    static SqliteValue Text(const std::string& text);
    static SqliteValue Text(const char* text);  ///< No value when it is null.

    static SqliteValue Integer(std::int64_t number);

    /// SQLite stores infinities, but NULL for not-a-number.
    static SqliteValue Real(double number);

    /// Bytes that are no text. 1 GiB or more make no value and are logged at ERR.
    static SqliteValue Blob(const std::string& bytes);

    static SqliteValue Null();  ///< SQL's NULL. Unlike SqliteValue() it is valid.

    /// Copies what the other value holds, but not whether it is valid.
    /// \warning `SqliteValue v; v = SqliteValue(1);` leaves `v` invalid. Build values where you
    ///          need them, or put them into a SqliteValueList.
    SqliteValue& operator=(const SqliteValue& other);

    bool IsValid() const;  ///< Whether it was built with a value and still holds one.
    bool IsNull() const;   ///< Whether it holds Null(). False for a value that holds nothing.

    /// Reads the value as `std::string` (a text or the bytes of a blob), `int`, `unsigned int`,
    /// `std::int64_t` (an integer that fits), `double` (any number) or `bool`. Nothing else is
    /// converted, but the integers 0 and 1 can be read as `bool`. An integer beyond 2^53 may be
    /// rounded when it is read as `double`.
    /// \return false, with a WARN line, when the value is of another kind; `out` is unchanged then
    template <class T>
    bool GetValue(T& out) const = delete;  // T: one of the types above

    /// The value as an SQL literal; empty when there is none.
    /// \warning Quotes inside a text end the literal, and what follows is read as SQL, unless the
    ///          value was made by Text().
    std::string ToFormatedValue() const;

    /// Doubles every single quote, for a statement or condition that is put together by hand.
    /// \warning Do not combine it with Text(), which does the same.
    /// \note A zero byte ends a statement.
    static std::string EscapeText(const std::string& text);

  private:
    friend struct SqliteInternals;

    // What a value holds. A plain text is one that is not escaped.
    enum class Kind : unsigned char {
        Nothing,
        Boolean,
        Integer,
        Real,
        PlainText,
        Text,
        Blob,
        Null
    };

    union Number {
        std::int64_t integer;  // also of a boolean, 1 or 0
        double real;
    };

    ORVADRCORE_LOCAL SqliteValue(Kind kind, std::int64_t number) noexcept;
    ORVADRCORE_LOCAL SqliteValue(Kind kind, double number) noexcept;
    ORVADRCORE_LOCAL SqliteValue(Kind kind, const char* bytes, std::size_t length);

    bool valid_ = false;
    Kind kind_ = Kind::Nothing;
    Number number_{};
    std::string bytes_;  // of a text or a blob
};

/// \cond SPECIALISATIONS
template <>
ORVADRCORE_API bool SqliteValue::GetValue<std::string>(std::string& out) const;
template <>
ORVADRCORE_API bool SqliteValue::GetValue<unsigned int>(unsigned int& out) const;
template <>
ORVADRCORE_API bool SqliteValue::GetValue<int>(int& out) const;
template <>
ORVADRCORE_API bool SqliteValue::GetValue<std::int64_t>(std::int64_t& out) const;
template <>
ORVADRCORE_API bool SqliteValue::GetValue<double>(double& out) const;
template <>
ORVADRCORE_API bool SqliteValue::GetValue<bool>(bool& out) const;
/// \endcond

/// A record: values by field name, in the byte order of the names. No name is empty, and every
/// value is valid.
class ORVADRCORE_API SqliteValueList {
  public:
    SqliteValueList() = default;
    SqliteValueList(const SqliteValueList& other);
    SqliteValueList(SqliteValueList&& other) noexcept;  ///< `other` is empty then.
    virtual ~SqliteValueList();

    SqliteValueList& operator=(const SqliteValueList& other);
    SqliteValueList& operator=(SqliteValueList&& other) noexcept;  ///< Swaps the fields.

    /// Adds a field or replaces its value.
    /// \return false, with an ERR line, when the name is empty or the value not valid
    bool AddValue(const std::string& field, const SqliteValue& value);
    bool AddValue(const std::string& field, SqliteValue&& value);  ///< Does not copy the value.

    SqliteValueList& operator+=(const SqliteValueList& other);  ///< Values of `other` replace ours.

    bool HasField(const std::string& field) const;  ///< An empty name is logged at ERR.

    /// The value of a field, valid until the record changes.
    /// \return a value that is not valid, with a WARN line, when the field is missing
    const SqliteValue& GetValue(const std::string& field) const;

    /// Reads a field as SqliteValue::GetValue() does.
    /// \return false, with `out` unchanged, when it cannot be read; DEBUG when it is missing
    template <class T>
    bool GetValue(const std::string& field, T& out) const = delete;

    /// All fields in their order, valid until the record changes. HasField() and GetValue() find one
    /// by its name.
    const std::vector<std::pair<std::string, SqliteValue>>& GetValues() const;

    std::string ToStr() const;  ///< For people: "id:3, name:'abc'".

  private:
    friend struct SqliteInternals;
    using Fields = std::vector<std::pair<std::string, SqliteValue>>;

    template <class T>
    ORVADRCORE_LOCAL bool ReadField(const std::string& field, T& out) const;
    ORVADRCORE_LOCAL const SqliteValue* Find(const std::string& field) const;
    ORVADRCORE_LOCAL void Sort() const;

    SqliteValue invalidValue_;  // what GetValue() refers to when a field is missing; never changes
    mutable Fields values_;
    mutable std::atomic<std::size_t> unsorted_{0};  // how many fields at the end are not sorted yet
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
ORVADRCORE_API bool SqliteValueList::GetValue<std::int64_t>(const std::string& field,
                                                            std::int64_t& out) const;
template <>
ORVADRCORE_API bool SqliteValueList::GetValue<double>(const std::string& field, double& out) const;
template <>
ORVADRCORE_API bool SqliteValueList::GetValue<bool>(const std::string& field, bool& out) const;
/// \endcond

/// Base of a program's own record types, which turn themselves into a SqliteValueList. The order of
/// the virtual operations is part of the binary interface.
class ORVADRCORE_API SqliteRecord {
  public:
    /// Returns a record with the named fields, all of which GetRecordFields() names.
    virtual SqliteValueList BuildRecord(const std::vector<std::string>& fields) const = 0;

    /// Takes the content of a selected record. The library never calls it.
    /// \return whether the record was taken; false by default
    virtual bool LoadRecord(const SqliteValueList& record);

    virtual std::vector<std::string> GetRecordFields() const = 0;  ///< The names of all fields.

    virtual ~SqliteRecord();

    SqliteValueList ToSqliteRecord() const;  ///< BuildRecord() with all fields.

  protected:
    SqliteRecord() = default;
    SqliteRecord(const SqliteRecord&) = default;
    SqliteRecord& operator=(const SqliteRecord&) = default;
};

}  // namespace OrvaDRCore

#endif
