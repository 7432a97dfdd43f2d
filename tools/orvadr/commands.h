// The commands of orvadr. Each looks at what it is given and reports; docs/orvadr.md says what.
#ifndef ORVADR_COMMANDS_H
#define ORVADR_COMMANDS_H

#include <string>
#include <vector>

#include "report.h"

namespace Orvadr {

// Cache files: fresh or stale, and who refreshes them.
Report ReportCaches(const std::vector<std::string>& files);

// SQLite databases: whether they are whole, and who has them open.
Report ReportDatabases(const std::vector<std::string>& files);

// Error codes by number or name; all of them without any.
Report ReportErrors(const std::vector<std::string>& codesOrNames);

// Lock files by name, and who holds them; all of them without any.
Report ReportLocks(const std::vector<std::string>& names);

}  // namespace Orvadr

#endif
