// Termination signals of live mode, and the wait that they cut short. The handler only sets `terminateRequested`, so
// that no operation of the node interface is ever interrupted half-way.
#pragma once

#include "support/types.h"

// SIGINT, SIGTERM, and SIGHUP unless it was ignored at start. A registration that fails is logged and start-up goes
// on. SIGPIPE is ignored: a reader that went away shows as a failed write.
void InstallSignalHandlers();

// Sleeps so many seconds, 0 not at all. A termination signal ends it at once, also one that came just ahead of it.
void WaitInterval(i32 seconds);
