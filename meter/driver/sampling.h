// The frame of the report: a first pass that fills the older side of every sample pair, then one record an iteration.
#pragma once

#include "meter/driver/options.h"
#include "meter/support/report.h"

// Runs all iterations and closes the document. Returns 0, or 1 when the output took no text any more and the run was
// given up, its document left open. A termination signal ends the process. All ends go through Teardown.
int RunSampling(Settings *settings, ReportBuf *report);
