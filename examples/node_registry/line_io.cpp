#include "line_io.h"

#include <sys/types.h>

#include <cerrno>
#include <cstdlib>

namespace NodeRegistry {

LineReader::LineReader(const std::string& file)
    : stream_(file == "-" ? stdin : std::fopen(file.c_str(), "re"))
{
    if (stream_ == nullptr) error_ = errno;
}

LineReader::~LineReader()
{
    if (stream_ != nullptr && stream_ != stdin) static_cast<void>(std::fclose(stream_));
    std::free(buffer_);
}

bool LineReader::Read(std::string& ret_line)
{
    if (stream_ == nullptr) return false;
    const ssize_t length = ::getline(&buffer_, &size_, stream_);
    // Checked first: after a read error getline() returns what it got of the line.
    if (std::ferror(stream_) != 0) error_ = errno;
    if (length < 0 || error_ != 0) return false;
    ret_line.assign(buffer_, static_cast<std::size_t>(length));
    if (ret_line.back() == '\n') ret_line.pop_back();
    return true;
}

int WriteText(const std::string& text)
{
    const bool isWritten = std::fwrite(text.data(), 1, text.size(), stdout) == text.size();
    return isWritten && std::fflush(stdout) == 0 ? 0 : errno;
}

}  // namespace NodeRegistry
