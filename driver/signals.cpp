#include "driver/signals.h"

#include "support/log.h"
#include "support/run.h"

#include <poll.h>
#include <signal.h>

namespace {

void OnTerminate(int /*signal*/) {
    terminateRequested = 1;
}

// Without SA_RESTART: a write that waits for its reader ends with the signal.
bool Register(int signal) {
    struct sigaction action = {};
    action.sa_handler = OnTerminate;
    sigemptyset(&action.sa_mask);
    return sigaction(signal, &action, nullptr) == 0;
}

bool IgnoredAtStart(int signal) {
    struct sigaction current = {};
    return sigaction(signal, nullptr, &current) == 0 && current.sa_handler == SIG_IGN;
}

}  // namespace

void InstallSignalHandlers() {
    bool registered = Register(SIGINT) && Register(SIGTERM) && (IgnoredAtStart(SIGHUP) || Register(SIGHUP));
    if (!registered) {
        LogMsg(0, "Error Registering SIGINT Signal Handler\n");
        LogMsg(0, "If you histograms, you should either:\n\t1. Let the program end.\t2. Manually disable them."
                  "Otherwise, histograms will stay on and hurt performance\n");
    }
    struct sigaction ignore = {};
    ignore.sa_handler = SIG_IGN;
    sigaction(SIGPIPE, &ignore, nullptr);
}

void WaitInterval(i32 seconds) {
    if (seconds == 0) {
        return;
    }
    // A signal between the look at the flag and the sleep stays pending until ppoll opens the mask, and ends it.
    sigset_t termination;
    sigset_t before;
    sigemptyset(&termination);
    sigaddset(&termination, SIGINT);
    sigaddset(&termination, SIGTERM);
    sigaddset(&termination, SIGHUP);
    sigprocmask(SIG_BLOCK, &termination, &before);
    if (terminateRequested == 0) {
        timespec time = {seconds, 0};
        ppoll(nullptr, 0, &time, &before);
    }
    sigprocmask(SIG_SETMASK, &before, nullptr);
}
