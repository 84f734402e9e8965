// How a termination signal ends a live run, whatever somebody else does. The handler of SIGINT, SIGTERM and SIGHUP
// notes the wish in `terminateRequested` and starts a timer. Whoever waits or loops looks at the wish.
//
// No wake-up is lost. The handlers have SA_RESTART, so that the signal itself cuts nothing half-way. The timer sends a
// second signal every few milliseconds until the process is gone, and its handler, which does nothing, has no
// SA_RESTART: a call that blocks, on a terminal, a pipe or a file that the user named, returns with EINTR the next time
// it comes, also a call that was about to block when the wish was noted. So every blocking call may stand alone,
// without a poll ahead of it. A write to the kernel is the exception: the timer rests while it goes on, and one that
// never returned could not be ended. The process has one thread; another would get some of the signals.
//
// In replay nothing of this is installed, and the signals have their default action.
#pragma once

#include "interface/types.h"

#include <csignal>

// Set by the handler, and by nothing else.
extern volatile std::sig_atomic_t terminateRequested;

// SIGHUP only unless it was ignored at start. A registration that fails is logged and start-up goes on. SIGPIPE and
// SIGXFSZ are ignored: a reader that went away, or a limit of file size, shows as a failed write. `teardown` switches
// off what the run switched on.
void InstallTerminationHandlers(i32 (*teardown)());

// After a termination signal: the teardown, then exit(1), without flush and closing text.
void LeaveIfTerminated();

// Sleeps so many seconds, 0 not at all. A termination signal ends it.
void WaitInterval(i32 seconds);

// For the life of one, no wish to end cuts a call. Costs two stores, unless a signal came.
struct UncutCalls {
    UncutCalls();
    UncutCalls(const UncutCalls &) = delete;
    UncutCalls &operator=(const UncutCalls &) = delete;
    ~UncutCalls();
};
