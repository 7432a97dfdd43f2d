// What a power cut can do to a directory. The system calls of a process are recorded, and from the
// record follows what the disk can hold when the power fails after any of them:
//
// - Until a file is synced, its content, its size and its permission bits may reach the disk in any
//   order, or not at all: the file can be short, cut between two blocks or within one, or have zeros
//   instead of a block or of everything from a block on.
// - Until the directory is synced, names that were made, replaced or removed may reach the disk in
//   any order, or not at all. A renamed file can be there under both names or under neither, but a
//   replaced name always leads to one of the two files.
//
//     const Record record = RecordChanges(dir, [&] { toFile(value, path); });
//     for (const Directory& state : StatesAfterCut(before, record)) ...
#ifndef ORVADRCORE_TESTS_POWER_CUT_H
#define ORVADRCORE_TESTS_POWER_CUT_H

#include <sys/types.h>

#include <cstddef>
#include <functional>
#include <map>
#include <set>
#include <string>
#include <vector>

struct StoredFile {
    std::string text;
    mode_t mode;
};
bool operator<(const StoredFile& one, const StoredFile& other);
bool operator==(const StoredFile& one, const StoredFile& other);

// Files by name.
using Directory = std::map<std::string, StoredFile>;

// Reads a directory, and makes it hold these files and nothing else.
Directory ReadDirectory(const std::string& path);
void WriteDirectory(const std::string& path, const Directory& directory);

enum class Kind { Make, Resize, Write, SetMode, Sync, Rename, Remove, SyncDirectory };

struct Change {
    Kind kind;
    int file = -1;          // numbers: first those that are there, in order of names, then new ones
    std::string name{};     // made, renamed or removed
    std::string newName{};  // after a rename
    std::size_t at = 0;     // offset of a write, or the new size
    std::string text{};     // what is written
    mode_t mode = 0;        // of a new file, or after SetMode
};
using Record = std::vector<Change>;

// Runs `body` in a child and records its changes to the directory and its files. It must use full
// paths. Throws when the child fails, or makes a system call that changes files in a way not
// modelled here.
Record RecordChanges(const std::string& path, const std::function<void()>& body);

// All that the disk can hold after a power cut: after the last change, or after any of them.
std::set<Directory> StatesAfterCut(const Directory& before, const Record& record);
std::set<Directory> StatesAfterAnyCut(const Directory& before, const Record& record);

#endif
