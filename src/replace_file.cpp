#include "replace_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <cstdio>

#include "file_io.h"

namespace OrvaDRCore {

namespace {

constexpr mode_t PermissionBits = 07777;
constexpr mode_t NewFileMode = 0666;  // the kernel takes the umask off
constexpr mode_t OwnerOnly = 0600;    // until the bits that the file is to have are set

constexpr const char* TemporarySuffix = ".orvadr-tmp";
constexpr int MaxWriters = 64;             // of one file, at once
constexpr std::size_t RoomForSuffix = 13;  // the suffix and two digits

enum class Lock { Ours, Others, None };  // None: a file system that has no locks

// A lock of the open file, which goes with it. It is none of those that lock files are made of.
Lock TryLock(const FileDescriptor& file)
{
    struct flock whole {};
    whole.l_type = F_WRLCK;
    whole.l_whence = SEEK_SET;
    if (::fcntl(file.Get(), F_OFD_SETLK, &whole) == 0) return Lock::Ours;
    return errno == EAGAIN || errno == EACCES ? Lock::Others : Lock::None;
}

// Whether `path` still is the name of the open file.
bool IsNamed(const FileDescriptor& file, const std::string& path)
{
    struct stat open {};
    struct stat named {};
    return ::fstat(file.Get(), &open) == 0 && ::lstat(path.c_str(), &named) == 0 &&
           open.st_dev == named.st_dev && open.st_ino == named.st_ino;
}

// Removes the temporary file of a writer that is no more, on which nobody holds a lock.
bool RemoveLeftOver(const std::string& path)
{
    const FileDescriptor file(path, O_WRONLY | O_NOFOLLOW | O_NONBLOCK);
    return file.IsOpen() && TryLock(file) == Lock::Ours && IsNamed(file, path) &&
           ::unlink(path.c_str()) == 0;
}

// Makes and locks the temporary file of that name, if there is none yet. Never goes through a
// symbolic link. None, with errno set, on failure: EEXIST when another writer has the name.
FileDescriptor MakeLocked(const std::string& path, mode_t mode)
{
    FileDescriptor file(path, O_WRONLY | O_CREAT | O_EXCL, mode);
    if (!file.IsOpen()) return file;
    // A file that is not locked yet looks like a left-over: another writer may be removing it.
    if (TryLock(file) != Lock::Others && IsNamed(file, path)) return file;
    errno = EEXIST;
    return {};
}

// A path of which a name of full length leaves room for what goes behind it.
std::string ShortName(const std::string& path)
{
    const std::size_t name = path.rfind('/') + 1;  // 0 when there is none
    return path.substr(0, name + NAME_MAX - RoomForSuffix);
}

// Makes and locks a temporary file of the caller's own beside the file `path`, which becomes its
// name, and removes left-overs under the next names.
FileDescriptor MakeTemporary(std::string& path, mode_t mode)
{
    const std::string stem = ShortName(path) + TemporarySuffix;
    int writer = 0;
    while (true) {
        path = stem + std::to_string(writer);
        FileDescriptor file = MakeLocked(path, mode);
        if (file.IsOpen()) {
            while (RemoveLeftOver(stem + std::to_string(++writer))) {
            }
            return file;
        }
        if (errno != EEXIST) return file;
        if (!RemoveLeftOver(path) && ++writer == MaxWriters) {
            errno = EAGAIN;
            return file;
        }
    }
}

// Gives the temporary file its content, its permission bits and its name.
bool Complete(const FileDescriptor& file, std::string_view text, std::optional<mode_t> mode,
              const std::string& temporary, const std::string& path)
{
    return WriteAll(file.Get(), text) && (!mode || ::fchmod(file.Get(), *mode) == 0) &&
           ::fsync(file.Get()) == 0 && std::rename(temporary.c_str(), path.c_str()) == 0;
}

}  // namespace

bool ReplaceFile(const std::string& path, std::string_view text, std::optional<mode_t> mode,
                 struct stat* made)
{
    struct stat old {};
    if (!mode && ::stat(path.c_str(), &old) == 0) mode = old.st_mode & PermissionBits;

    std::string temporary = path;
    const FileDescriptor file = MakeTemporary(temporary, mode ? OwnerOnly : NewFileMode);
    if (!file.IsOpen()) return false;
    if (Complete(file, text, mode, temporary, path)) {
        // Of the open file: the name may be another's by now.
        if (made != nullptr && ::fstat(file.Get(), made) < 0) *made = {};
        return true;
    }

    const int error = errno;
    ::unlink(temporary.c_str());
    errno = error;
    return false;
}

}  // namespace OrvaDRCore
