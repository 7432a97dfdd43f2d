/// \file
/// Small helpers: UUIDs, random pauses, vectors as JSON or as text, a path test.
///
/// \code
///     Container::ToString<std::string>({"id", "name"}, ",");   // "id,name"
///     Validator::IsVolPath("/volume1/replica");                // true
/// \endcode
///
/// No function keeps state; any thread may call them.
#ifndef ORVADRCORE_UTILS_H
#define ORVADRCORE_UTILS_H

#include <string>
#include <vector>

#include <json/value.h>

#include <orvadrcore/export.h>

/// Everything that callers use.
namespace OrvaDRCore {

/// A new UUID: the first line that `/usr/bin/uuidgen` prints, trimmed. The program inherits only
/// descriptors 0, 1 and 2.
/// \return empty if the program could not be started, with ERR `Failed to exec the command [%s].`;
///         also empty, but without a log line, if it printed nothing or the line could not be read
ORVADRCORE_API std::string GenerateUUID();

/// Sleeps for a random number of milliseconds from `min` to `max`, both included. A signal handler
/// may cut the sleep short.
/// \return false without sleeping, with ERR `Invalid period [%u - %u] to sleep`, unless
///         0 < min < max: equal bounds are refused, too
ORVADRCORE_API bool RandomSleepInMSec(unsigned int min, unsigned int max);

/// Conversions of vectors whose elements are `std::string`, `int`, `bool` or `double`. They neither
/// fail nor log.
class ORVADRCORE_API Container {
  public:
    Container() = delete;

    /// The elements as a JSON array; an empty vector gives an empty array, not null. A text of 2 GiB
    /// or more becomes null, because a JSON value cannot hold it.
    template <class T>
    static Json::Value ToJsonArray(  // T: std::string, int, bool or double
        const std::vector<T>& values) = delete;

    /// The elements, joined with `separator`.
    /// \warning Numbers are appended as one character, not as digits: an `int` as the character of
    ///          its low 8 bits (65 and 66 joined with "," give "A,B"), a `bool` as character 1 or
    ///          0, a `double` as the character of the low 8 bits of its integer part (0 if
    ///          negative). Format numbers as text yourself if you want digits.
    /// \note Empty texts at the beginning get no separator: "" and "b" give "b". Later ones do.
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

/// Checks of texts.
class ORVADRCORE_API Validator {
  public:
    Validator() = delete;

    /// Whether a path begins with "/volume", and nothing else: "/volume", "/volume1/x" and
    /// "/volumeUSB" all pass. The file system is not consulted.
    static bool IsVolPath(const std::string& path);
};

}  // namespace OrvaDRCore

#endif
