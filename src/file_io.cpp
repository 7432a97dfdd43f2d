#include "file_io.h"

#include <fcntl.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <utility>

namespace OrvaDRCore {

namespace {

constexpr std::size_t ReadSize = 16384;

}  // namespace

FileDescriptor::FileDescriptor(const std::string& path, int flags, mode_t mode)
    : fd(::open(path.c_str(), flags | O_CLOEXEC, mode))
{
}

FileDescriptor::FileDescriptor(FileDescriptor&& other) noexcept : fd(std::exchange(other.fd, -1)) {}

FileDescriptor::~FileDescriptor()
{
    const int error = errno;
    if (fd >= 0) ::close(fd);
    errno = error;
}

bool ReadAll(int fd, std::string& text)
{
    std::array<char, ReadSize> chunk;  // NOLINT(cppcoreguidelines-pro-type-member-init)
    ssize_t count = 0;
    do {
        if (count > 0) text.append(chunk.data(), static_cast<std::size_t>(count));
        count = ::read(fd, chunk.data(), chunk.size());
    } while (count > 0 || (count < 0 && errno == EINTR));
    return count == 0;
}

bool WriteAll(int fd, std::string_view text)
{
    while (!text.empty()) {
        const ssize_t count = ::write(fd, text.data(), text.size());
        if (count < 0 && errno == EINTR) continue;
        if (count <= 0) return false;
        text.remove_prefix(static_cast<std::size_t>(count));
    }
    return true;
}

}  // namespace OrvaDRCore
