// What a command has found.
#ifndef ORVADR_REPORT_H
#define ORVADR_REPORT_H

#include <algorithm>
#include <string>
#include <vector>

#include <json/value.h>

#include "table.h"

namespace Orvadr {

enum class ExitCode {
    AllWell = 0,
    NotWell = 1,     // something is not as it should be
    WrongUsage = 2,  // of the command line
    NotSeen = 3,     // something could not be looked at
};

struct Report {
    std::vector<Column> columns;  // of the table
    Json::Value objects{Json::arrayValue};
    std::vector<std::string> remarks;  // printable lines for standard error
    ExitCode code = ExitCode::AllWell;

    // The worst code of all things counts.
    void Worsen(ExitCode other) { code = std::max(code, other); }
};

}  // namespace Orvadr

#endif
