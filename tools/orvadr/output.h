// Prints what a command has found.
#ifndef ORVADR_OUTPUT_H
#define ORVADR_OUTPUT_H

#include "report.h"

namespace Orvadr {

enum class Style { Table, Json };

// Writes the report to standard output and its remarks to standard error. A table fits the terminal and
// has colour on a terminal that can show it, unless NO_COLOR is set. Returns the code of the report, or
// NotSeen if the output cannot be written.
ExitCode Print(const Report& report, Style style);

}  // namespace Orvadr

#endif
