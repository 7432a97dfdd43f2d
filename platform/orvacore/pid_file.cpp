#include <orvacore/orvacore.h>

#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <string>

#include "base/file_io.h"
#include "base/process_status.h"
#include "base/replace_file.h"

namespace {

constexpr mode_t ReadableByAll = 0644;
constexpr std::size_t ReadSize = 64;  // more than two numbers

// A line that is a number and nothing else; 0 for any other line.
template <class Number>
Number ParseLine(const std::string& line)
{
    Number number = 0;
    const char* end = line.data() + line.size();
    const auto [stop, error] = std::from_chars(line.data(), end, number);
    return error == std::errc() && stop == end ? number : 0;
}

// The line at `at`. Moves `at` to the next line.
std::string TakeLine(const std::string& text, std::size_t& at)
{
    const std::size_t end = std::min(text.find('\n', at), text.size());
    std::string line = text.substr(at, end - at);
    at = std::min(end + 1, text.size());
    return line;
}

}  // namespace

int CoreLibProcPidFileCreate(const char* path)
{
    const pid_t pid = ::getpid();
    std::string text = std::to_string(pid) + "\n";
    if (const auto status = OrvaDRCore::ReadProcessStatus(pid))
        text += std::to_string(status->start) + "\n";
    return OrvaDRCore::ReplaceFile(path, text, ReadableByAll) ? 0 : -1;
}

pid_t CoreLibReadPidFile(const char* path)
{
    std::string text;
    if (!OrvaDRCore::ReadRegularFile(path, text, ReadSize)) return 0;
    std::size_t at = 0;
    const auto pid = ParseLine<pid_t>(TakeLine(text, at));
    const auto start = ParseLine<unsigned long long>(TakeLine(text, at));
    if (pid <= 0) return 0;
    const auto status = OrvaDRCore::ReadProcessStatus(pid);
    const bool reused = start != 0 && status && status->start != start;
    return reused ? 0 : pid;
}
