#include "base/file_io.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdint>
#include <limits>
#include <utility>

#include "base/errno.h"

namespace OrvaDRCore {

namespace {

constexpr std::size_t ReadSize = 16384;

// No JSON document is larger, and no file in /proc.
constexpr std::int64_t LargestFile = std::numeric_limits<std::int32_t>::max();

}  // namespace

FileDescriptor::FileDescriptor(const std::string& path, int flags, mode_t mode)
    : fd_(::open(path.c_str(), flags | O_CLOEXEC, mode))
{
}

FileDescriptor::FileDescriptor(FileDescriptor&& other) noexcept : fd_(std::exchange(other.fd_, -1))
{
}

FileDescriptor::~FileDescriptor()
{
    const PreserveErrno preserve;
    if (fd_ >= 0) ::close(fd_);
}

bool ReadAll(int fd, std::string& text, std::size_t most)
{
    std::array<char, ReadSize> chunk;  // NOLINT(cppcoreguidelines-pro-type-member-init)
    while (most > 0) {
        const ssize_t count =
            RetryOnEintr([&] { return ::read(fd, chunk.data(), std::min(most, chunk.size())); });
        if (count <= 0) return count == 0;
        text.append(chunk.data(), static_cast<std::size_t>(count));
        most -= static_cast<std::size_t>(count);
    }
    return true;
}

bool ReadRegularFile(const std::string& path, std::string& text, std::size_t most)
{
    // Do not wait for the writer of a pipe, nor make a terminal the controlling one.
    const FileDescriptor file(path, O_RDONLY | O_NONBLOCK | O_NOCTTY);
    struct stat status {};
    if (!file.IsOpen() || ::fstat(file.Get(), &status) < 0) return false;
    errno = EINVAL;
    if (!S_ISREG(status.st_mode)) return false;
    errno = EFBIG;
    if (most == std::string::npos && status.st_size > LargestFile) return false;
    return ReadAll(file.Get(), text, most);
}

bool WriteAll(int fd, std::string_view text)
{
    while (!text.empty()) {
        const ssize_t count = RetryOnEintr([&] { return ::write(fd, text.data(), text.size()); });
        if (count <= 0) return false;
        text.remove_prefix(static_cast<std::size_t>(count));
    }
    return true;
}

}  // namespace OrvaDRCore
