// Files at the level of system calls: a descriptor with an owner, whole reads and writes, and the
// replacement of a file by another. Nothing here logs; a failure is told with errno set.
#ifndef ORVADRCORE_SRC_FILE_IO_H
#define ORVADRCORE_SRC_FILE_IO_H

#include <fcntl.h>
#include <sys/stat.h>

#include <optional>
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

    bool IsOpen() const { return fd >= 0; }
    int Get() const { return fd; }

  private:
    int fd = -1;
};

// Appends all that can be read to `text`. False when reading fails before the end; what was read
// until then stays in `text`.
bool ReadAll(int fd, std::string& text);

// Writes the whole text.
bool WriteAll(int fd, std::string_view text);

// Replaces the file `path` by one that holds `text`: a temporary file beside it is written, flushed
// to disk and renamed. Whoever opens `path` sees the old file or the new one, never a part, also
// after a power cut; which of the two it is then is not certain. The new file has the permission
// bits `mode`, if given, otherwise those of the old file, or 0666 less the umask.
//
// On failure the old file is as it was and the temporary file gone. Temporary files are called
// `path` + ".orvadr-tmp0", 1 and so on, for as many writers as there are at once; a name without
// room for that is cut. A writer holds a lock on its own as long as it lives, so that what a killed
// one left is known and removed by the next.
//
// What the file system says of the new file goes into `made`, if given.
bool ReplaceFile(const std::string& path, std::string_view text,
                 std::optional<mode_t> mode = std::nullopt, struct stat* made = nullptr);

}  // namespace OrvaDRCore

#endif
