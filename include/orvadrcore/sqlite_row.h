/// \file
/// One row of a select, read column by column without a record.
///
/// \code
///     bool isReadable = true;
///     const auto take = [&](const SqliteRow& row) {
///         Volume& volume = volumes.emplace_back();
///         isReadable = row.GetValue("name", volume.name) && row.GetValue("bytes", volume.bytes);
///         if (!row.IsNull("note")) row.GetValue("note", volume.note);
///         return isReadable;                            // the next row, please
///     };
///     if (!db.SelectEach(select, take) || !isReadable) return false;
/// \endcode
///
/// SqliteDB::SelectEach() makes rows. Nothing throws unless memory runs out. Refusals are logged as
/// `sqlite_row.cpp`; docs/connection.md lists them.
#ifndef ORVADRCORE_SQLITE_ROW_H
#define ORVADRCORE_SQLITE_ROW_H

#include <cstddef>
#include <cstdint>
#include <string>

#include <orvadrcore/export.h>

namespace OrvaDRCore {

class RowReader;

/// The row at which a select stands. Use it inside of the callback only: it refers to the select,
/// which goes on to the next row afterwards.
class ORVADRCORE_API SqliteRow {
  public:
    /// \cond INTERNAL
    ORVADRCORE_LOCAL explicit SqliteRow(RowReader& reader) : reader_(reader) {}
    /// \endcond

    SqliteRow(const SqliteRow&) = delete;
    SqliteRow& operator=(const SqliteRow&) = delete;
    ~SqliteRow() = default;

    std::size_t GetColumnCount() const;

    /// The name as the statement gives it, an alias for example. Empty past the last column.
    std::string GetColumnName(std::size_t column) const;

    /// Whether a column is NULL or there is no such column. Logs nothing.
    bool IsNull(const std::string& column) const;

    /// Reads a column as `std::string`, `int`, `unsigned int`, `std::int64_t`, `double` or `bool`.
    ///
    /// A text or blob is read whole as `std::string`, zero bytes included. Integers are read as any
    /// of the numbers; one that does not fit is refused, never cut. `double` reads every number,
    /// `bool` reads 0 and 1. Nothing else is converted.
    /// \return false, with `out` unchanged: DEBUG line for a column that is not there, WARN line for
    ///         a value of another kind. NULL is of another kind; ask IsNull() first where it may come
    /// \note Of several columns with the same name the last one counts.
    template <class T>
    bool GetValue(const std::string& column, T& out) const = delete;

    /// The same by the number of the column, from 0. A little faster than by name.
    template <class T>
    bool GetValue(std::size_t column, T& out) const = delete;

  private:
    template <class T>
    ORVADRCORE_LOCAL bool ReadNamed(const std::string& column, T& out) const;
    template <class T>
    ORVADRCORE_LOCAL bool ReadNumbered(std::size_t column, T& out) const;

    RowReader& reader_;
};

/// \cond SPECIALISATIONS
template <>
ORVADRCORE_API bool SqliteRow::GetValue(const std::string& column, std::string& out) const;
template <>
ORVADRCORE_API bool SqliteRow::GetValue(const std::string& column, int& out) const;
template <>
ORVADRCORE_API bool SqliteRow::GetValue(const std::string& column, unsigned int& out) const;
template <>
ORVADRCORE_API bool SqliteRow::GetValue(const std::string& column, std::int64_t& out) const;
template <>
ORVADRCORE_API bool SqliteRow::GetValue(const std::string& column, double& out) const;
template <>
ORVADRCORE_API bool SqliteRow::GetValue(const std::string& column, bool& out) const;
template <>
ORVADRCORE_API bool SqliteRow::GetValue(std::size_t column, std::string& out) const;
template <>
ORVADRCORE_API bool SqliteRow::GetValue(std::size_t column, int& out) const;
template <>
ORVADRCORE_API bool SqliteRow::GetValue(std::size_t column, unsigned int& out) const;
template <>
ORVADRCORE_API bool SqliteRow::GetValue(std::size_t column, std::int64_t& out) const;
template <>
ORVADRCORE_API bool SqliteRow::GetValue(std::size_t column, double& out) const;
template <>
ORVADRCORE_API bool SqliteRow::GetValue(std::size_t column, bool& out) const;
/// \endcond

}  // namespace OrvaDRCore

#endif
