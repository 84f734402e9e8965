#include "meter/support/termination.h"

#include "meter/support/log.h"

#include <cerrno>
#include <cstdlib>
#include <ctime>
#include <initializer_list>
#include <poll.h>
#include <signal.h>

volatile std::sig_atomic_t terminateRequested = 0;

namespace {

constexpr long PERIOD = 10'000'000;  // nanoseconds between two interruptions
const int INTERRUPTION = SIGRTMIN;

timer_t timer;
bool hasTimer = false;
volatile std::sig_atomic_t uncut = 0;
i32 (*teardownOfRun)() = nullptr;

// Both calls are safe in a handler.
void Interrupt(bool on) {
    long period = on ? PERIOD : 0;
    const itimerspec times = {{0, period}, {0, period}};
    timer_settime(timer, 0, &times, nullptr);
}

// A storm of signals must not put off the timer: only the first starts it.
void OnTerminate(int /*signal*/) {
    int error = errno;
    bool isFirst = terminateRequested == 0;
    terminateRequested = 1;
    if (isFirst && uncut == 0 && hasTimer) {
        Interrupt(true);
    }
    errno = error;
}

void OnInterruption(int /*signal*/) {}

bool Register(int signal, void (*handler)(int), int flags) {
    struct sigaction action = {};
    action.sa_handler = handler;
    action.sa_flags = flags;
    for (int other : {SIGINT, SIGTERM, SIGHUP}) {
        sigaddset(&action.sa_mask, other);
    }
    return sigaction(signal, &action, nullptr) == 0;
}

bool IgnoredAtStart(int signal) {
    struct sigaction current = {};
    return sigaction(signal, nullptr, &current) == 0 && current.sa_handler == SIG_IGN;
}

// False when the system has none to give. The signals themselves then cut calls, as well as they can.
bool CreateTimer() {
    sigset_t interruption;
    sigemptyset(&interruption);
    sigaddset(&interruption, INTERRUPTION);
    sigevent event = {};
    event.sigev_notify = SIGEV_SIGNAL;
    event.sigev_signo = INTERRUPTION;
    return Register(INTERRUPTION, OnInterruption, 0) && sigprocmask(SIG_UNBLOCK, &interruption, nullptr) == 0 &&
           timer_create(CLOCK_MONOTONIC, &event, &timer) == 0;
}

}  // namespace

void InstallTerminationHandlers(i32 (*teardown)()) {
    teardownOfRun = teardown;
    hasTimer = CreateTimer();
    int flags = hasTimer ? SA_RESTART : 0;
    bool registered = Register(SIGINT, OnTerminate, flags) && Register(SIGTERM, OnTerminate, flags) &&
                      (IgnoredAtStart(SIGHUP) || Register(SIGHUP, OnTerminate, flags));
    if (!registered || !hasTimer) {
        LogMsg(0, "Error Registering SIGINT Signal Handler\n");
        LogMsg(0, "If you histograms, you should either:\n\t1. Let the program end.\t2. Manually disable them."
                  "Otherwise, histograms will stay on and hurt performance\n");
    }
    Register(SIGPIPE, SIG_IGN, 0);
    Register(SIGXFSZ, SIG_IGN, 0);
}

// Not left to the end of the process: the library's own clean-up may come ahead of what is registered for that.
void LeaveIfTerminated() {
    if (terminateRequested != 0) {
        teardownOfRun();
        std::exit(1);
    }
}

void WaitInterval(i32 seconds) {
    timespec time = {seconds, 0};
    if (seconds != 0 && terminateRequested == 0) {
        ppoll(nullptr, 0, &time, nullptr);
    }
}

// The handler looks at `uncut` and this looks at the wish, each after it set its own: one of them sees the other.
UncutCalls::UncutCalls() {
    uncut = 1;
    if (terminateRequested != 0 && hasTimer) {
        Interrupt(false);
    }
}

UncutCalls::~UncutCalls() {
    uncut = 0;
    if (terminateRequested != 0 && hasTimer) {
        Interrupt(true);
    }
}
