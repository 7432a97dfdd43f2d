#include "ledger.h"

namespace Soak {

namespace {

using Rows = std::multimap<std::string, const Row*>;  // by name

// What is wrong with a node in the database, as words that follow its name; empty if nothing is.
std::string ProblemOf(const Account& account, const Row& row)
{
    if (account.state == State::Absent)
        return " is there, although it was never created or was deleted";
    if (!account.id.empty() && account.id != row.id) return " has another id than the reply said";
    if (account.ports.count(row.port) == 0) {
        return " has port " + std::to_string(row.port) +
               ", which was never requested or has been replaced";
    }
    return {};
}

void CompareOne(const std::string& name, const Account& account, const Rows& byName,
                Comparison& comparison)
{
    const auto [begin, end] = byName.equal_range(name);
    const auto count = byName.count(name);
    if (count > 1) {
        comparison.problems.push_back(name + " is there " + std::to_string(count) + " times");
    }
    if (count == 0 && account.state == State::Stored) {
        comparison.problems.push_back(name + " is missing, although its creation was confirmed");
    }
    for (auto row = begin; row != end; ++row) {
        const std::string problem = ProblemOf(account, *row->second);
        if (!problem.empty()) comparison.problems.push_back(std::string(name).append(problem));
    }
    if (account.state == State::Stored && count == 1) ++comparison.stored;
    if (account.state == State::Unknown) {
        ++comparison.unknown;
        comparison.unknownFound += count == 0 ? 0 : 1;
    }
}

}  // namespace

Comparison Compare(const std::vector<const Ledger*>& ledgers, const std::vector<Row>& rows)
{
    Rows byName;
    for (const Row& row : rows) byName.emplace(row.name, &row);

    Comparison comparison;
    std::set<std::string> known;
    for (const Ledger* ledger : ledgers) {
        for (const auto& [name, account] : *ledger) {
            CompareOne(name, account, byName, comparison);
            known.insert(name);
        }
    }
    for (const Row& row : rows) {
        if (known.count(row.name) == 0) {
            comparison.problems.push_back(row.name + " is there, although nobody created it");
        }
    }
    return comparison;
}

}  // namespace Soak
