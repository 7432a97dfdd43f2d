// Files at the level of system calls: an owner for a descriptor, whole reads and writes. Nothing
// here logs. Failures set errno.
#ifndef ORVADRCORE_SRC_BASE_FILE_IO_H
#define ORVADRCORE_SRC_BASE_FILE_IO_H

#include <fcntl.h>
#include <sys/types.h>

#include <string>
#include <string_view>

namespace OrvaDRCore {

// Owns an open file. Programs that are started do not inherit it.
class FileDescriptor {
  public:
    FileDescriptor() = default;  // not open

    // Opens a file, with O_CLOEXEC added to `flags`.
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

// Appends everything up to the end of the file to `text`, or the first `most` bytes. On failure `text`
// holds what was read before.
bool ReadAll(int fd, std::string& text, std::size_t most = std::string::npos);

// Likewise, for a path. Fails without reading or waiting if that is no regular file, but a pipe, a
// device or a socket, and if 2 GiB or more are to be read as a whole (EFBIG).
bool ReadRegularFile(const std::string& path, std::string& text,
                     std::size_t most = std::string::npos);

// Writes the whole text.
bool WriteAll(int fd, std::string_view text);

}  // namespace OrvaDRCore

#endif
