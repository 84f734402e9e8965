// What the program knows of the host's physical CPUs: topology and host name, read once at start-up, and one pair of
// accounting records for each pcpu. A pass costs one node read a pcpu and allocates nothing. Nothing here is freed.
#pragma once

#include "interface/corekit.h"
#include "interface/types.h"
#include "meter/support/report.h"

extern char *hostName;               // null if it could not be asked for
extern KnfParamList instanceParams;  // of the reads of pcpus; empty between them

// Sets NUM_PCPUS and hostName, allocates the samples and creates the lists of the vcpu histograms; without those lists
// the run goes on. A non-zero result, logged where the host's answer alone does not say it, ends start-up.
KnfStatus SchedStatsCpuGlobalInfoInit();

// Reads every pcpu into the older sample if `first`, else into the newer. The first failure ends the pass: the slots
// behind it keep what they held.
KnfStatus SchedStatsPcpuStats(bool first);

// Writes the "cpu" section and turns the sample pair over.
void SchedStatsCpuPrint(ReportBuf *report);
