#include "support/processes/recorded_changes.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>

#include <cstdint>
#include <filesystem>
#include <fstream>
#include <optional>
#include <sstream>
#include <stdexcept>
#include <tuple>
#include <utility>

#include "support/processes/traced_process.h"

namespace {

constexpr mode_t PermissionBits = 07777;

StoredFile ReadStored(const std::string& path)
{
    struct stat status {};
    if (::stat(path.c_str(), &status) < 0) throw std::runtime_error(path + " is not there");
    std::ostringstream text;
    text << std::ifstream(path, std::ios::binary).rdbuf();
    return {text.str(), status.st_mode & PermissionBits};
}

std::size_t ToSize(std::uint64_t argument)
{
    return static_cast<std::size_t>(argument);
}

// Turns the system calls of a process into changes.
class Recorder {
  public:
    Recorder(std::string path, const TracedProcess& traced)
        : dir_(std::move(path)), process_(traced)
    {
        for (const auto& [name, file] : ReadDirectory(dir_)) names_[name] = files_++;
    }

    // A call begins. Its paths are read now, before the process can overwrite them.
    void Begin(const SystemCall& begun)
    {
        call_ = begun;
        first_.reset();
        second_.reset();
        const auto [one, other] = PathsOf(call_);
        if (one >= 0) first_ = NameIn(Argument(one));
        if (other >= 0) second_ = NameIn(Argument(other));
    }

    void End(std::int64_t result)
    {
        if (result >= 0) Note(result);
    }

    Record Take() { return std::move(record_); }

  private:
    static constexpr int Self = -1;  // the directory

    struct Open {
        int file;
        std::size_t at;
        bool appends;
    };

    std::uint64_t Argument(int place) const
    {
        return call_.arguments.at(static_cast<std::size_t>(place));
    }

    // Which arguments of a call are paths; -1 for none.
    static std::pair<int, int> PathsOf(const SystemCall& call)
    {
        switch (call.number) {
            case SYS_openat:
            case SYS_unlinkat: return {1, -1};
            case SYS_renameat:
            case SYS_renameat2: return {1, 3};
#ifdef SYS_open  // newer architectures have only the calls above
            case SYS_open:
            case SYS_unlink: return {0, -1};
            case SYS_rename: return {0, 1};
#endif
            default: return {-1, -1};
        }
    }

    // The path's name in the directory; "." for the directory itself, none for paths elsewhere.
    std::optional<std::string> NameIn(std::uint64_t address) const
    {
        const std::string path = process_.Text(address);
        if (path == dir_) return ".";
        if (path.compare(0, dir_.size() + 1, dir_ + "/") != 0) return {};
        return path.substr(dir_.size() + 1);
    }

    void Note(std::int64_t result)
    {
        switch (call_.number) {
            case SYS_openat: return NoteOpen(static_cast<int>(result), Argument(2));
            case SYS_unlinkat: return NoteRemove();
            case SYS_renameat:
            case SYS_renameat2: return NoteRename();
#ifdef SYS_open
            case SYS_open: return NoteOpen(static_cast<int>(result), Argument(1));
            case SYS_unlink: return NoteRemove();
            case SYS_rename: return NoteRename();
            case SYS_link:
            case SYS_symlink:
            case SYS_creat:
#endif
            case SYS_linkat:
            case SYS_symlinkat:
            case SYS_truncate:
            case SYS_copy_file_range: return Refuse();
            default: break;
        }
        const auto found = descriptors_.find(static_cast<int>(Argument(0)));
        if (found != descriptors_.end()) NoteOfFile(found->second, result);
    }

    [[noreturn]] void Refuse() const
    {
        throw std::runtime_error("system call " + std::to_string(call_.number) + " is not known");
    }

    void NoteOpen(int fd, std::uint64_t flags)
    {
        if (!first_) return;
        if (*first_ == ".") {
            descriptors_[fd] = {Self, 0, false};
            return;
        }
        const auto [name, isNew] = names_.emplace(*first_, files_);
        if (isNew) {
            ++files_;
            record_.push_back({Kind::Make,
                               name->second,
                               *first_,
                               {},
                               0,
                               {},
                               ReadStored(dir_ + "/" + *first_).mode});
        } else if ((flags & O_TRUNC) != 0) {
            record_.push_back({Kind::Resize, name->second});
        }
        descriptors_[fd] = {name->second, 0, (flags & O_APPEND) != 0};
    }

    void NoteRemove()
    {
        if (!first_) return;
        record_.push_back({Kind::Remove, names_.at(*first_), *first_});
        names_.erase(*first_);
    }

