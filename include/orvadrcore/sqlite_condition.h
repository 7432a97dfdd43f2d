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
/// A condition is a plain value: copied, passed by reference, used by one thread at a time. It
/// holds a text that is made when it is set and never parsed. A constructor with operands does what
/// `SetValue` does and drops its answer: ask IsValid() or look at the text. Nothing throws unless
/// memory runs out; what is refused is logged at ERR (file `sqlite_condition.cpp`, function
/// `SetValue`).
///
/// \warning Column names and operand texts are taken as they stand, and a text value is quoted but
///          not escaped: see SqliteValue::ToFormatedValue().
#ifndef ORVADRCORE_SQLITE_CONDITION_H
#define ORVADRCORE_SQLITE_CONDITION_H

#include <string>
#include <vector>

#include <orvadrcore/export.h>
#include <orvadrcore/sqlite_value.h>

// Nobody owns a condition through a pointer to its base: a virtual destructor would serve no one,
// and the binary interface has none. NOLINTBEGIN(cppcoreguidelines-virtual-class-destructor)
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wnon-virtual-dtor"

namespace OrvaDRCore {

/// A condition's text, from whatever source.
/// \warning There is no virtual destructor, on purpose: never delete a condition through a pointer
///          to a base class.
class ORVADRCORE_API SqliteCondition {
  public:
    /// No condition.
    SqliteCondition() = default;

    /// A condition that is ready.
    /// \param text  the condition without the word WHERE; nothing is checked
    SqliteCondition(const std::string& text);

    /// Whether there is a condition.
    /// \return true when the text is not empty
    virtual bool IsValid() const;

    /// The text, without the word WHERE.
    /// \return a reference that is good until the condition changes; to an empty text when there is
    ///         no condition
    const std::string& GetCondition() const { return condition; }

  protected:
    std::string condition;  ///< The text that GetCondition() gives out.
};

/// A column that equals a value: `id=3`.
class ORVADRCORE_API SqliteEqual : public SqliteCondition {
  public:
    SqliteEqual() = default;

    /// As SetValue(), the answer dropped.
    /// \param lvalue  the column
    /// \param value   the value
    SqliteEqual(const std::string& lvalue, const SqliteValue& value);

    /// Replaces the text by `lvalue`, "=" and the value's literal.
    /// \param lvalue  the column, written as it stands
    /// \param value   the value; a text is quoted but not escaped
    /// \return false when `lvalue` is empty or `value` not valid, with
    ///         ERR `Bad lvalue[%s] or rvalue[%s]`; the text stays as it was then
    bool SetValue(const std::string& lvalue, const SqliteValue& value);
};

/// A column that differs from a value: `id!=3`.
class ORVADRCORE_API SqliteNotEqual : public SqliteCondition {
  public:
    SqliteNotEqual() = default;

    /// As SetValue(), the answer dropped.
    /// \param lvalue  the column
    /// \param value   the value
    SqliteNotEqual(const std::string& lvalue, const SqliteValue& value);

    /// Replaces the text by `lvalue`, "!=" and the value's literal.
    /// \param lvalue  the column, written as it stands
    /// \param value   the value; a text is quoted but not escaped
    /// \return false as SqliteEqual::SetValue(), with the same line
    bool SetValue(const std::string& lvalue, const SqliteValue& value);
};

/// Two conditions that both hold: `(id=3) AND (state!=0)`.
class ORVADRCORE_API SqliteAnd : public SqliteCondition {
  public:
    SqliteAnd() = default;

    /// As SetValue(), the answer dropped.
    /// \param left   the text of one condition
    /// \param right  the text of the other
    SqliteAnd(const std::string& left, const std::string& right);

    /// Appends `(left) AND (right)`, the operands being the texts of two other conditions.
    /// \param left   the text of one condition, written as it stands
    /// \param right  the text of the other
    /// \return false when an operand is empty, with ERR `Bad lvalue[%s] or rvalue[%s]`; the text
    ///         stays as it was then
    /// \warning The text is appended to, not replaced: a second call on the same object gives
    ///          `(a) AND (b)(c) AND (d)`, which is no SQL. Use a new object for each condition.
    bool SetValue(const std::string& left, const std::string& right);
};

/// Two conditions of which one holds: `(id=3) OR (state!=0)`.
class ORVADRCORE_API SqliteOr : public SqliteCondition {
  public:
    SqliteOr() = default;

