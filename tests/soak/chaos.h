// Makes things go wrong during a soak, one every few seconds.
#ifndef ORVADRCORE_TESTS_SOAK_CHAOS_H
#define ORVADRCORE_TESTS_SOAK_CHAOS_H

#include <atomic>
#include <optional>
#include <string>
#include <vector>

#include "company.h"
#include "plan.h"

namespace Soak {

// How often each event happened.
struct Events {
    int refreshesKilled = 0;
    int disksFilled = 0;
    int locksHeld = 0;
    int locksMissed = 0;  // the lock could not be taken
};

class Chaos {
  public:
    Chaos(const Plan& plan, Company& company, Reaper& reaper);

    // Does what is due. Does not kill the service and the first registry if survivors are spared.
    void Step(bool areSurvivorsSpared);

    // Ends what is still going on.
    void Calm();

    bool IsDiskFull() const { return isDiskFull_; }
    const Events& GetEvents() const { return events_; }

  private:
    void KillSome(Member& member);
    void KillRefresh();
    void FillDisk();
    void EmptyDisk();
    void HoldLock();

    const Plan& plan_;
    Company& company_;
    Reaper& reaper_;
    Events events_;
    std::size_t next_ = 0;
    Clock::time_point due_ = Clock::now();
    Clock::time_point diskEmptyDue_;
    std::atomic<bool> isDiskFull_{false};
    std::optional<pid_t> holder_;
};

}  // namespace Soak

#endif