    void NoteRename()
    {
        if (!first_ != !second_) throw std::runtime_error("a file is moved in or out");
        if (!first_) return;
        record_.push_back({Kind::Rename, names_.at(*first_), *first_, *second_});
        names_[*second_] = names_.at(*first_);
        names_.erase(*first_);
    }

    // A call whose first argument is an open file.
    void NoteOfFile(Open& open, std::int64_t result)
    {
        switch (call_.number) {
            case SYS_write:
                if (open.appends) throw std::runtime_error("a file is appended to");
                NoteWrite(open.file, open.at, result);
                open.at += static_cast<std::size_t>(result);
                return;
            case SYS_pwrite64: return NoteWrite(open.file, ToSize(SizeAt(3)), result);
#ifdef SYS__llseek  // 32-bit machines have other calls for large files
            case SYS__llseek:
                return Seek(open, process_.Memory(Argument(3), sizeof(std::uint64_t)));
            case SYS_ftruncate64: return NoteResize(open.file, ToSize(SizeAt(1)));
            case SYS_fcntl64:
            case SYS_fstat64:
            case SYS_fstatat64: return;
#else
            case SYS_newfstatat: return;
#endif
            case SYS_lseek: open.at = static_cast<std::size_t>(result); return;
            case SYS_ftruncate: return NoteResize(open.file, ToSize(Argument(1)));
            case SYS_statx: return;
            case SYS_fchmod: {
                const auto mode = static_cast<mode_t>(Argument(1)) & PermissionBits;
                record_.push_back({Kind::SetMode, open.file, {}, {}, 0, {}, mode});
                return;
            }
            case SYS_fsync:
            case SYS_fdatasync:
                record_.push_back(
                    {open.file == Self ? Kind::SyncDirectory : Kind::Sync, open.file});
                return;
            case SYS_close: descriptors_.erase(static_cast<int>(Argument(0))); return;
            case SYS_read: open.at += static_cast<std::size_t>(result); return;
            case SYS_fcntl:
            case SYS_fstat:
            case SYS_getdents64: return;
            default: Refuse();
        }
    }

    // A size or position of 64 bits. On 32-bit machines it takes two arguments, the lower half first,
    // which ARM aligns.
    std::uint64_t SizeAt(int place) const
    {
        if (sizeof(long) == sizeof(std::uint64_t)) return Argument(place);
#ifdef __arm__
        place += place % 2;
#endif
        return Argument(place) | Argument(place + 1) << 32U;
    }

    static void Seek(Open& open, const std::string& position)
    {
        std::uint64_t at = 0;
        position.copy(reinterpret_cast<char*>(&at), sizeof at);
        open.at = ToSize(at);
    }

    void NoteResize(int file, std::size_t size)
    {
        record_.push_back({Kind::Resize, file, {}, {}, size});
    }

    void NoteWrite(int file, std::size_t at, std::int64_t size)
    {
        const std::string text = process_.Memory(Argument(1), static_cast<std::size_t>(size));
        record_.push_back({Kind::Write, file, {}, {}, at, text});
    }

    std::string dir_;
    const TracedProcess& process_;
    std::map<std::string, int> names_;  // to files, as they are now
    int files_ = 0;
    std::map<int, Open> descriptors_;
    Record record_;

    SystemCall call_{};
    std::optional<std::string> first_;  // the names in its arguments
    std::optional<std::string> second_;
};

}  // namespace

bool operator<(const StoredFile& one, const StoredFile& other)
{
    return std::tie(one.text, one.mode) < std::tie(other.text, other.mode);
}

bool operator==(const StoredFile& one, const StoredFile& other)
{
    return one.text == other.text && one.mode == other.mode;
}

Directory ReadDirectory(const std::string& path)
{
    Directory directory;
    for (const auto& entry : std::filesystem::directory_iterator(path)) {
        directory[entry.path().filename()] = ReadStored(entry.path());
    }
    return directory;
}

void WriteDirectory(const std::string& path, const Directory& directory)
{
    for (const auto& entry : std::filesystem::directory_iterator(path)) {
        std::filesystem::remove_all(entry.path());
    }
    for (const auto& [name, file] : directory) {
        const auto place = std::filesystem::path(path) / name;
        std::ofstream(place, std::ios::binary) << file.text;
        std::filesystem::permissions(place, static_cast<std::filesystem::perms>(file.mode));
    }
}

Record RecordChanges(const std::string& path, const std::function<void()>& body)
{
    TracedProcess process(body);
    Recorder recorder(path, process);
    while (process.Step()) {
        const SystemCall call = process.Call();
        if (call.hasEnded) {
            recorder.End(call.result);
        } else {
            recorder.Begin(call);
        }
    }
    if (process.ExitCode() != 0) throw std::runtime_error("the recorded process failed");
    return recorder.Take();
}
