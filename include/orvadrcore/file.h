/// \file
/// Files: whole JSON documents and texts, directories, and files of "key=value" lines.
/// \code
///     Json::Value settings;
///     if (!File::Read("/var/dr/settings.json", settings)) return false;
///     std::map<std::string, int> limits;
///     if (File::Read("/etc/dr/limits.conf", limits) < 0) return false;
/// \endcode
/// Any thread may call these operations. They lock nothing: where that matters, hold a FileLock. They
/// throw nothing unless memory runs out. docs/files.md has every case, and the log lines.
#ifndef ORVADRCORE_FILE_H
#define ORVADRCORE_FILE_H

#include <cstddef>
#include <map>
#include <sstream>
#include <string>

#include <json/value.h>

#include <orvadrcore/export.h>

namespace OrvaDRCore {

/// Operations on files and directories.
class ORVADRCORE_API File {
  public:
    File() = delete;

    // ------------------------------------------------------------------------------ JSON documents

    /// Reads a file that holds one JSON document. A missing file is a success that leaves `value` as
    /// it was. So does a failure: a file that does not parse (no log line) or cannot be opened (ERR).
    /// If the disk fails halfway, the complete lines before that are parsed.
    /// \warning Waits for the writer of a named pipe, and reads a device to its end.
    static bool Read(const std::string& path, Json::Value& value);
    /// As above, from the offset of a descriptor. **Closes** it, unless it is not open for reading.
    static bool Read(int fd, Json::Value& value);
    /// Writes a document and a newline. A new file gets the mode 0666 less the umask.
    /// \warning Writes in place: a reader may see part of the document, and a failure (ERR) may leave
    ///          part of it. Waits for the reader of a named pipe.
    /// \warning Also writes what Read() refuses: infinities, and more than 1000 levels.
    static bool Write(const std::string& path, const Json::Value& value);
    /// As above, at the offset of a descriptor, without the newline. Truncates nothing. **Closes**
    /// the descriptor, unless it is not open for writing.
    static bool Write(int fd, const Json::Value& value);

    // ------------------------------------------------------------------------- replacing as a whole

    /// Replaces a file by one that holds the document, without a newline. It is written beside `path`,
    /// flushed to disk and renamed: whoever opens `path` gets the old file or the new one, never a part,
    /// also after a power cut. Any number of threads and processes may do so at once; the last one wins.
    /// The new file belongs to this user. It has the old file's permission bits, or 0666 less the umask.
    /// \return false, with an ERR line, when it cannot be written, or when Read() would refuse it:
    ///         infinities, more than 1000 levels, 2 GiB. The old file is as it was then
    /// \warning Replaces a symbolic link, a pipe or a device by a file, instead of writing through it.
    static bool Replace(const std::string& path, const Json::Value& value);
    /// As above, with the bytes of any text as they are: no newline is added, no length is refused.
    static bool Replace(const std::string& path, const std::string& text);
    static bool Replace(const std::string& path, const char* text);         ///< Refuses null (ERR).
    static bool Replace(const std::string& path, std::nullptr_t) = delete;  // also catches 0

    // --------------------------------------------------------------------------------- directories

    /// Makes a directory and its parents, by /bin/mkdir. One that exists keeps its mode. Fails for an
    /// empty path (no log line), for a mode above 0777 and when mkdir fails (ERR).
    /// \warning mkdir and rm take a path that begins with "-" for an option.
    static bool CreateDir(const std::string& path, int mode);
    /// Removes a directory and its contents, by /bin/rm. True also when there is no such directory;
    /// a path that names anything else is left alone. Logs nothing.
    static bool RemoveDir(const std::string& path);
    /// The text before the last slash; a path without a slash whole.
    static std::string GetParentDir(const std::string& path);
    /// Whether a descriptor is open on a regular file.
    static bool IsRegularFile(int fd);

    // --------------------------------------------------------------------------- "key=value" files

    /// Reads "key=value" lines. K is `std::string`, V is `std::string`, `int` or `double`. Of key and
    /// value the first word counts, of lines with equal keys the first. A number is what the value
    /// begins with, or else 0. There are no comments. A line that is no pair is logged and ignored.
    /// \return the number of pairs. 0 for a missing file, and -1 (WARN) for one that cannot be opened,
    ///         leave `out` as it was; otherwise it is emptied first
    /// \warning Waits for the writer of a named pipe, and reads a device to its end.
    template <class K, class V>
    static int Read(const std::string& path, std::map<K, V>& out) = delete;

    /// Reads the word or number that a text begins with, as streams do. An empty text is false and
    /// gives the fallback. All others are true: blanks alone leave `out`, what is no number gives 0.
    template <class In, class Out>
    static bool toType(const In& in, Out& out, const Out& fallback);
};

/// \cond SPECIALISATIONS
template <>
ORVADRCORE_API int File::Read(const std::string& path, std::map<std::string, std::string>& out);
template <>
ORVADRCORE_API int File::Read(const std::string& path, std::map<std::string, int>& out);
template <>
ORVADRCORE_API int File::Read(const std::string& path, std::map<std::string, double>& out);

template <class In, class Out>
bool File::toType(const In& in, Out& out, const Out& fallback)
{
    std::stringstream stream;
    stream.exceptions(std::ios::badbit);  // or bad_alloc looks like the end of the text
    try {
        stream << in;
    } catch (const std::ios::failure&) {
        // What a stream refuses to write counts as empty: the contract says so.
    }
    if (stream.str().empty()) {
        out = fallback;
        return false;
    }
    try {
        stream >> out;
    } catch (const std::ios::failure&) {
        // The contract ignores whether a value was read.
    }
    return true;
}
/// \endcond

}  // namespace OrvaDRCore

#endif
