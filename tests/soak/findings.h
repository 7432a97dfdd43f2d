// The broken promises that a soak has found.
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

// Any thread may add findings.
class Findings {
  public:
    void Add(Promise promise, const std::string& text);

    // The first findings about a promise, and a line with the number of the others.
    std::vector<std::string> Of(Promise promise) const;
    bool IsEmpty() const;

  private:
    mutable std::mutex mutex_;
    std::map<Promise, std::vector<std::string>> texts_;
};

}  // namespace Soak

#endif
