#include "support/log.h"

#include <cstdarg>
#include <cstdio>
#include <cstdlib>

i32 logLevel = 0;

void LogMsg(i32 level, const char *format, ...) {
    if (logLevel < level) {
        return;
    }
    va_list arguments;
    va_start(arguments, format);
    std::fprintf(stderr, "Log%d: ", level);
    std::vfprintf(stderr, format, arguments);
    va_end(arguments);
}

void LogStatus(i32 level, KnfStatus status, const char *format, ...) {
    if (logLevel < level) {
        return;
    }
    va_list arguments;
    va_start(arguments, format);
    std::fprintf(stderr, "Log%d Status: %s. Message: ", level, HCK_ReturnStatusToString(status));
    std::vfprintf(stderr, format, arguments);
    va_end(arguments);
}

void Panic(const char *format, ...) {
    va_list arguments;
    va_start(arguments, format);
    std::fputs("Panic: ", stderr);
    std::vfprintf(stderr, format, arguments);
    va_end(arguments);
    std::exit(1);
}
