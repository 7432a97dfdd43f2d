/// \file
/// Files: whole JSON documents, directories, and files of "key=value" lines.
///
/// \code
///     Json::Value settings;
///     if (!File::Read("/var/dr/settings.json", settings)) return false;
///     std::map<std::string, int> limits;
///     if (File::Read("/etc/dr/limits.conf", limits) < 0) return false;
/// \endcode
///
/// All operations are static and keep no state; any thread may call them. Nothing is locked:
/// whoever needs to be alone holds a FileLock around the call. Nothing throws unless memory runs
/// out; log lines name the file `file.cpp`.
#ifndef ORVADRCORE_FILE_H
#define ORVADRCORE_FILE_H

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

    /// Reads a file that holds one JSON document. A missing file is a success that reads nothing,
    /// and so is one in a directory that the process may not search. When reading fails, the lines
    /// before the failure count; a line that it has cut off does not.
    /// \param path        the file
    /// \param[out] value  the document; untouched when the file is missing, and on failure
    /// \return false for a file that does not parse or is a directory, without a line, and for one
    ///         that cannot be opened, with ERR `File[%s] is not opened.`
    /// \warning Whatever is at the path is opened and read to its end: a named pipe is waited for,
    ///          and some devices never end. Where others can put such a thing, open the file
    ///          yourself and read it by its descriptor.
    static bool Read(const std::string& path, Json::Value& value);

    /// Reads a JSON document from a descriptor, from where it stands to its end. When reading
    /// fails, the lines before the failure count; a line that it has cut off does not.
    /// \param fd          a descriptor open for reading; **closed** by the call (and with it a lock
    ///                    held through it ends), unless the stream cannot be made
    /// \param[out] value  the document; untouched on failure
    /// \return false for a text that does not parse, without a line, and when no stream can be made
    ///         of the descriptor, with ERR `Failed to open file descriptor [%d]`
    static bool Read(int fd, Json::Value& value);

    /// Writes a JSON document and a newline into a file, which is made, with mode 0666 less the
    /// umask, or emptied first.
    /// \param path   the file; its directory must be there
    /// \param value  the document
    /// \return false with ERR `Empty path to write.`, `File [%s] is not opened.` or
    ///         `Failed to write [%s] to [%s].` (the document, the path)
    /// \warning The file is written in place: a reader may see a part of it, and a write that fails
    ///          leaves a part behind. A Cache replaces its file whole.
    /// \warning Whatever is at the path is opened: a named pipe is waited for until somebody reads.
    /// \warning Every document is written, also one that Read() refuses: infinities (written as
    ///          1e+9999), and more than 1000 levels of nesting. Not a number is written as null.
    static bool Write(const std::string& path, const Json::Value& value);

    /// Writes a JSON document, without a newline, at the place where a descriptor stands.
    /// \param fd     a descriptor open for writing; **closed** by the call, unless the stream
    ///               cannot be made. Nothing is truncated: do that first where it is needed
    /// \param value  the document
    /// \return false with ERR `Failed to open file descriptor [%d]` or
    ///         `Failed to write [%s] to fd[%d]` (the document, the descriptor)
    /// \warning Every document is written, also one that Read() refuses: see above.
    static bool Write(int fd, const Json::Value& value);

    // --------------------------------------------------------------------------------- directories

    /// Makes a directory, and its parents, with /bin/mkdir.
    /// \param path  the directory; one that is there already is left as it is, whatever the mode
    /// \param mode  its permission bits, at most 0777; parents are made with the usual ones
    /// \return false for an empty path, without a line; with ERR `Directory mode error: %o` for a
    ///         mode above 0777, `snprintf error with mode [%o]` for a negative one, and
    ///         `Failed to create dir [%s] with mode [%o]` when mkdir fails
    /// \note Starts a process when the directory is missing. A path that begins with "-" is taken
    ///       for an option by mkdir.
    static bool CreateDir(const std::string& path, int mode);

    /// Removes a directory and all that is in it, with /bin/rm.
    /// \param path  the directory; a path that names anything else is left as it is
    /// \return false when rm fails; true also when there is no such directory. Nothing is logged
    /// \note Starts a process when the directory is there. A path that begins with "-" is taken for
    ///       options by rm, and fails.
    static bool RemoveDir(const std::string& path);

    /// The text before the last "/".
    /// \param path  the path; it is not looked up
    /// \return "/a/b" for "/a/b/c" and for "/a/b/"; the empty text for "/a" and "/"; a path without
    ///         a slash whole
    static std::string GetParentDir(const std::string& path);

    /// Whether a descriptor is open on a regular file.
    /// \param fd  any number
    /// \return true when it is
    static bool IsRegularFile(int fd);

    // --------------------------------------------------------------------------- "key=value" files

    /// Reads a file of "key=value" lines into a map that is emptied first. When reading fails, the
    /// lines before the failure count; a line that it has cut off is passed over without a line in
    /// the log.
    ///
    /// Of key and value the first word counts; blanks around them do not. Numbers are what the
    /// standard streams read from the beginning of the text: "12abc" is 12, "abc" is 0, a number
    /// too large the largest there is. Of two lines with the same key the first counts. There are
    /// no comments: a line with "=" is a pair, whatever it begins with, unless one of its sides is
    /// empty.
    /// \tparam K        `std::string`
    /// \tparam V        `std::string`, `int` or `double`
    /// \param path      the file; a directory reads like an empty file
    /// \param[out] out  the pairs; untouched when the file is missing or cannot be opened
    /// \return the number of pairs; 0 when the file is missing; -1 when it cannot be opened, with
    ///         WARN `File[%s] is not opened.`
    /// \warning Whatever is at the path is opened and read to its end, as by the reading of a JSON
    ///          document: a named pipe is waited for.
    /// \note A line that is no pair is passed over, with NOTICE
    ///       `Failed to parse line[%s] from file [%s]`; before it stands WARN `Bad Parameter.` for
    ///       an empty line and NOTICE `Cannot find separator[%s] in line[%s]` for one without "="
    ///       (both in the function `parseLineKeyValue`).
    template <class K, class V>
    static int Read(  // K: std::string, V: std::string, int or double
        const std::string& path, std::map<K, V>& out) = delete;

    /// Reads a value from a text, as the standard streams do: the first word, or the number that
    /// the text begins with.
    /// \tparam In       any type that a stream writes
    /// \tparam Out      any type that a stream reads
    /// \param in        the text
    /// \param[out] out  the value. Where there is none to read: 0 for a text that is no number;
    ///                  untouched for a text of blanks
    /// \param fallback  the value for an empty text
    /// \return false for an empty text; true for all others, whether a value was read or not.
    ///         Nothing is logged
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
    stream.exceptions(std::ios::badbit);  // or memory that is short counts as the end of the text
    try {
        stream << in;
    } catch (const std::ios::failure&) {
        // What a stream refuses to write counts as empty, on purpose.
    }
    if (stream.str().empty()) {
        out = fallback;
        return false;
    }
    try {
        stream >> out;
    } catch (const std::ios::failure&) {
        // Its success is not looked at, on purpose.
    }
    return true;
}
/// \endcond

}  // namespace OrvaDRCore

#endif
