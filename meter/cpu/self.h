// What the program costs the host: its own process, sampled as if it were one more vcpu. Four node reads a pass; none
// in replay, where the figure is 0.
#pragma once

#include "interface/corekit.h"
#include "meter/support/report.h"

void SelfVcpuInit();

KnfStatus SelfVcpuRead(bool first);

// Writes the "overhead" section and turns the sample over.
void OverheadPrint(ReportBuf *report);
