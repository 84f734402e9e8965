#include "meter/support/output.h"

#include "meter/support/run.h"

#include <cerrno>
#include <poll.h>

bool OutputReady(int fd) {
    constexpr int SLICE = 50;  // milliseconds
    pollfd entry = {fd, POLLOUT, 0};
    int ready = cacheEnabled != 0 ? 1 : 0;
    while (ready == 0) {
        bool terminated = terminateRequested != 0;
        ready = poll(&entry, 1, terminated ? 0 : SLICE);
        if (terminated) {
            break;
        }
        if (ready < 0) {
            ready = errno == EINTR ? 0 : 1;
        }
    }
    return ready > 0;
}
