// What is looked at when all processes of a soak have ended.
#ifndef ORVADRCORE_TESTS_SOAK_CHECKS_H
#define ORVADRCORE_TESTS_SOAK_CHECKS_H

#include <string>
#include <vector>

#include "client.h"
#include "findings.h"
#include "ledger.h"
#include "plan.h"

namespace Soak {

// The database is sound, and holds what the clients were told.
Comparison CheckDatabase(const std::string& database, const std::vector<const Ledger*>& ledgers,
                         Findings& findings);

// Nobody holds a lock on that file any more.
void CheckLock(const std::string& lockFile, Findings& findings);

// Beside the database and the status nothing is left.
void CheckFiles(const Plan& plan, Findings& findings);

// No child of ours is left, but for the neighbour's programs.
void CheckProcesses(const Plan& plan, Findings& findings);

// Somebody got an answer in every window of time.
void CheckGap(const Plan& plan, const std::string& name, milliseconds longestGap,
              Findings& findings);

// Clients of a kind got about the same number of answers.
void CheckShares(const Plan& plan, const std::vector<const Client*>& clients, Findings& findings);

}  // namespace Soak

#endif
