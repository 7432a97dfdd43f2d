#include "chaos.h"

#include <fcntl.h>
#include <signal.h>
#include <unistd.h>

#include <array>
#include <fstream>

#include "support/processes/reap.h"

namespace Soak {

namespace {

enum class Event {
    KillService,
    KillRegistry,
    KillOtherRegistry,
    KillNeighbour,
    KillRefresh,
    FillDisk,
    HoldLock
};

// Every event coincides with every other one sooner or later: a full disk outlasts the next event.
constexpr std::array<Event, 12> Order = {
    Event::HoldLock,    Event::KillService,       Event::FillDisk,      Event::KillRegistry,
    Event::KillRefresh, Event::HoldLock,          Event::KillNeighbour, Event::FillDisk,
    Event::KillService, Event::KillOtherRegistry, Event::KillRefresh,   Event::KillNeighbour};

std::string Ballast(const Plan& plan)
{
    return plan.StatusDirectory() + "/ballast";
}

}  // namespace

Chaos::Chaos(const Plan& thePlan, Company& theCompany, Reaper& theReaper)
    : plan_(thePlan), company_(theCompany), reaper_(theReaper)
{
}

void Chaos::Step(bool areSurvivorsSpared)
{
    const auto now = Clock::now();
    if (isDiskFull_ && now >= diskEmptyDue_) EmptyDisk();
    if (now < due_) return;
    due_ = now + EventEvery;
    switch (Order.at(next_++ % Order.size())) {
        case Event::KillService:
            return areSurvivorsSpared ? KillRefresh() : KillSome(company_.Service());
        case Event::KillRegistry: return KillSome(company_.Registry(areSurvivorsSpared ? 1 : 0));
        case Event::KillOtherRegistry: return KillSome(company_.Registry(1));
        case Event::KillNeighbour: return KillSome(company_.Neighbour());
        case Event::KillRefresh: return KillRefresh();
        case Event::FillDisk: return FillDisk();
        case Event::HoldLock: return HoldLock();
    }
}

void Chaos::Calm()
{
    if (isDiskFull_) EmptyDisk();
    if (holder_) static_cast<void>(reaper_.AwaitEnd(*holder_, plan_.bounds.end));
}

void Chaos::KillSome(Member& member)
{
    member.Kill();
}

// Kills the process that is marked as refreshing, unless it is a member: those refresh themselves
// if there is no status yet.
void Chaos::KillRefresh()
{
    pid_t updater = 0;
    const auto deadline = Clock::now() + EventEvery;
    while (updater == 0 && Clock::now() < deadline) {
        std::ifstream(plan_.StatusFile() + ".pid") >> updater;
    }
    // Kills only our own processes, whatever the file contains.
    if (updater <= 0 || CommandOf(updater).find(plan_.directory) == std::string::npos) return;
    for (const auto& member : company_.Members()) {
        if (member->Pid() == updater) return;
    }
    if (::kill(updater, SIGKILL) == 0) ++events_.refreshesKilled;
}

void Chaos::FillDisk()
{
    const int file = ::open(Ballast(plan_).c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
    const std::array<char, 512> block{};
    while (::write(file, block.data(), block.size()) > 0) {
    }
    ::close(file);
    isDiskFull_ = true;
    diskEmptyDue_ = Clock::now() + DiskIsFull;
    ++events_.disksFilled;
}

void Chaos::EmptyDisk()
{
    ::unlink(Ballast(plan_).c_str());
    isDiskFull_ = false;
}

void Chaos::HoldLock()
{
    if (holder_) {
        const auto end = reaper_.EndOf(*holder_);
        if (!end) return;  // it is still waiting for the lock
        if (ExitCodeOf(*end) != 0) ++events_.locksMissed;
    }
    Pipes pipes;
    holder_ = StartProgram({"/proc/self/exe", "--hold", plan_.Database()}, plan_.LogFile("holder"),
                           pipes);
    ::close(pipes.in);
    ::close(pipes.out);
    ++events_.locksHeld;
}

}  // namespace Soak
