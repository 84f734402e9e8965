#include "meter/support/log.h"

#include "meter/support/output.h"

#include <cstdio>
#include <cstdlib>
#include <unistd.h>

i32 logLevel = 0;

namespace {

// Head and message in one write, unless they are longer than any that the program has.
void __attribute__((format(printf, 2, 0))) Put(const char *head, const char *format, va_list arguments) {
    if (!OutputReady(STDERR_FILENO)) {
        return;
    }
    char text[8192];
    va_list copy;
    va_copy(copy, arguments);
    int headSize = std::snprintf(text, sizeof text, "%s", head);
    auto used = static_cast<std::size_t>(headSize);
    int size = std::vsnprintf(text + used, sizeof text - used, format, copy);
    va_end(copy);
    if (size >= 0 && static_cast<std::size_t>(size) < sizeof text - used) {
        std::fputs(text, stderr);
    } else {
        std::fputs(head, stderr);
        std::vfprintf(stderr, format, arguments);
    }
}

}  // namespace

void LogMsg(i32 level, const char *format, ...) {
    if (logLevel < level) {
        return;
    }
    char head[32];
    std::snprintf(head, sizeof head, "Log%d: ", level);
    va_list arguments;
    va_start(arguments, format);
    Put(head, format, arguments);
    va_end(arguments);
}

void LogStatus(i32 level, KnfStatus status, const char *format, ...) {
    if (logLevel < level) {
        return;
    }
    char head[256];
    std::snprintf(head, sizeof head, "Log%d Status: %s. Message: ", level, HCK_ReturnStatusToString(status));
    va_list arguments;
    va_start(arguments, format);
    Put(head, format, arguments);
    va_end(arguments);
}

void LogDirect(const char *format, ...) {
    va_list arguments;
    va_start(arguments, format);
    LogDirectV(format, arguments);
    va_end(arguments);
}

void LogDirectV(const char *format, va_list arguments) {
    Put("", format, arguments);
}

void Panic(const char *format, ...) {
    va_list arguments;
    va_start(arguments, format);
    Put("Panic: ", format, arguments);
    va_end(arguments);
    std::exit(1);
}
