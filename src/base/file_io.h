// Files at the level of system calls: a descriptor with an owner, whole reads and writes. Nothing
// here logs; a failure is told with errno set.
#ifndef ORVADRCORE_SRC_BASE_FILE_IO_H
#define ORVADRCORE_SRC_BASE_FILE_IO_H

#include <fcntl.h>
#include <sys/types.h>

#include <string>
#include <string_view>

namespace OrvaDRCore {

// An open file, closed at the end of its owner's life. Programs that are started do not inherit it.
class FileDescriptor {
  public:
    FileDescriptor() = default;  // none

    // Opens a file, close-on-exec added to `flags`. None, with errno set, when that fails.
    FileDescriptor(const std::string& path, int flags, mode_t mode = 0);
    FileDescriptor(FileDescriptor&& other) noexcept;
    FileDescriptor(const FileDescriptor&) = delete;
    FileDescriptor& operator=(const FileDescriptor&) = delete;
    ~FileDescriptor();  // keeps errno

    bool IsOpen() const { return fd_ >= 0; }
    int Get() const { return fd_; }

  private:
    int fd_ = -1;
};

// Appends all that can be read to `text`, or the first `most` bytes of it. False when reading fails
// before that; what was read until then stays in `text`.
bool ReadAll(int fd, std::string& text, std::size_t most = std::string::npos);

// Appends what a regular file holds, as ReadAll() does. Nothing else is read from, or waited for:
// for a pipe, a device or a socket the answer is false.
bool ReadRegularFile(const std::string& path, std::string& text,
                     std::size_t most = std::string::npos);

// Writes the whole text.
bool WriteAll(int fd, std::string_view text);

}  // namespace OrvaDRCore

#endif
