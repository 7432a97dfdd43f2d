#include "report.h"

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <map>

#include <orvadrcore/errors.h>

namespace Soak {

using OrvaDRCore::ERR;

namespace {

constexpr double Percentiles[] = {50, 90, 99, 99.9};

double ToMSec(std::uint32_t microseconds)
{
    return microseconds / 1000.0;
}

// A percentile of values, which must be sorted and not empty.
std::uint32_t PercentileOf(const std::vector<std::uint32_t>& sorted, double percent)
{
    const double rank = percent / 100 * static_cast<double>(sorted.size() - 1);
    return sorted.at(static_cast<std::size_t>(rank));
}

void PrintLatencies(const char* name, std::vector<std::uint32_t> microseconds)
{
    if (microseconds.empty()) return;
    std::sort(microseconds.begin(), microseconds.end());
    std::printf("  %-10s %8zu", name, microseconds.size());
    for (const double percent : Percentiles) {
        std::printf(" %9.1f", ToMSec(PercentileOf(microseconds, percent)));
    }
    std::printf(" %9.1f\n", ToMSec(microseconds.back()));
}

// How evenly the answers are distributed among these clients.
void PrintShares(const char* kind, std::vector<const Client*> clients)
{
    const auto fewer = [](const Client* left, const Client* right) {
        return left->CountAnswers() < right->CountAnswers();
    };
    const auto shorter = [](const Client* left, const Client* right) {
        return left->GetNotes().longestGap < right->GetNotes().longestGap;
    };
    std::sort(clients.begin(), clients.end(), fewer);
    const Client* hungriest = *std::max_element(clients.begin(), clients.end(), shorter);
    std::printf("  %-10s %zu with %zu to %zu answers; the longest time without one: %lld ms (%s)\n",
                kind, clients.size(), clients.front()->CountAnswers(),
                clients.back()->CountAnswers(),
                static_cast<long long>(hungriest->GetNotes().longestGap.count()),
                hungriest->Name().c_str());
}

void PrintTimes(const std::vector<const Client*>& clients, milliseconds length)
{
    std::array<std::vector<std::uint32_t>, Kinds> byKind;
    std::vector<std::uint32_t> all;
    for (const Client* client : clients) {
        for (std::size_t kind = 0; kind < Kinds; ++kind) {
            const auto& times = client->GetNotes().microseconds.at(kind);
            byKind.at(kind).insert(byKind.at(kind).end(), times.begin(), times.end());
            all.insert(all.end(), times.begin(), times.end());
        }
    }
    const double duration = static_cast<double>(length.count()) / 1000;
    std::printf("requests     %zu answered, %.0f a second\n", all.size(),
                static_cast<double>(all.size()) / duration);
    std::printf("  %-10s %8s %9s %9s %9s %9s %9s\n", "ms", "count", "50 %", "90 %", "99 %",
                "99.9 %", "worst");
    for (std::size_t kind = 0; kind < Kinds; ++kind) {
        PrintLatencies(NameOf(static_cast<Kind>(kind)), byKind.at(kind));
    }
    PrintLatencies("all", all);
}

void PrintFailures(const std::vector<const Client*>& clients)
{
    std::map<int, int> givenUp;
    int lost = 0;
    for (const Client* client : clients) {
        for (const auto& [code, times] : client->GetNotes().givenUp) givenUp[code] += times;
        lost += client->GetNotes().lost;
    }
    std::printf("lost         %d answers to requests in progress when a process was killed\n",
                lost);
    std::printf("given up    ");
    if (givenUp.empty()) std::printf(" 0");
    for (const auto& [code, times] : givenUp) {
        std::printf(" %d times %s", times, ERR::ToString(code).c_str());
    }
    std::printf("\n");
}

}  // namespace

void PrintLoad(const std::vector<const Client*>& clients, milliseconds length)
{
    PrintTimes(clients, length);
    const auto registries = clients.begin() + Connections;
    std::printf("clients\n");
    PrintShares("http", {clients.begin(), registries});
    PrintShares("line", {registries, clients.end()});
    PrintFailures(clients);
}

void PrintEvents(const Events& events, const Company& company)
{
    int kills = events.refreshesKilled;
    for (const auto& member : company.Members()) kills += member->Kills();
    std::printf("kills        %d survived:", kills);
    for (const auto& member : company.Members()) {
        std::printf(" %s %d,", member->Name().c_str(), member->Kills());
    }
    std::printf(" refreshes %d; the longest start took %lld ms\n", events.refreshesKilled,
                static_cast<long long>(company.Service().LongestStart().count()));
    std::printf("disk full    %d times\n", events.disksFilled);
    std::printf("lock held    %d times for %lld ms, missed %d times\n", events.locksHeld,
                static_cast<long long>(LockIsHeld.count()), events.locksMissed);
}

void PrintStatus(const RefreshWatch& refreshes, const NeighbourWatch& neighbour)
{
    std::printf("refreshes    %d; the longest time without one: %lld ms\n", refreshes.Refreshes(),
                static_cast<long long>(refreshes.LongestGap().count()));
    std::printf("neighbour    read the status %d times, failed %d times\n", neighbour.Reads(),
                neighbour.Failures());
}

void PrintUsages(const std::vector<Usage>& before, const std::vector<Usage>& after)
{
    for (std::size_t index = 0; index < before.size(); ++index) {
        const Usage& first = before[index];
        const Usage& last = after[index];
        if (first.pid != last.pid) continue;
        std::printf("survivor     %s: %d -> %d descriptors, %ld -> %ld KiB\n", last.name.c_str(),
                    first.descriptors, last.descriptors, first.kiBytes, last.kiBytes);
    }
}

void PrintComparison(const Comparison& comparison)
{
    std::printf("stored       %d nodes as confirmed; of %d whose answer was lost, %d\n",
                comparison.stored, comparison.unknown, comparison.unknownFound);
}

void PrintFindings(const Findings& findings)
{
    for (const Promise promise : AllPromises) {
        const std::vector<std::string> texts = findings.Of(promise);
        std::printf("%s  %s\n", texts.empty() ? "kept  " : "BROKEN", WordsOf(promise));
        for (const std::string& text : texts) std::printf("          %s\n", text.c_str());
    }
}

}  // namespace Soak
