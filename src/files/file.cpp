#include <orvadrcore/file.h>

#include <endian.h>
#include <orvacore/orvacore.h>
#include <sys/stat.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <iterator>
#include <memory>
#include <string_view>
#include <type_traits>
#include <utility>
#include <vector>

#include "base/extraction.h"
#include "base/file_io.h"
#include "base/json_helpers.h"
#include "base/log.h"
#include "base/replace_file.h"

namespace OrvaDRCore {

namespace {

constexpr int MaxDirMode = 0777;
constexpr std::size_t ChunkSize = 1024;

constexpr mode_t NewFileMode = 0666;  // less the umask

constexpr char Separator = '=';

constexpr std::size_t LargeFile = 8192;  // bytes; sorting the lines of a smaller one takes longer

// Removes the first line from the text.
std::string_view TakeLine(std::string_view& text)
{
    const std::size_t end = std::min(text.find('\n'), text.size());
    const std::string_view line = text.substr(0, end);
    text.remove_prefix(std::min(end + 1, text.size()));
    return line;
}

// After a failed read: the last line may be incomplete, those before it count.
void DropIncompleteLine(std::string& text)
{
    text.erase(text.rfind('\n') + 1);  // all of it when there is no newline
}

// The complete lines of a file, as far as it can be read.
std::string ReadLines(const FileDescriptor& file)
{
    std::string text;
    if (!ReadAll(file.Get(), text)) DropIncompleteLine(text);
    return text;
}

// Splits a line at the separator. Neither side is empty then.
bool parseLineKeyValue(std::string_view line, std::string_view& key, std::string_view& value)
{
    if (line.empty()) {
        DR_LOG(Warn, "Bad Parameter.");
        return false;
    }
    const std::size_t at = line.find(Separator);
    if (at == std::string_view::npos) {
        DR_LOG(Notice, "Cannot find separator[%c] in line[%s]", Separator,
               std::string(line).c_str());
        return false;
    }
    key = line.substr(0, at);
    value = line.substr(at + 1);
    return !key.empty() && !value.empty();
}

// Calls `take` with both sides of each line that is a pair.
template <class Take>
void ForEachPair(std::string_view text, const std::string& path, Take take)
{
    constexpr const char* Function = "Read";
    while (!text.empty()) {
        const std::string_view line = TakeLine(text);
        std::string_view key;
        std::string_view value;
        if (parseLineKeyValue(line, key, value)) {
            take(key, value);
        } else {
            DR_LOG_AS(Function, Notice, "Failed to parse line[%s] from file [%s]",
                      std::string(line).c_str(), path.c_str());
        }
    }
}

// The first eight bytes of a key as a number that is ordered as they are. Comparing it first spares
// most comparisons of texts.
std::uint64_t HeadOf(std::string_view key)
{
    std::uint64_t head = 0;
    key.copy(reinterpret_cast<char*>(&head), sizeof head);
    return be64toh(head);
}

// A pair before it is in the map: texts are still parts of the file's.
template <class Value>
struct PairOf {
    using Read = std::conditional_t<std::is_same_v<Value, std::string>, std::string_view, Value>;

    bool operator<(const PairOf& other) const
    {
        return head != other.head ? head < other.head : key < other.key;
    }

