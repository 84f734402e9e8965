// Termination signals of live mode, and what they cut short. The handler only sets `terminateRequested`. System calls
// are restarted behind it, so that no operation of the node interface fails half-way; what may wait for long, the
// program waits for by itself.
#pragma once

#include "interface/types.h"

// SIGINT, SIGTERM, and SIGHUP unless it was ignored at start. A registration that fails is logged and start-up goes
// on. SIGPIPE is ignored: a reader that went away shows as a failed write.
void InstallSignalHandlers();

// Sleeps so many seconds, 0 not at all. A termination signal ends it at once, also one that came just ahead of it.
void WaitInterval(i32 seconds);

// For the life of one, a termination signal ends a blocking open or read, of a file that the user named, with EINTR.
struct InterruptibleCalls {
    InterruptibleCalls();
    InterruptibleCalls(const InterruptibleCalls &) = delete;
    InterruptibleCalls &operator=(const InterruptibleCalls &) = delete;
    ~InterruptibleCalls();
};
