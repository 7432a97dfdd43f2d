// Counts the pauses of the tested code instead of sleeping. While a Pauses object lives, usleep
// returns at once, in the library and in SQLite; otherwise it sleeps. Pauses of more than 100
// milliseconds are those between the library's attempts. Shorter ones are those of an attempt that
// waits for a lock, in the library's busy handler or in SQLite's.
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

    // The pauses between attempts so far, in microseconds.
    const std::vector<unsigned int>& Taken() const { return taken_; }

    // At each pause between attempts calls `action` with its number, from 1, instead of sleeping.
    void OnPause(std::function<void(std::size_t)> action) { onPause_ = std::move(action); }

    // The same for the pauses within an attempt. They are recorded after the first call of
    // OnWait().
    const std::vector<unsigned int>& Waits() const { return waits_; }
    void OnWait(std::function<void(std::size_t)> action);
    void ForgetWaits() { waits_.clear(); }

    void Note(unsigned int microseconds);

  private:
    std::vector<unsigned int> taken_;
    std::function<void(std::size_t)> onPause_;
    std::vector<unsigned int> waits_;
    std::function<void(std::size_t)> onWait_;
};

// What this process has really slept in usleep, while no Pauses object lived. Includes what its
// parent had slept before the fork.
struct Slept {
    int pauses;              // between attempts
    long long microseconds;  // as requested; pauses within attempts included
};
Slept CountSlept();

#endif
