// Runs scripts on both sides and compares.
#ifndef ORVADRCORE_TESTS_SHAPES_COMPARISON_H
#define ORVADRCORE_TESTS_SHAPES_COMPARISON_H

#include <cstddef>
#include <optional>
#include <string>

#include "faults.h"
#include "script.h"
#include "side.h"

namespace Shapes {

struct Difference {
    std::size_t operation;  // from 1; one more than there are: the files at the end
    std::string without;    // what could be noticed without the shortcuts
    std::string with;
};

class Comparison {
  public:
    // `fault` spoils the side that is tested.
    explicit Comparison(const std::string& directory, Fault fault = Fault::None);

    // Stops at the first difference, and after `count` operations.
    std::optional<Difference> Run(const Script& script, std::size_t count);

    // From now on prints each operation with what can be noticed of it.
    void ShowOperations() { isShowing_ = true; }

    // How many operations were run on both sides.
    std::size_t CountOperations() const { return operations_; }

    // Leaves out operations as long as there is a difference. The script must have one.
    Script Shrink(Script script, Difference& difference);

  private:
    Side plain_;
    Side tested_;
    PlantedFault fault_;
    std::size_t operations_ = 0;
    bool isShowing_ = false;
};

// For people: where they differ, with the operation and both results.
std::string Report(const Script& script, const Difference& difference);

}  // namespace Shapes

#endif
