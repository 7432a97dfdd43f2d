/// \file
/// Conditions: the text after WHERE, built from column names and values.
///
/// \code
///     const SqliteEqual enabled("enabled", true);                        // enabled=1
///     const SqliteIn ids("id", std::vector<SqliteValue>{1, 2, 3});       // id IN ( 1,2,3 )
///     const SqliteAnd both(enabled.GetCondition(), ids.GetCondition());  // (enabled=1) AND (...)
///     select.SetCondition(both);
/// \endcode
///
/// A condition is a plain value that holds a text; each is used by one thread at a time. SetValue()
/// returns false for operands that it refuses, and logs them at ERR as `sqlite_condition.cpp`; a
/// constructor only logs, so look at IsValid() or the text. Nothing throws unless memory runs out.
///
/// \warning Column names and operand texts are written as they are, and texts are quoted but not
///          escaped, except those of SqliteValue::Text().
#ifndef ORVADRCORE_SQLITE_CONDITION_H
#define ORVADRCORE_SQLITE_CONDITION_H

#include <string>
#include <vector>

#include <orvadrcore/export.h>
#include <orvadrcore/sqlite_value.h>

// The binary interface has no virtual destructors here, and nobody owns a condition through a
// pointer to its base. NOLINTBEGIN(cppcoreguidelines-virtual-class-destructor)
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wnon-virtual-dtor"

namespace OrvaDRCore {

/// A condition with any text.
/// \warning It has no virtual destructor: never delete a condition through a pointer to its base.
class ORVADRCORE_API SqliteCondition {
  public:
    SqliteCondition() = default;
    SqliteCondition(const std::string& text);  ///< The text without WHERE; nothing is checked.

    virtual bool IsValid() const;  ///< Whether there is a text.

    /// The text without WHERE, valid until the condition changes.
    const std::string& GetCondition() const { return condition; }

  protected:
    std::string condition;  ///< What GetCondition() returns.
};

/// A column that equals a value: `id=3`, or `note IS NULL` for SqliteValue::Null().
class ORVADRCORE_API SqliteEqual : public SqliteCondition {
  public:
    SqliteEqual() = default;
    SqliteEqual(const std::string& lvalue, const SqliteValue& value);  ///< As SetValue().

    /// Replaces the text. Refuses an empty column name and a value that is not valid; the text
    /// stays as it was then.
    bool SetValue(const std::string& lvalue, const SqliteValue& value);
};

/// A column that differs from a value: `id!=3`, or `note IS NOT NULL`. Otherwise as SqliteEqual.
/// \note A column that is NULL differs from nothing.
class ORVADRCORE_API SqliteNotEqual : public SqliteCondition {
  public:
    SqliteNotEqual() = default;
    SqliteNotEqual(const std::string& lvalue, const SqliteValue& value);  ///< As SetValue().
    bool SetValue(const std::string& lvalue, const SqliteValue& value);   ///< As SqliteEqual.
};

/// A column below a value: `id<3`. Numbers come before all texts. NULL is below nothing and above
/// nothing, and no column is below Null(). Otherwise as SqliteEqual.
class ORVADRCORE_API SqliteLess : public SqliteCondition {
  public:
    SqliteLess() = default;
    SqliteLess(const std::string& lvalue, const SqliteValue& value);     ///< As SetValue().
    bool SetValue(const std::string& lvalue, const SqliteValue& value);  ///< As SqliteEqual.
};

/// A column below a value or equal to it: `id<=3`. Otherwise as SqliteLess.
class ORVADRCORE_API SqliteLessEqual : public SqliteCondition {
  public:
    SqliteLessEqual() = default;
    SqliteLessEqual(const std::string& lvalue, const SqliteValue& value);  ///< As SetValue().
    bool SetValue(const std::string& lvalue, const SqliteValue& value);    ///< As SqliteEqual.
};

/// A column above a value: `id>3`. Otherwise as SqliteLess.
class ORVADRCORE_API SqliteGreater : public SqliteCondition {
  public:
    SqliteGreater() = default;
    SqliteGreater(const std::string& lvalue, const SqliteValue& value);  ///< As SetValue().
    bool SetValue(const std::string& lvalue, const SqliteValue& value);  ///< As SqliteEqual.
};

/// A column above a value or equal to it: `id>=3`. Otherwise as SqliteLess.
class ORVADRCORE_API SqliteGreaterEqual : public SqliteCondition {
  public:
    SqliteGreaterEqual() = default;
    SqliteGreaterEqual(const std::string& lvalue, const SqliteValue& value);  ///< As SetValue().
    bool SetValue(const std::string& lvalue, const SqliteValue& value);       ///< As SqliteEqual.
};

/// A column whose text contains another one, anywhere: `name LIKE '%50\%%' ESCAPE '\'`. The text is
/// plain: wildcards, backslashes and quotes in it are escaped here and stand for themselves, so do
/// not pass what EscapeText() returns. The empty text is contained in everything but NULL.
/// \warning SQLite's LIKE takes `a` and `A` for the same letter, in ASCII. It fails for patterns of
///          more than 50000 bytes, to which two wildcards and each escaping backslash count.
class ORVADRCORE_API SqliteContains : public SqliteCondition {
  public:
    SqliteContains() = default;
    SqliteContains(const std::string& lvalue, const std::string& text);  ///< As SetValue().