    /// As SetValue(), the answer dropped.
    /// \param left   the text of one condition
    /// \param right  the text of the other
    SqliteOr(const std::string& left, const std::string& right);

    /// Appends `(left) OR (right)`, the operands being the texts of two other conditions.
    /// \param left   the text of one condition, written as it stands
    /// \param right  the text of the other
    /// \return false as SqliteAnd::SetValue(), with the same line
    /// \warning The text is appended to, not replaced, as in SqliteAnd.
    bool SetValue(const std::string& left, const std::string& right);
};

/// A column whose value is, or is not, one of many: what SqliteIn and SqliteNotIn share.
class ORVADRCORE_API SqliteInFamily : public SqliteCondition {
  public:
    /// No text yet.
    /// \param keyword  "IN" or "NOT IN", exactly; with any other the object refuses every value
    SqliteInFamily(const std::string& keyword);

    /// As SetValue() with a list, the answer dropped.
    /// \param keyword  "IN" or "NOT IN", exactly
    /// \param lvalue   the column
    /// \param values   the values
    SqliteInFamily(const std::string& keyword, const std::string& lvalue,
                   const std::vector<SqliteValue>& values);

    /// As SetValue() with a ready text, the answer dropped.
    /// \param keyword  "IN" or "NOT IN", exactly
    /// \param lvalue   the column
    /// \param value    what stands between the parentheses
    SqliteInFamily(const std::string& keyword, const std::string& lvalue, const std::string& value);

    /// Whether the keyword is "IN" or "NOT IN".
    /// \return true when it is
    /// \warning The text is not looked at: a condition whose list was refused is empty and yet says
    ///          that it is valid, and a SELECT that is given it keeps its previous condition, or
    ///          none. Look at the answer of SetValue(), or at GetCondition().
    bool IsValid() const override;

    /// Replaces the text by a list of literals: `id IN ( 1,2,3 )`.
    /// \param lvalue  the column, written as it stands
    /// \param values  the values; an empty list is accepted; texts are quoted but not escaped
    /// \return false, with a line at ERR that says why: `Bad keyword [%s]` and `Bad lvalue[%s]`
    ///         (empty), which leave the text as it was; `Invalid rvalue [%s]` for a value that is
    ///         not valid, which leaves the text empty
    bool SetValue(const std::string& lvalue, const std::vector<SqliteValue>& values);

    /// Replaces the text by a sub-select or list that is ready: `id IN ( SELECT id FROM jobs )`.
    /// \param lvalue  the column, written as it stands
    /// \param value   what stands between the parentheses, likewise
    /// \return false for a bad keyword, with ERR `Bad keyword [%s]`, and when `lvalue` or `value`
    ///         is empty, with ERR `Bad lvalue[%s] or value[%s]`; the text stays as it was then
    bool SetValue(const std::string& lvalue, const std::string& value);

  private:
    ORVADRCORE_LOCAL bool CheckKeyword() const;

    std::string keyword_;
};

/// A column whose value is one of many.
class ORVADRCORE_API SqliteIn : public SqliteInFamily {
  public:
    /// No text yet; valid all the same, see SqliteInFamily::IsValid().
    SqliteIn();

    /// As SqliteInFamily::SetValue() with a list, the answer dropped.
    /// \param lvalue  the column
    /// \param values  the values
    SqliteIn(const std::string& lvalue, const std::vector<SqliteValue>& values);

    /// As SqliteInFamily::SetValue() with a ready text, the answer dropped.
    /// \param lvalue  the column
    /// \param value   what stands between the parentheses
    SqliteIn(const std::string& lvalue, const std::string& value);
};

/// A column whose value is none of many.
class ORVADRCORE_API SqliteNotIn : public SqliteInFamily {
  public:
    /// No text yet; valid all the same, see SqliteInFamily::IsValid().
    SqliteNotIn();

    /// As SqliteInFamily::SetValue() with a list, the answer dropped.
    /// \param lvalue  the column
    /// \param values  the values
    SqliteNotIn(const std::string& lvalue, const std::vector<SqliteValue>& values);

    /// As SqliteInFamily::SetValue() with a ready text, the answer dropped.
    /// \param lvalue  the column
    /// \param value   what stands between the parentheses
    SqliteNotIn(const std::string& lvalue, const std::string& value);
};

}  // namespace OrvaDRCore

#pragma GCC diagnostic pop
// NOLINTEND(cppcoreguidelines-virtual-class-destructor)

#endif
