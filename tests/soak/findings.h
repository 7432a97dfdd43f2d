// What a soak has found to be broken.
#ifndef ORVADRCORE_TESTS_SOAK_FINDINGS_H
#define ORVADRCORE_TESTS_SOAK_FINDINGS_H

#include <map>
#include <mutex>
#include <string>
#include <vector>

namespace Soak {

// The promises, in the order of the report.
enum class Promise {
    Answers,
    Stored,
    Integrity,
    Refreshes,
    Waits,
    Starvation,
    Ends,
    Growth,
    LeftOvers
};
constexpr Promise AllPromises[] = {Promise::Answers,   Promise::Stored, Promise::Integrity,
                                   Promise::Refreshes, Promise::Waits,  Promise::Starvation,
                                   Promise::Ends,      Promise::Growth, Promise::LeftOvers};

const char* WordsOf(Promise promise);

// Findings may be added by any thread.
class Findings {
  public:
    void Add(Promise promise, const std::string& text);

    // Those of one promise; the first ones, and a line that says how many more there were.
    std::vector<std::string> Of(Promise promise) const;
    bool IsEmpty() const;

  private:
    mutable std::mutex mutex;
    std::map<Promise, std::vector<std::string>> texts;
};

}  // namespace Soak

#endif
