// What happens in a soak, and the bounds that it must keep.
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
constexpr int LiveNodes = 12;    // of one client, which then deletes some

constexpr milliseconds EventEvery{2000};  // a kill, a full disk or a held lock
constexpr milliseconds DiskIsFull{3000};
constexpr milliseconds LockIsHeld{1000};
constexpr int SmallDiskBytes = 256 * 1024;  // the disk of the status

// ------------------------------------------------------------------------------------ what must hold

struct Bounds {
    // The longest that a request may take, from connecting to the complete reply. A create waits
    // for a thread of the service, then up to three times for the database: name check, table
    // lookup, insert. Each may meet the lock that is held for a second.
    milliseconds wait{10'000};

    // The longest that a client may be without an answer: one request, and the time until a killed
    // service listens again.
    milliseconds gap{15'000};

    // The client with the fewest answers must have this share of the average. Not checked for small
    // averages, where chance decides.
    double share = 0.5;
    double smallAverage = 100;

    // The longest that the status may stay unchanged while clients ask for it and its disk has
    // room.
    milliseconds stale{10'000};

    // How long a killed process may take to restart, and a process to end when it is told to.
    milliseconds start{15'000};
    milliseconds end{15'000};

    // How much more a process may have at the end than in the middle, both times without a request
    // in progress. Descriptors do not vary then. Memory does a little, because the database grows.
    int descriptors = 0;
    long kiBytes = 4096;
};

// Memory is not checked in shorter runs: the clients have not created all their nodes by the
// middle.
constexpr seconds LongEnoughForMemory{60};

// ------------------------------------------------------------------------------------------ one run

struct Plan {
    seconds length{120};
    Bounds bounds;
    std::string directory;  // of the run

    std::string Database() const { return directory + "/data/nodes.db"; }
    std::string StatusDirectory() const { return directory + "/status"; }
    std::string StatusFile() const { return StatusDirectory() + "/nodes.db.status.cached"; }
    std::string LogFile(const std::string& name) const { return directory + "/log/" + name; }
};

}  // namespace Soak

#endif
