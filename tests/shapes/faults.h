// Faults that the comparison must find. Each spoils what SQLite tells the library, now and then.
#ifndef ORVADRCORE_TESTS_SHAPES_FAULTS_H
#define ORVADRCORE_TESTS_SHAPES_FAULTS_H

#include <array>
#include <cstddef>

#include "support/fakes/sqlite_faults.h"

namespace Shapes {

enum class Fault {
    None,
    LostRow,        // a row of a select is skipped
    LostWrite,      // a statement that writes succeeds and does nothing
    WrongText,      // a text has other bytes
    FailedAttempt,  // a step fails once
    KeptLock        // a statement that was read is not ended
};

struct NamedFault {
    Fault fault;
    const char* name;
};
constexpr std::array<NamedFault, 5> AllFaults = {{{Fault::LostRow, "a lost row"},
                                                  {Fault::LostWrite, "a lost write"},
                                                  {Fault::WrongText, "a wrong text"},
                                                  {Fault::FailedAttempt, "a failed attempt"},
                                                  {Fault::KeptLock, "a lock that is kept"}}};

class PlantedFault {
  public:
    explicit PlantedFault(Fault fault);

    // Only while the tested side runs.
    void Activate(bool isActive) { isActive_ = isActive; }

  private:
    int Step(sqlite3_stmt* statement);
    bool IsDue();

    const Fault fault_;
    bool isActive_ = false;
    std::size_t calls_ = 0;
    SqliteFaults faults_;
};

}  // namespace Shapes

#endif
