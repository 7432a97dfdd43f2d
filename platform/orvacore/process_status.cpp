#include "process_status.h"

#include <cstdlib>
#include <string>

#include "file_io.h"

namespace {

constexpr int FirstField = 3;  // behind id and name

// A field of what stands behind the name; null when there are not so many.
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
    const OrvaDRCore::FileDescriptor file("/proc/" + std::to_string(pid) + "/stat", O_RDONLY);
    std::string text;
    if (!file.IsOpen() || !OrvaDRCore::ReadAll(file.Get(), text)) return std::nullopt;

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
