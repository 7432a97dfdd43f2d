#include "line_io.h"

#include <sys/types.h>

#include <cerrno>
#include <cstdlib>

namespace NodeRegistry {

LineReader::LineReader(const std::string& file)
    : stream(file == "-" ? stdin : std::fopen(file.c_str(), "re"))
{
    if (stream == nullptr) error = errno;
}

LineReader::~LineReader()
{
    if (stream != nullptr && stream != stdin) static_cast<void>(std::fclose(stream));
    std::free(buffer);
}

bool LineReader::Read(std::string& ret_line)
{
    if (stream == nullptr) return false;
    const ssize_t length = ::getline(&buffer, &size, stream);
    // Also where getline gives the beginning of a line that a failed read has cut off.
    if (std::ferror(stream) != 0) error = errno;
    if (length < 0 || error != 0) return false;
    ret_line.assign(buffer, static_cast<std::size_t>(length));
    if (ret_line.back() == '\n') ret_line.pop_back();
    return true;
}

int WriteText(const std::string& text)
{
    const bool isWritten = std::fwrite(text.data(), 1, text.size(), stdout) == text.size();
    return isWritten && std::fflush(stdout) == 0 ? 0 : errno;
}

}  // namespace NodeRegistry
