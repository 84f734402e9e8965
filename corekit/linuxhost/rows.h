// What the rooms of the Linux host hand to each other: the answers that a look at the kernel can have, and the rows of
// its network tables. Plain values; a row lives in the table that its room keeps.
#pragma once

#include "interface/types.h"

#include <cerrno>
#include <cstdarg>
#include <cstdint>
#include <cstdio>

enum Outcome : u8 {
    FINE,
    GONE,         // that one thing is no longer there: it costs one row, quietly
    UNSUPPORTED,  // this kernel, driver or build lacks it: the feature is off
    REFUSED,      // not for this user
    INTERRUPTED,  // changed while it was read: ask again
    BROKEN,       // anything else; costs the record that was asked for, never a pass
};

constexpr Outcome ErrnoOutcome(int error) {
    switch (error) {
    case 0:
        return FINE;
    case ENODEV:
    case ENOENT:
    case ESRCH:
    case ENXIO:
        return GONE;
    case EOPNOTSUPP:
    case ENOSYS:
    case EPROTONOSUPPORT:
    case EAFNOSUPPORT:
        return UNSUPPORTED;
    case EPERM:
    case EACCES:
        return REFUSED;
    case EINTR:
    case EAGAIN:
        return INTERRUPTED;
    default:
        return BROKEN;
    }
}

// For what a user should know once in a run: writes the line to standard error, unless `*told` is set, and sets it.
__attribute__((format(printf, 2, 3))) inline void TellOnce(bool *told, const char *format, ...) {
    if (*told) {
        return;
    }
    *told = true;
    va_list arguments;
    va_start(arguments, format);
    vfprintf(stderr, format, arguments);
    va_end(arguments);
}
