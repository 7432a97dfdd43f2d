// The changes that a process makes to a directory and its files, recorded from its system calls.
#ifndef ORVADRCORE_TESTS_RECORDED_CHANGES_H
#define ORVADRCORE_TESTS_RECORDED_CHANGES_H

#include <sys/types.h>

#include <cstddef>
#include <functional>
#include <map>
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

#endif
