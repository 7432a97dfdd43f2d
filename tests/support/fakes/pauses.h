// The pauses that the tested code asks for, counted and not waited for. While a Pauses object
// lives, usleep returns at once, in the library and in SQLite alike; afterwards it sleeps as always.
// Pauses of more than 100 milliseconds are those between the tries of the library; shorter ones are
// those within a try that waits for a lock, by the library's busy handler or by SQLite's own.
#ifndef ORVADRCORE_TESTS_PAUSES_H
#define ORVADRCORE_TESTS_PAUSES_H

#include <functional>
#include <vector>

class Pauses {
  public:
    Pauses();
    Pauses(const Pauses&) = delete;
    Pauses& operator=(const Pauses&) = delete;
    ~Pauses();

    // The pauses between tries so far, in microseconds.
    const std::vector<unsigned int>& Taken() const { return taken; }

    // Calls `action` with the number of each pause between tries, from 1, in place of the sleep.
    void OnPause(std::function<void(std::size_t)> action) { onPause = std::move(action); }

    // The same for the pauses within a try, which are kept from the first call of OnWait() on.
    const std::vector<unsigned int>& Waits() const { return waits; }
    void OnWait(std::function<void(std::size_t)> action);
    void ForgetWaits() { waits.clear(); }

    void Note(unsigned int microseconds);

  private:
    std::vector<unsigned int> taken;
    std::function<void(std::size_t)> onPause;
    std::vector<unsigned int> waits;
    std::function<void(std::size_t)> onWait;
};

// What this process has really slept by usleep, while no such object lived; what its parent had slept
// before the fork counts, too.
struct Slept {
    int pauses;              // between tries
    long long microseconds;  // as asked for, within tries, too
};
Slept CountSlept();

#endif
