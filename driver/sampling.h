// The frame of the report: a first pass that fills the older side of every sample pair, then one record an iteration.
#pragma once

#include "driver/options.h"
#include "support/report.h"

// Runs all iterations and closes the document. Returns 0, or 1 when a termination signal or an output that takes no
// text any more ended the run; the document is then left open. Both ends go through Teardown.
int RunSampling(Settings *settings, ReportBuf *report);
