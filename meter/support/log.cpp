#include "meter/support/log.h"

#include "meter/support/output.h"
#include "meter/support/termination.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <unistd.h>

i32 logLevel = 0;

namespace {

bool cutOff = false;  // a termination signal ended a wait of standard error's: whoever reads it gets no more

// A message of any length; what there is no memory for is cut off.
struct Text {
    char room[8192];
    char *bytes = room;
    std::size_t capacity = sizeof room;
    std::size_t size = 0;

    Text() {}  // leaves the room as it is
    Text(const Text &) = delete;
    Text &operator=(const Text &) = delete;
    ~Text() {
        if (bytes != room) {
            std::free(bytes);
        }
    }
};

void Grow(Text *text, std::size_t capacity) {
    char *bytes = static_cast<char *>(std::malloc(capacity));
    if (bytes == nullptr) {
        return;
    }
    std::memcpy(bytes, text->bytes, text->size);
    if (text->bytes != text->room) {
        std::free(text->bytes);
    }
    text->bytes = bytes;
    text->capacity = capacity;
}

void __attribute__((format(printf, 2, 0))) AppendV(Text *text, const char *format, va_list arguments) {
    va_list again;
    va_copy(again, arguments);
    int length = std::vsnprintf(text->bytes + text->size, text->capacity - text->size, format, arguments);
    std::size_t added = length < 0 ? 0 : static_cast<std::size_t>(length);
    if (added >= text->capacity - text->size) {
        Grow(text, text->size + added + 1);
        std::vsnprintf(text->bytes + text->size, text->capacity - text->size, format, again);
    }
    va_end(again);
    text->size += std::min(added, text->capacity - text->size - 1);
}

void __attribute__((format(printf, 2, 3))) Append(Text *text, const char *format, ...) {
    va_list arguments;
    va_start(arguments, format);
    AppendV(text, format, arguments);
    va_end(arguments);
}

// One write, unless standard error takes less at a time.
void Send(const Text &text) {
    std::size_t sent = 0;
    while (sent < text.size && !cutOff) {
        ssize_t written = WriteOutput(STDERR_FILENO, text.bytes + sent, text.size - sent);
        if (written >= 0) {
            sent += static_cast<std::size_t>(written);
        } else if (errno != EINTR) {
            return;
        } else {
            cutOff = terminateRequested != 0;
        }
    }
}

}  // namespace

void LogMsg(i32 level, const char *format, ...) {
    if (logLevel < level) {
        return;
    }
    Text text;
    Append(&text, "Log%d: ", level);
    va_list arguments;
    va_start(arguments, format);
    AppendV(&text, format, arguments);
    va_end(arguments);
    Send(text);
}

void LogStatus(i32 level, KnfStatus status, const char *format, ...) {
    if (logLevel < level) {
        return;
    }
    Text text;
    Append(&text, "Log%d Status: %s. Message: ", level, HCK_ReturnStatusToString(status));
    va_list arguments;
    va_start(arguments, format);
    AppendV(&text, format, arguments);
    va_end(arguments);
    Send(text);
}

void LogDirect(const char *format, ...) {
    va_list arguments;
    va_start(arguments, format);
    LogDirectV(format, arguments);
    va_end(arguments);
}

void LogDirectV(const char *format, va_list arguments) {
    Text text;
    AppendV(&text, format, arguments);
    Send(text);
}

void Panic(const char *format, ...) {
    Text text;
    Append(&text, "Panic: ");
    va_list arguments;
    va_start(arguments, format);
    AppendV(&text, format, arguments);
    va_end(arguments);
    Send(text);
    LeaveIfTerminated();
    std::exit(1);
}
