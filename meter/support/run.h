// What every floor may read of the run: settings of the command line, the state of a replay, the size of the host and
// the wish to stop. Who writes a value is named beside it.
#pragma once

#include "interface/types.h"

#include <csignal>

extern u8
    absCounts;  // the driver's -a and letter e: plain differences instead of rates, the divisor of all ports is 1.0
extern u8 cacheEnabled;       // the driver's -c: every node read is served from snapshot files, nothing is written
extern f32 cacheElapsedTime;  // the replay: seconds between the last two snapshots; -1.0 while only one was seen
extern u32 NUM_PCPUS;         // the CPU set-up: number of physical CPUs

// Set by the signal handler of live mode, and by nothing else. Whoever waits or loops looks at it.
extern volatile std::sig_atomic_t terminateRequested;
