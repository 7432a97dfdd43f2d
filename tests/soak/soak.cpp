#include "soak.h"

#include <sys/mount.h>
#include <syslog.h>

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <string>
#include <system_error>
#include <thread>
#include <vector>

#include <orvadrcore/file_lock.h>

#include "chaos.h"
#include "checks.h"
#include "company.h"
#include "findings.h"
#include "load.h"
#include "process.h"
#include "report.h"
#include "support/processes/rights.h"
#include "watch.h"

namespace Soak {

using OrvaDRCore::FileLock;

namespace {

constexpr milliseconds StepEvery{10};
constexpr milliseconds Calmness{2000};  // at the end, so that refreshes happen after the last kill

// Parts of the run: when the service and a registry are killed for the last time, and when their
// resources are measured first. By then all their threads have worked.
constexpr double SpareFrom = 0.4;
constexpr double MeasureAt = 0.5;

// Makes things go wrong until a point in time.
void MakeTrouble(Chaos& chaos, Company& company, Clock::time_point until, bool areSurvivorsSpared)
{
    while (Clock::now() < until) {
        chaos.Step(areSurvivorsSpared);
        company.Tend();
        std::this_thread::sleep_for(StepEvery);
    }
}

std::vector<const Ledger*> LedgersOf(const Load& load)
{
    std::vector<const Ledger*> ledgers;
    for (const Client* client : load.Clients()) ledgers.push_back(&client->Accounts());
    return ledgers;
}

// Makes started programs return freed memory to the system, so that a growing heap shows after a
// minute instead of hours.
void SteadyTheHeap()
{
    for (const char* setting : {"MALLOC_MMAP_THRESHOLD_", "MALLOC_TRIM_THRESHOLD_"}) {
        ::setenv(setting, "65536", 1);
    }
    ::setenv("MALLOC_ARENA_MAX", "2", 1);
}

void RemoveAll(const Plan& plan)
{
    std::error_code ignored;
    ::umount(plan.StatusDirectory().c_str());
    std::filesystem::remove_all(plan.directory, ignored);
    std::filesystem::remove_all(FileLock::getLockFilePath(plan.directory), ignored);
}

}  // namespace

bool Prepare(const Plan& plan)
{
    std::error_code error;
    const std::filesystem::path root = plan.directory;
    for (const char* name : {"data", "status", "log"}) {
        std::filesystem::create_directory(root / name, error);
        if (error) return false;
    }
    SteadyTheHeap();
    return BecomeRoot() && MountSmallDisk(plan.StatusDirectory(), SmallDiskBytes);
}

bool Run(const Plan& plan)
{
    const auto begin = Clock::now();
    const auto at = [&](double part) {
        return begin + std::chrono::duration_cast<milliseconds>(plan.length * part);
    };
    std::printf("soak         %lld s, %d connections, in %s\n",
                static_cast<long long>(plan.length.count()), Connections, plan.directory.c_str());
    static_cast<void>(std::fflush(stdout));

    Findings findings;
    Reaper reaper;
    Company company(plan, reaper, findings);
    Chaos chaos(plan, company, reaper);
    company.Start();
    Load load(plan, company, findings);
    load.Start();
    NeighbourWatch neighbour(company.NeighbourChannel());
    RefreshWatch refreshes(
        plan, [&] { return chaos.IsDiskFull(); }, findings);

    MakeTrouble(chaos, company, at(SpareFrom), false);
    MakeTrouble(chaos, company, at(MeasureAt), true);
    std::vector<Usage> before;
    load.Pause([&] { before = UsagesOf(company); });
    MakeTrouble(chaos, company, at(1) - Calmness, true);
    chaos.Calm();
    company.Tend();
    std::this_thread::sleep_for(Calmness);
    load.Stop();
    const auto length = std::chrono::duration_cast<milliseconds>(Clock::now() - begin);
    const std::vector<Usage> after = UsagesOf(company);
    refreshes.Stop();
    neighbour.Stop();
    company.End();

    CheckLock(FileLock::getLockFilePath(plan.StatusFile() + ".lock"), findings);
    CheckProcesses(plan, findings);
    CheckFiles(plan, findings);
    const Comparison comparison = CheckDatabase(plan.Database(), LedgersOf(load), findings);
    CompareUsages(plan, before, after, findings);
    for (const Client* client : load.Clients()) {
        CheckGap(plan, client->Name(), client->GetNotes().longestGap, findings);
    }
    CheckGap(plan, "neighbour", neighbour.LongestGap(), findings);
    CheckShares(plan, load.HttpClients(), findings);

    PrintLoad(load.Clients(), length);
    PrintStatus(refreshes, neighbour);
    PrintEvents(chaos.GetEvents(), company);
    PrintUsages(before, after);
    PrintComparison(comparison);
    PrintFindings(findings);
    if (findings.IsEmpty()) RemoveAll(plan);
    return findings.IsEmpty();
}

}  // namespace Soak