    std::uint64_t head = 0;
    std::string_view key;
    Read value{};
};

// Runs a program. If another thread has waited for all children and so got the result, `isDone()`
// tells whether the program has done its work.
template <class IsDone>
bool RunProgram(const char* path, const char* argument1, const char* argument2,
                const char* argument3, const char* argument4, IsDone isDone)
{
    errno = 0;
    const int result = CoreLibExec(path, argument1, argument2, argument3, argument4);
    return result == 0 || (result < 0 && errno == ECHILD && isDone());
}

bool IsDirectory(const std::string& path)
{
    return CoreLibFileCheckDir(path.c_str()) == 1;
}

bool ReplaceWith(const std::string& path, const std::string& text)
{
    constexpr const char* Function = "Replace";
    if (path.empty()) {
        DR_LOG_AS(Function, Err, "Empty path to write.");
        return false;
    }
    if (!ReplaceFile(path, text)) {
        DR_LOG_AS(Function, Err, "Failed to replace [%s], errno=[%m]", path.c_str());
        return false;
    }
    return true;
}

struct CloseStream {
    void operator()(FILE* stream) const { (void)std::fclose(stream); }
};
using Stream = std::unique_ptr<FILE, CloseStream>;

template <class Value>
void InsertPairs(std::string_view text, const std::string& path, std::map<std::string, Value>& out)
{
    Extraction extraction;
    auto next = out.end();
    ForEachPair(text, path, [&](std::string_view left, std::string_view right) {
        std::string key;
        Value value{};
        extraction.Read(left, key);
        extraction.Read(right, value);
        // Of lines with the same key the first counts. The hint is good because most files are sorted.
        next = std::next(out.try_emplace(next, std::move(key), std::move(value)));
    });
}

// The same, for many lines: sorting them first takes less time than searching a large map, and the
// map's nodes are made in the order in which they are read later.
template <class Value>
void AppendSortedPairs(std::string_view text, const std::string& path,
                       std::map<std::string, Value>& out)
{
    Extraction extraction;
    std::vector<PairOf<Value>> pairs;
    ForEachPair(text, path, [&](std::string_view left, std::string_view right) {
        PairOf<Value>& pair = pairs.emplace_back();
        extraction.Read(left, pair.key);
        extraction.Read(right, pair.value);
        pair.head = HeadOf(pair.key);
    });
    if (!std::is_sorted(pairs.begin(), pairs.end())) std::stable_sort(pairs.begin(), pairs.end());
    for (auto pair = pairs.begin(); pair != pairs.end(); ++pair) {
        // Of lines with the same key the first counts, which a stable sort leaves in front.
        if (pair != pairs.begin() && pair->key == std::prev(pair)->key) continue;
        out.emplace_hint(out.end(), pair->key, pair->value);
    }
}

template <class Value>
int ReadPairs(const std::string& path, std::map<std::string, Value>& out)
{
    constexpr const char* Function = "Read";
    const FileDescriptor file(path, O_RDONLY);
    if (!file.IsOpen()) {
        if (!CoreLibFileExist(path.c_str())) return 0;
        DR_LOG_AS(Function, Warn, "File[%s] is not opened.", path.c_str());
        return -1;
    }
    const std::string text = ReadLines(file);

    out.clear();
    if (text.size() < LargeFile) {
        InsertPairs(text, path, out);
    } else {
        AppendSortedPairs(text, path, out);
    }
    return static_cast<int>(out.size());
}

}  // namespace

bool File::Read(const std::string& path, Json::Value& value)
{
    const FileDescriptor file(path, O_RDONLY);
    if (!file.IsOpen()) {
        if (!CoreLibFileExist(path.c_str())) return true;
        DR_LOG(Err, "File[%s] is not opened.", path.c_str());
        return false;
    }
    std::string text = ReadLines(file);
    // Line ends are removed, even inside a number or a text: the contract says so.
    text.erase(std::remove(text.begin(), text.end(), '\n'), text.end());
    return fromString(value, text);
}

bool File::Read(int fd, Json::Value& value)
{
    const Stream stream(::fdopen(fd, "r"));
    if (stream == nullptr) {
        DR_LOG(Err, "Failed to open file descriptor [%d]", fd);
        return false;
    }
    std::string text;
    std::array<char, ChunkSize> chunk{};
    while (std::fgets(chunk.data(), static_cast<int>(chunk.size()), stream.get()) != nullptr) {
        text += chunk.data();
    }
    if (std::feof(stream.get()) == 0) DropIncompleteLine(text);
    return fromString(value, text);
}

bool File::Write(const std::string& path, const Json::Value& value)
{
    if (path.empty()) {
        DR_LOG(Err, "Empty path to write.");
        return false;
    }
    std::string text = toString(value) + "\n";
    const FileDescriptor file(path, O_WRONLY | O_CREAT | O_TRUNC, NewFileMode);
    if (!file.IsOpen()) {
        DR_LOG(Err, "File [%s] is not opened.", path.c_str());
        return false;
    }
    if (!WriteAll(file.Get(), text)) {
        text.pop_back();
        DR_LOG(Err, "Failed to write [%s] to [%s].", text.c_str(), path.c_str());
        return false;
    }
    return true;
}

bool File::Write(int fd, const Json::Value& value)
{
    const Stream stream(::fdopen(fd, "w"));
    if (stream == nullptr) {
        DR_LOG(Err, "Failed to open file descriptor [%d]", fd);
        return false;
    }
    // Without a buffer a full disk fails in fprintf() rather than in fclose(), after the check.
    (void)std::setvbuf(stream.get(), nullptr, _IONBF, 0);
    const std::string text = toString(value);
    const bool written = std::fprintf(stream.get(), "%s", text.c_str()) >= 0;
    if (!written) DR_LOG(Err, "Failed to write [%s] to fd[%d]", text.c_str(), fd);
    return written;
}

bool File::Replace(const std::string& path, const Json::Value& value)
{
    // What Read() would refuse must not take the place of a good file.
    const std::string text = IsReadable(value) ? toString(value) : std::string();
    if (text.empty() || !FitsJsonText(text.size())) {
        DR_LOG(Err, "Value for [%s] cannot be read back", path.c_str());
        return false;
    }
    return ReplaceWith(path, text);
}

bool File::Replace(const std::string& path, const std::string& text)
{
    return ReplaceWith(path, text);
}

bool File::Replace(const std::string& path, const char* text)
{
    if (text == nullptr) {
        DR_LOG(Err, "Null text for [%s]", path.c_str());
        return false;
    }
    return ReplaceWith(path, text);
}

bool File::CreateDir(const std::string& path, int mode)
{
    if (path.empty()) return false;
    if (IsDirectory(path)) return true;

    const auto bits = static_cast<unsigned int>(mode);
    if (mode > MaxDirMode) {
        DR_LOG(Err, "Directory mode error: %o", bits);
        return false;
    }
    std::array<char, 4> octal{};
    if (std::snprintf(octal.data(), octal.size(), "%o", bits) >= static_cast<int>(octal.size())) {
        DR_LOG(Err, "snprintf error with mode [%o]", bits);
        return false;
    }
    const auto isMade = [&path] { return IsDirectory(path); };
    if (!RunProgram("/bin/mkdir", "-p", path.c_str(), "-m", octal.data(), isMade)) {
        DR_LOG(Err, "Failed to create dir [%s] with mode [%o]", path.c_str(), bits);
        return false;
    }
    return true;
}

bool File::RemoveDir(const std::string& path)
{
    const auto isGone = [&path] { return !IsDirectory(path); };
    return isGone() || RunProgram("/bin/rm", "-rf", path.c_str(), nullptr, nullptr, isGone);
}

std::string File::GetParentDir(const std::string& path)
{
    return path.substr(0, path.rfind('/'));
}

bool File::IsRegularFile(int fd)
{
    struct stat status {};
    return fd >= 0 && ::fstat(fd, &status) == 0 && S_ISREG(status.st_mode);
}

template <>
int File::Read(const std::string& path, std::map<std::string, std::string>& out)
{
    return ReadPairs(path, out);
}

template <>
int File::Read(const std::string& path, std::map<std::string, int>& out)
{
    return ReadPairs(path, out);
}

template <>
int File::Read(const std::string& path, std::map<std::string, double>& out)
{
    return ReadPairs(path, out);
}

}  // namespace OrvaDRCore
