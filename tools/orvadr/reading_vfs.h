// SQLite's access to files, without any that would create, change or remove one.
#ifndef ORVADR_READING_VFS_H
#define ORVADR_READING_VFS_H

#include <string>

namespace Orvadr {

// How a database is opened, so that nothing is written. All ways open it for reading only.
enum class Way {
    Locked,     // with SQLite's locks; those who write wait for us, and we for them
    SharedWal,  // likewise, with the write-ahead log and its shared memory, which are not changed
    PrivateWal,  // without locks, with the log and an index of it in our own memory: there is no shared one
    Immutable,  // without locks and without a log: there is none
};

// The URI for a path. Registers what it names with SQLite.
std::string UriOf(const std::string& path, Way way);

}  // namespace Orvadr

#endif
