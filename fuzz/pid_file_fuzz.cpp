// A pid file of any bytes. In the input "@" stands for this process's id and "#" for its start
// time, which a file in the corpus cannot know.
#include <orvacore/orvacore.h>

#include <charconv>

#include "base/file_io.h"
#include "support/fixtures/temp_dir.h"
#include "support/fuzz.h"
#include "support/memory_file.h"

namespace {

constexpr std::size_t ReadSize = 64;  // the rest of the file is ignored

struct Lines {
    std::string first;
    std::string second;
};

Lines SplitLines(const std::string& text)
{
    const std::size_t end = std::min(text.find('\n'), text.size());
    const std::string rest = end < text.size() ? text.substr(end + 1) : std::string();
    return {text.substr(0, end), rest.substr(0, rest.find('\n'))};
}

// What the library writes about this process.
Lines OwnLines()
{
    const TempDir dir;
    const std::string path = dir.File("pid");
    std::string text;
    const bool isRead = CoreLibProcPidFileCreate(path.c_str()) == 0 &&
                        OrvaDRCore::ReadAll(OrvaDRCore::FileDescriptor(path, 0).Get(), text);
    Expect(isRead, "a pid file can be written and read");
    return SplitLines(text);
}

// The number on a line, or 0.
template <class Number>
Number Parse(const std::string& line)
{
    Number number = 0;
    const auto result = std::from_chars(line.data(), line.data() + line.size(), number);
    const bool isNumber =
        result.ec == std::errc() && *result.ptr == '\0' && line.find('\0') == std::string::npos;
    return isNumber ? number : 0;
}

std::string Fill(const std::string& input, const Lines& own)
{
    std::string text;
    for (const char character : input) {
        if (character == '@') {
            text += own.first;
        } else if (character == '#') {
            text += own.second;
        } else {
            text += character;
        }
    }
    return text;
}

}  // namespace

void Fuzz(const std::string& input)
{
    static const Lines own = OwnLines();
    static const MemoryFile file;
    const std::string text = Fill(input, own);
    file.Write(text);
    const pid_t answer = CoreLibReadPidFile(file.Path().c_str());

    const Lines lines = SplitLines(text.substr(0, ReadSize));
    const auto pid = Parse<pid_t>(lines.first);
    const auto start = Parse<unsigned long long>(lines.second);
    if (pid <= 0) {
        Expect(answer == 0, "a file without an id names nobody");
    } else if (start == 0) {
        Expect(answer == pid, "a file with the id alone names it");
    } else if (pid == Parse<pid_t>(own.first)) {
        const bool isOurs = start == Parse<unsigned long long>(own.second);
        Expect(answer == (isOurs ? pid : 0), "the start time tells whose the id is");
    } else {
        Expect(answer == pid || answer == 0, "a file names its id or nobody");
    }
}
