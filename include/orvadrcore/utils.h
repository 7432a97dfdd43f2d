/// \file
/// Small helpers that stand alone: a UUID, a random pause, vectors as JSON or as one text, a path
/// test.
///
/// \code
///     Container::ToString<std::string>({"id", "name"}, ",");   // "id,name"
///     Validator::IsVolPath("/volume1/replica");                // true
/// \endcode
///
/// Nothing here keeps state; every function may be called from any thread. Log lines name the file
/// `utils.cpp`.
#ifndef ORVADRCORE_UTILS_H
#define ORVADRCORE_UTILS_H

#include <string>
#include <vector>

#include <json/value.h>

#include <orvadrcore/export.h>

/// All that the library has for its callers.
namespace OrvaDRCore {

/// A new UUID: the first line that `/usr/bin/uuidgen` prints, without blanks around it.
/// \return the text; empty when the program printed nothing, or when reading failed before the end
///         of the line, both without a log line; and empty when the program could not be started,
///         with ERR `Failed to exec the command [%s].`
/// \note Starts a process; the process inherits no descriptor but 0, 1 and 2.
ORVADRCORE_API std::string GenerateUUID();

/// Sleeps for a random time between two bounds, both included.
/// \param min  shortest sleep in milliseconds, above 0
/// \param max  longest sleep in milliseconds, above `min`: equal bounds are refused on purpose
/// \return true after the sleep; false at once, with ERR `Invalid period [%u - %u] to sleep`, when
///         the bounds are not as said
/// \note A signal handler that runs in the meantime may cut the sleep short.
ORVADRCORE_API bool RandomSleepInMSec(unsigned int min, unsigned int max);

/// Vectors turned into something else, for elements of type `std::string`, `int`, `bool` and
/// `double`. Neither operation fails or logs.
class ORVADRCORE_API Container {
  public:
    Container() = delete;

    /// The elements, in order, as a JSON array of text, integers, booleans or numbers.
    /// \tparam T      the type of the elements
    /// \param values  the elements
    /// \return the array; an empty array, not null, for an empty vector. A text of 2 GiB or more,
    ///         which no JSON value can hold, is null there
    template <class T>
    static Json::Value ToJsonArray(  // T: std::string, int, bool or double
        const std::vector<T>& values) = delete;

    /// The elements one after the other, with `separator` between them.
    /// \tparam T         the type of the elements
    /// \param values     the elements
    /// \param separator  any text
    /// \return the text; empty for an empty vector
    /// \warning Numbers are appended as characters, not in decimals: an `int` as the character of
    ///          its low 8 bits (65 and 66 joined with "," give "A,B"), a `bool` as the character 1
    ///          or 0, a `double` as the character of the low 8 bits of its value without the
    ///          fraction (0 when negative). Format numbers as text first when you want decimals.
    /// \note No separator follows as long as the result is empty, so empty texts at the beginning
    ///       vanish: "" and "b" give "b". Later ones keep their separator.
    template <class T>
    static std::string ToString(  // T: std::string, int, bool or double
        const std::vector<T>& values, const std::string& separator) = delete;
};

/// \cond SPECIALISATIONS
template <>
ORVADRCORE_API Json::Value Container::ToJsonArray(const std::vector<std::string>& values);
template <>
ORVADRCORE_API Json::Value Container::ToJsonArray(const std::vector<int>& values);
template <>
ORVADRCORE_API Json::Value Container::ToJsonArray(const std::vector<bool>& values);
template <>
ORVADRCORE_API Json::Value Container::ToJsonArray(const std::vector<double>& values);
template <>
ORVADRCORE_API std::string Container::ToString(const std::vector<std::string>& values,
                                               const std::string& separator);
template <>
ORVADRCORE_API std::string Container::ToString(const std::vector<int>& values,
                                               const std::string& separator);
template <>
ORVADRCORE_API std::string Container::ToString(const std::vector<bool>& values,
                                               const std::string& separator);
template <>
ORVADRCORE_API std::string Container::ToString(const std::vector<double>& values,
                                               const std::string& separator);
/// \endcond

/// Tests of texts.
class ORVADRCORE_API Validator {
  public:
    Validator() = delete;

    /// Whether a path begins with "/volume".
    /// \param path  the path; it is not looked up, and its case counts
    /// \return true when it does. What follows is not looked at: "/volume", "/volume1/x" and
    ///         "/volumeUSB" all pass, an empty path does not
    static bool IsVolPath(const std::string& path);
};

}  // namespace OrvaDRCore

#endif
