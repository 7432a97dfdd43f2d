#include "reading_vfs.h"

#include <sqlite3.h>

#include <array>
#include <cstdio>

namespace Orvadr {

namespace {

// One of SQLite's own, with other functions for opening and removing.
struct ReadingVfs : sqlite3_vfs {
    sqlite3_vfs* original;
};

// SQLite opens a missing log so that it is created, even for a reader.
int OpenForReading(sqlite3_vfs* vfs, const char* name, sqlite3_file* file, int flags,
                   int* ret_flags)
{
    constexpr int Persistent = SQLITE_OPEN_MAIN_DB | SQLITE_OPEN_MAIN_JOURNAL | SQLITE_OPEN_WAL |
                               SQLITE_OPEN_SUPER_JOURNAL;
    constexpr int Writing = SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE | SQLITE_OPEN_DELETEONCLOSE;
    if ((flags & Persistent) != 0) flags = (flags & ~Writing) | SQLITE_OPEN_READONLY;
    sqlite3_vfs* const original = static_cast<ReadingVfs*>(vfs)->original;
    return original->xOpen(original, name, file, flags, ret_flags);
}

int RefuseToRemove(sqlite3_vfs* /*vfs*/, const char* /*name*/, int /*syncDirectory*/)
{
    return SQLITE_READONLY;
}

// Registers a variant of the VFS `original`, once. They are used by one thread.
const char* Register(const char* original, const char* name, ReadingVfs& vfs)
{
    if (vfs.original != nullptr) return name;
    sqlite3_vfs* const found = ::sqlite3_vfs_find(original);
    static_cast<sqlite3_vfs&>(vfs) = *found;
    vfs.original = found;
    vfs.pNext = nullptr;
    vfs.zName = name;
    vfs.xOpen = OpenForReading;
    vfs.xDelete = RefuseToRemove;
    ::sqlite3_vfs_register(&vfs, 0);
    return name;
}

const char* LockingVfs()
{
    static ReadingVfs vfs{};
    return Register("unix", "orvadr", vfs);
}

const char* VfsWithoutLocks()
{
    static ReadingVfs vfs{};
    return Register("unix-none", "orvadr-none", vfs);
}

// The path with what has a meaning in a URI as %xx.
std::string Encode(const std::string& path)
{
    std::string encoded;
    for (const char character : path) {
        if (character != '?' && character != '#' && character != '%') {
            encoded += character;
            continue;
        }
        std::array<char, 4> code{};
        (void)std::snprintf(code.data(), code.size(), "%%%02x",
                            static_cast<unsigned int>(character));
        encoded += code.data();
    }
    return encoded;
}

}  // namespace

std::string UriOf(const std::string& path, Way way)
{
    // "//" in front of an absolute path, or the first name in "//a/b" would be taken for a machine.
    const std::string uri = (path[0] == '/' ? "file://" : "file:") + Encode(path) + "?mode=ro&vfs=";
    switch (way) {
        case Way::PrivateWal: return uri + VfsWithoutLocks();
        case Way::Immutable: return uri + LockingVfs() + "&immutable=1";
        default: return uri + LockingVfs() + "&readonly_shm=1";
    }
}

}  // namespace Orvadr
