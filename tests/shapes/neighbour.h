// Connections that do not use the library: in this process, and in another one.
#ifndef ORVADRCORE_TESTS_SHAPES_NEIGHBOUR_H
#define ORVADRCORE_TESTS_SHAPES_NEIGHBOUR_H

#include <sqlite3.h>
#include <sys/types.h>

#include <cstdint>
#include <string>

namespace Shapes {

// From now on row ids and names of temporary files that SQLite chooses depend on the seed.
void SeedSqlite(std::uint64_t seed);

// A connection to a file. It never waits for a lock.
class Neighbour {
  public:
    Neighbour() = default;
    Neighbour(const Neighbour&) = delete;
    Neighbour& operator=(const Neighbour&) = delete;
    ~Neighbour() { Close(); }

    void Open(const std::string& path);
    void Close();

    // Runs statements. Returns their rows with the type of each value, and SQLite's message.
    std::string Run(const std::string& statements);

    // All that is in the file.
    std::string ReadAll();

    // What others could do now: write while somebody reads, write, or read.
    std::string TryLocks();

  private:
    sqlite3* handle_ = nullptr;
};

// The same in a process of its own, which ends with the object.
class NeighbourProcess {
  public:
    NeighbourProcess();
    NeighbourProcess(const NeighbourProcess&) = delete;
    NeighbourProcess& operator=(const NeighbourProcess&) = delete;
    ~NeighbourProcess();

    void Open(const std::string& path);
    void Close();
    std::string Run(const std::string& statements);

  private:
    std::string Ask(char order, const std::string& text) const;

    pid_t pid_ = -1;
    int socket_ = -1;
};

}  // namespace Shapes

#endif
