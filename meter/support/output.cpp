#include "meter/support/output.h"

#include "meter/support/termination.h"

#include <cerrno>
#include <poll.h>
#include <unistd.h>

ssize_t WriteOutput(int fd, const char *text, std::size_t size) {
    ssize_t written = 0;
    while ((written = write(fd, text, size)) < 0 && errno == EAGAIN) {
        pollfd entry = {fd, POLLOUT, 0};
        if (poll(&entry, 1, -1) < 0) {
            break;
        }
    }
    return written;
}
