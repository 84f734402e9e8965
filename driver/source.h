// Where samples come from: the live kernel, or snapshots that stand for one pass each.
#pragma once

#include "support/corekit.h"
#include "support/types.h"

// Whether the kernel, or the snapshot in use, has the interface that the program was built against. A mismatch is told
// on standard error whatever the log level.
bool CheckVersion();

// The report's clock, in whole seconds.
i64 SampleTime();
