#include "tests/fixed_clock.h"

#include <cstdlib>
#include <poll.h>
#include <sys/time.h>
#include <sys/types.h>

namespace {

long long now = 1'700'000'000'000'000;

long long Step() {
    const char *step = std::getenv("FIXED_CLOCK_STEP");
    return step == nullptr ? 0 : std::atoll(step);
}

}  // namespace

extern "C" {

void FixedClockAdvance(long long microseconds) {
    now += microseconds;
}

int gettimeofday(struct timeval *time, void * /*zone*/) noexcept {
    static const long long step = Step();
    now += step;
    time->tv_sec = now / 1'000'000;
    time->tv_usec = now % 1'000'000;
    return 0;
}

pid_t getpid() noexcept {
    return 4242;
}

int ppoll(struct pollfd * /*entries*/, nfds_t /*count*/, const struct timespec *timeout, const sigset_t * /*mask*/) {
    FixedClockAdvance(timeout->tv_sec * 1'000'000LL);
    return 0;
}
}
