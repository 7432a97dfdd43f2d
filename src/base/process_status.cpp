#include "base/process_status.h"

#include <signal.h>

#include <cerrno>
#include <cstdlib>
#include <string>

#include "base/file_io.h"

namespace OrvaDRCore {

namespace {

constexpr int FirstField = 3;  // after id and name

// A field of the text after the name; null if there are fewer.
const char* Field(const std::string& text, int number)
{
    std::size_t at = 0;
    for (int field = FirstField; field < number; ++field) {
        at = text.find(' ', at);
        if (at == std::string::npos) return nullptr;
        ++at;
    }
    return &text[at];
}

}  // namespace

std::optional<ProcessStatus> ReadProcessStatus(pid_t pid)
{
    const FileDescriptor file("/proc/" + std::to_string(pid) + "/stat", O_RDONLY);
    std::string text;
    if (!file.IsOpen() || !ReadAll(file.Get(), text)) return std::nullopt;

    // "4242 (any name, with ) and blanks) S 1 ..."
    const std::size_t nameEnd = text.rfind(") ");
    if (nameEnd == std::string::npos) return std::nullopt;
    text.erase(0, nameEnd + 2);
    const char* threads = Field(text, 20);
    const char* start = Field(text, 22);
    if (threads == nullptr || start == nullptr) return std::nullopt;
    return ProcessStatus{text[0], std::strtol(threads, nullptr, 10),
                         std::strtoull(start, nullptr, 10)};
}

bool IsProcessAlive(pid_t pid, unsigned long long start)
{
    // Unlike kill, tgkill does not accept groups or the ids of threads. It also finds zombies, but
    // where /proc hides the processes of other users nothing else tells.
    if (::tgkill(pid, pid, 0) < 0 && errno != EPERM) return false;
    const auto status = ReadProcessStatus(pid);
    if (!status) return true;
    const bool hasEnded = (status->state == 'Z' || status->state == 'X') && status->threads <= 1;
    return !hasEnded && (start == 0 || status->start == start);
}

}  // namespace OrvaDRCore
