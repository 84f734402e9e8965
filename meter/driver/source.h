// Where samples come from: the live kernel, or snapshots that stand for one pass each.
#pragma once

#include "interface/corekit.h"
#include "interface/types.h"

// Whether the kernel, or the snapshot in use, has the interface that the program was built against. A mismatch is told
// on standard error whatever the log level.
bool CheckVersion();

// The report's clock, in whole seconds.
i64 SampleTime();

// Moves a replay to the next snapshot of the list, which it cuts up in place; null when none is left. Returns 0, or
// why the snapshot can't be used. Snapshots that go back in time end the process.
KnfStatus CacheStep(char **cacheSpec, bool checkVersion);
