#include "meter/driver/signals.h"

#include "meter/support/log.h"
#include "meter/support/run.h"

#include <initializer_list>
#include <poll.h>
#include <signal.h>

namespace {

void OnTerminate(int /*signal*/) {
    terminateRequested = 1;
}

sigset_t handled;  // the signals that got the handler

bool Register(int signal, int flags) {
    struct sigaction action = {};
    action.sa_handler = OnTerminate;
    action.sa_flags = flags;
    sigemptyset(&action.sa_mask);
    return sigaction(signal, &action, nullptr) == 0;
}

bool RegisterFirst(int signal) {
    return Register(signal, SA_RESTART) && sigaddset(&handled, signal) == 0;
}

void RegisterAgain(int flags) {
    for (int signal : {SIGINT, SIGTERM, SIGHUP}) {
        if (sigismember(&handled, signal) == 1) {
            Register(signal, flags);
        }
    }
}

bool IgnoredAtStart(int signal) {
    struct sigaction current = {};
    return sigaction(signal, nullptr, &current) == 0 && current.sa_handler == SIG_IGN;
}

}  // namespace

void InstallSignalHandlers() {
    sigemptyset(&handled);
    bool registered =
        RegisterFirst(SIGINT) && RegisterFirst(SIGTERM) && (IgnoredAtStart(SIGHUP) || RegisterFirst(SIGHUP));
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
    sigset_t before;
    sigprocmask(SIG_BLOCK, &handled, &before);
    if (terminateRequested == 0) {
        timespec time = {seconds, 0};
        ppoll(nullptr, 0, &time, &before);
    }
    sigprocmask(SIG_SETMASK, &before, nullptr);
}

InterruptibleCalls::InterruptibleCalls() {
    RegisterAgain(0);
}

InterruptibleCalls::~InterruptibleCalls() {
    RegisterAgain(SA_RESTART);
}
