// Findings and rules on the way out: as text that can be pasted into a mail, and as JSON.
#pragma once

#include "report/input/record_stream.h"
#include "report/summary/findings.h"
#include "report/support/output.h"

namespace report {

// most: so many findings, the worst; 0: all. cells: width of the terminal; 0: each finding is one line. After
// FindingsRank.
void PrintFindings(Output *output, const Findings &findings, const StreamTally &tally, size_t most, size_t cells);
void PrintFindingsJson(Output *output, const Findings &findings, const StreamTally &tally, size_t most);
void PrintRules(Output *output);
void PrintRulesJson(Output *output);

}  // namespace report
