// The subcommands of lan-report. Each adds its options to the command line and returns nothing; what it shall do runs
// after parsing, and leaves its exit status in *status.
#pragma once

#include "report/support/message.h"

namespace CLI {
class App;
}

namespace report {

void RecordsCommand(CLI::App &program, Status *status);
void TableCommand(CLI::App &program, Status *status);
void SummaryCommand(CLI::App &program, Status *status);
void PageCommand(CLI::App &program, Status *status);

}  // namespace report
