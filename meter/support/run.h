// What every floor may read of the run: settings of the command line, the state of a replay and the size of the host.
// Who writes a value is named beside it.
#pragma once

#include "interface/types.h"

extern u8
    absCounts;  // the driver's -a and letter e: plain differences instead of rates, the divisor of all ports is 1.0
extern u8 cacheEnabled;       // the driver's -c: every node read is served from snapshot files, nothing is written
extern f32 cacheElapsedTime;  // the replay: seconds between the last two snapshots; -1.0 while only one was seen
extern u32 NUM_PCPUS;         // the CPU set-up: number of physical CPUs
