// Processes and the files that they have open, as /proc shows them to the user.
#ifndef ORVADR_PROCESSES_H
#define ORVADR_PROCESSES_H

#include <sys/types.h>

#include <map>
#include <set>
#include <string>

#include <json/value.h>

#include "kernel_locks.h"

namespace Orvadr {

// What stands for the command of a process that may not be looked at.
constexpr const char* NotPermitted = "not permitted";

// The command line of a process, its words separated by blanks; the name in brackets if it has none;
// NotPermitted if the user may not see it.
std::string CommandOf(pid_t pid);

// A process in the program's output: `pid` and `command`.
Json::Value DescribeProcess(pid_t pid, const std::string& command);

// Such an object for people: "4242 node_service --port 80".
std::string ProcessLine(const Json::Value& process);

struct FileUse {
    std::set<pid_t> openers;
    // Who holds a flock, and whether it is exclusive. All processes that share the open file hold it,
    // however they got it.
    std::map<pid_t, bool> flockHolders;
};

struct FileUses {
    std::map<FileId, FileUse> files;  // devices as stat() tells them
    std::set<pid_t> seen;             // processes whose open files could be seen
    bool isComplete = true;           // all processes could be seen
};

// Who uses these files now. Takes no lock and opens none of them.
FileUses FindUses(const std::set<FileId>& files);

}  // namespace Orvadr

#endif
