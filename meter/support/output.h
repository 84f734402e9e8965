// Writes to descriptors that somebody else reads: standard error and the report's.
#pragma once

#include <cstddef>
#include <sys/types.h>

// write(2), which blocks until there is room also on a descriptor that says EAGAIN instead. A termination signal ends
// the wait: -1 with EINTR.
ssize_t WriteOutput(int fd, const char *text, std::size_t size);