    /// Replaces the text. Refuses an empty column name, and a text with a zero byte, at which LIKE
    /// would end; the condition's text stays as it was then.
    bool SetValue(const std::string& lvalue, const std::string& text);
};

/// A column whose text begins with another one: `name LIKE '50\%%' ESCAPE '\'`. Otherwise as
/// SqliteContains.
class ORVADRCORE_API SqliteBeginsWith : public SqliteCondition {
  public:
    SqliteBeginsWith() = default;
    SqliteBeginsWith(const std::string& lvalue, const std::string& text);  ///< As SetValue().
    bool SetValue(const std::string& lvalue, const std::string& text);     ///< As SqliteContains.
};

/// Two conditions that both hold: `(id=3) AND (state!=0)`.
class ORVADRCORE_API SqliteAnd : public SqliteCondition {
  public:
    SqliteAnd() = default;
    SqliteAnd(const std::string& left, const std::string& right);  ///< As SetValue().

    /// Appends the texts of two conditions. Refuses an empty one; the text stays as it was then.
    /// \warning A second call gives `(a) AND (b)(c) AND (d)`, which is not SQL.
    bool SetValue(const std::string& left, const std::string& right);
};

/// Two conditions of which at least one holds: `(id=3) OR (state!=0)`. Otherwise as SqliteAnd.
class ORVADRCORE_API SqliteOr : public SqliteCondition {
  public:
    SqliteOr() = default;
    SqliteOr(const std::string& left, const std::string& right);       ///< As SetValue().
    bool SetValue(const std::string& left, const std::string& right);  ///< As SqliteAnd: appends.
};

/// What SqliteIn and SqliteNotIn share: a column whose value is, or is not, in a list.
class ORVADRCORE_API SqliteInFamily : public SqliteCondition {
  public:
    /// With a keyword other than "IN" and "NOT IN" the object refuses every value.
    SqliteInFamily(const std::string& keyword);
    SqliteInFamily(const std::string& keyword, const std::string& lvalue,
                   const std::vector<SqliteValue>& values);  ///< As SetValue().
    SqliteInFamily(const std::string& keyword, const std::string& lvalue,
                   const std::string& value);  ///< As SetValue().

    /// Whether the keyword is one of the two.
    /// \warning True also for an empty text. A SELECT that gets a refused list keeps its previous
    ///          condition, or none: check what SetValue() returns.
    bool IsValid() const override;

    /// Replaces the text by a list, which may be empty: `id IN ( 1,2,3 )`. A value that is not
    /// valid leaves the text empty; an empty column name leaves it as it was.
    bool SetValue(const std::string& lvalue, const std::vector<SqliteValue>& values);

    /// Replaces the text by a subquery or a finished list: `id IN ( SELECT id FROM jobs )`. Refuses
    /// an empty operand; the text stays as it was then.
    bool SetValue(const std::string& lvalue, const std::string& value);

  private:
    ORVADRCORE_LOCAL bool CheckKeyword() const;

    std::string keyword_;
};

/// A column whose value is in a list.
class ORVADRCORE_API SqliteIn : public SqliteInFamily {
  public:
    SqliteIn();  ///< Has no text but is valid: see SqliteInFamily::IsValid().
    SqliteIn(const std::string& lvalue,
             const std::vector<SqliteValue>& values);               ///< As SetValue().
    SqliteIn(const std::string& lvalue, const std::string& value);  ///< As SetValue().
};

/// A column whose value is not in a list.
/// \warning With SqliteValue::Null() in the list it matches no row: that is SQL's rule.
class ORVADRCORE_API SqliteNotIn : public SqliteInFamily {
  public:
    SqliteNotIn();  ///< Has no text but is valid: see SqliteInFamily::IsValid().
    SqliteNotIn(const std::string& lvalue,
                const std::vector<SqliteValue>& values);               ///< As SetValue().
    SqliteNotIn(const std::string& lvalue, const std::string& value);  ///< As SetValue().
};

}  // namespace OrvaDRCore

#pragma GCC diagnostic pop
// NOLINTEND(cppcoreguidelines-virtual-class-destructor)

#endif
