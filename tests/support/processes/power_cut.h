// What a power cut makes of a directory. A process's changes are recorded as it asks the kernel for
// them; from the record follows what the disk can hold when the power goes behind any of them:
//
// - What was written to a file, its size and its permission bits reach the disk in any order, and
//   none of it needs to, until the file is synced: a file can be short, cut between two blocks or
//   within one, or have zeros in place of a block or of all that follows one.
// - Names that are made, replaced or removed reach the disk in any order, and none of them needs to,
//   until the directory is synced. A renamed file can be there under both names or under neither;
//   but a name that is replaced leads to the one file or to the other.
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

// What a directory holds, and its being made to hold that and nothing else.
Directory ReadDirectory(const std::string& path);
void WriteDirectory(const std::string& path, const Directory& directory);

enum class Kind { Make, Resize, Write, SetMode, Sync, Rename, Remove, SyncDirectory };

struct Change {
    Kind kind;
    int file = -1;          // by number: the directory's in the order of names, then the made
    std::string name{};     // that is made, renamed or removed
    std::string newName{};  // of a rename
    std::size_t at = 0;     // where is written; the new size
    std::string text{};     // what is written
    mode_t mode = 0;        // of the made, or set
};
using Record = std::vector<Change>;

// Runs `body` in a process of its own and records what that process does to the directory and its
// files, which it names by their full paths. Throws when the process fails, or makes a system call
// that changes files in a way of which nothing is known here.
Record RecordChanges(const std::string& path, const std::function<void()>& body);

// All that the disk can hold after a cut behind the last of the changes, or behind any of them.
std::set<Directory> StatesAfterCut(const Directory& before, const Record& record);
std::set<Directory> StatesAfterAnyCut(const Directory& before, const Record& record);

#endif
