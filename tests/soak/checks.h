// Checks after all processes of a soak have ended.
#ifndef ORVADRCORE_TESTS_SOAK_CHECKS_H
#define ORVADRCORE_TESTS_SOAK_CHECKS_H

#include <string>
#include <vector>

#include "client.h"
#include "findings.h"
#include "ledger.h"
#include "plan.h"

namespace Soak {

// The database is intact and holds what the clients were told.
Comparison CheckDatabase(const std::string& database, const std::vector<const Ledger*>& ledgers,
                         Findings& findings);

// Nobody holds a lock on this file any more.
void CheckLock(const std::string& lockFile, Findings& findings);

// No files are left except the database and the status.
void CheckFiles(const Plan& plan, Findings& findings);

// No child is left, except the neighbour's programs.
void CheckProcesses(const Plan& plan, Findings& findings);

// A client was never without an answer for too long.
void CheckGap(const Plan& plan, const std::string& name, milliseconds longestGap,
              Findings& findings);

// These clients got about the same number of answers.
void CheckShares(const Plan& plan, const std::vector<const Client*>& clients, Findings& findings);

}  // namespace Soak

#endif
