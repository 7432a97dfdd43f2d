// How long a soak lasts, what takes part in it, and the bounds that it must keep.
#ifndef ORVADRCORE_TESTS_SOAK_PLAN_H
#define ORVADRCORE_TESTS_SOAK_PLAN_H

#include <chrono>
#include <cstddef>
#include <string>

namespace Soak {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;
using std::chrono::seconds;

// ---------------------------------------------------------------------------------- what happens

constexpr int Connections = 64;  // HTTP clients, each with one request at a time
constexpr int Registries = 2;    // command-line registries, with a client each
constexpr int LiveNodes = 12;    // of one client; then it deletes some

constexpr milliseconds EventEvery{2000};  // a kill, a full disk or a held lock
constexpr milliseconds DiskIsFull{3000};
constexpr milliseconds LockIsHeld{1000};
constexpr int SmallDiskBytes = 256 * 1024;  // of the status

// ------------------------------------------------------------------------------------ what must hold

struct Bounds {
    // The longest that a request may take from connecting to its whole reply. A create waits for a
    // thread of the service, then for the database up to three times: is the name free, is the table
    // there, insert. Each may meet the lock that is held for a second.
    milliseconds wait{10'000};

    // The longest that a client may be without any answer: a wait, and the time until a killed service
    // listens again. So everybody has an answer in every window of that length.
    milliseconds gap{15'000};

    // The part of the average that the client with the fewest answers must have, among those of a kind.
    // Where the average is small, chance decides.
    double share = 0.5;
    double smallAverage = 100;

    // The longest that the status may stay as it is while clients ask for it and its disk has room.
    milliseconds stale{10'000};

    // How long a killed process may take to be there again, and any process to end when it is told to.
    milliseconds start{15'000};
    milliseconds end{15'000};

    // What a process may have more at the end than in the middle, both times without a request under
    // way. Descriptors do not vary then. Memory does a little: the database has grown by then.
    int descriptors = 0;
    long kiBytes = 4096;
};

// In a shorter run memory says nothing: the clients have not made all their nodes by the middle.
constexpr seconds LongEnoughForMemory{60};

// ------------------------------------------------------------------------------------------ one run

struct Plan {
    seconds length{120};
    Bounds bounds;
    std::string directory;  // of the run; holds what follows

    std::string Database() const { return directory + "/data/nodes.db"; }
    std::string StatusDirectory() const { return directory + "/status"; }
    std::string StatusFile() const { return StatusDirectory() + "/nodes.db.status.cached"; }
    std::string LogFile(const std::string& name) const { return directory + "/log/" + name; }
};

}  // namespace Soak

#endif
