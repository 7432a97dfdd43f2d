// One of the two libraries that are compared, with a database of its own.
//
// Both are the same code in the same process. The side switches the shortcuts on or off before each
// of its operations.
#ifndef ORVADRCORE_TESTS_SHAPES_SIDE_H
#define ORVADRCORE_TESTS_SHAPES_SIDE_H

#include <orvadrcore/sqlite_db.h>
#include <orvadrcore/sqlite_transaction.h>

#include <array>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <utility>

#include "neighbour.h"
#include "schemas.h"
#include "sqlite/sqlite_shortcuts.h"

namespace Shapes {

class Side;

// What is done on both sides. It knows nothing about earlier operations, so that any of them can be
// left out of a script.
struct Operation {
    std::string text;  // for people
    std::function<void(Side&)> run;
};

constexpr std::size_t ConnectionCount = 2;
using RetryLimits = std::array<unsigned int, ConnectionCount>;

class Side {
  public:
    explicit Side(const std::string& directory);
    Side(const Side&) = delete;
    Side& operator=(const Side&) = delete;
    ~Side();

    // Makes new files, with closed connections.
    void Begin(const Schema& schema, const RetryLimits& limits,
               const OrvaDRCore::Shortcuts& shortcuts);

    // Closes everything and reads what is in the files.
    std::string End();

    // Returns everything that a program can notice of the operation.
    std::string Run(const Operation& operation, std::uint64_t seed);

    // ----------------------------------------------------------------------------- for operations

    OrvaDRCore::SqliteDB& Db(std::size_t which) { return *dbs_[which]; }
    OrvaDRCore::SqliteTransaction& Transaction(std::size_t which);
    void DropTransaction(std::size_t which) { transactions_[which].reset(); }

    // A connection without the library, in another process or in this one.
    std::string RunAsNeighbour(bool isProcess, const std::string& statements);
    Neighbour& Second() { return second_; }

    // Adds something that can be noticed.
    void Note(const char* name, const std::string& value);
    void Note(const char* name, std::int64_t value) { Note(name, std::to_string(value)); }

    // Does something once in this operation: at that pause between attempts, or at that wait for a
    // lock, from 1.
    using Action = std::function<void()>;
    void AtPause(std::size_t number, Action action) { atPause_ = {number, std::move(action)}; }
    void AtWait(std::size_t number, Action action) { atWait_ = {number, std::move(action)}; }

  private:
    void Enter() const;
    void Close();
    void NoteState(std::size_t which);

    struct Planned {
        std::size_t number = 0;
        Action action;
    };
    static void Do(const Planned& planned, std::size_t number);

    const std::string directory_;
    OrvaDRCore::Shortcuts shortcuts_;
    std::array<std::optional<OrvaDRCore::SqliteDB>, ConnectionCount> dbs_;
    std::array<std::optional<OrvaDRCore::SqliteTransaction>, ConnectionCount> transactions_;
    Neighbour second_;
    NeighbourProcess process_;
    Planned atPause_;
    Planned atWait_;
    std::string outcome_;
};

}  // namespace Shapes

#endif
