// The pauses that the tested code asks for, counted and not waited for. While a Pauses object
// lives, usleep returns at once, in the library and in SQLite's wait for a lock alike; afterwards
// it sleeps as always. Pauses of more than 100 milliseconds are the library's own: SQLite's steps
// are shorter.
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

    // The library's pauses so far, in microseconds.
    const std::vector<unsigned int>& Taken() const { return taken; }

    // Calls `action` with the number of each pause, from 1, in place of the sleep.
    void OnPause(std::function<void(std::size_t)> action) { onPause = std::move(action); }

    void Note(unsigned int microseconds);

  private:
    std::vector<unsigned int> taken;
    std::function<void(std::size_t)> onPause;
};

// What this process has really slept by usleep, while no such object lived; what its parent had slept
// before the fork counts, too.
struct Slept {
    int pauses;              // of the library's own
    long long microseconds;  // as asked for, in pauses and in SQLite's steps
};
Slept CountSlept();

#endif
