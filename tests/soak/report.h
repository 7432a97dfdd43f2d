// Prints the report of a soak.
#ifndef ORVADRCORE_TESTS_SOAK_REPORT_H
#define ORVADRCORE_TESTS_SOAK_REPORT_H

#include <memory>
#include <string>
#include <vector>

#include "chaos.h"
#include "client.h"
#include "company.h"
#include "findings.h"
#include "ledger.h"
#include "plan.h"
#include "watch.h"

namespace Soak {

void PrintLoad(const std::vector<const Client*>& clients, milliseconds length);
void PrintEvents(const Events& events, const Company& company);
void PrintStatus(const RefreshWatch& refreshes, const NeighbourWatch& neighbour);
void PrintUsages(const std::vector<Usage>& before, const std::vector<Usage>& after);
void PrintComparison(const Comparison& comparison);

// One line for each promise, followed by the findings.
void PrintFindings(const Findings& findings);

}  // namespace Soak

#endif
