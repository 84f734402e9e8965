#include "meter/support/report.h"

#include "meter/support/log.h"
#include "meter/support/output.h"
#include "meter/support/termination.h"

#include <cerrno>
#include <cstdarg>
#include <cstring>
#include <fcntl.h>

namespace {

bool Fits(ReportBuf *report, const char *format, va_list arguments) {
    va_list copy;
    va_copy(copy, arguments);
    auto used = static_cast<u32>(report->fill);
    int length = Str_Vsnprintf(report->buffer + used, report->capacity - used, format, copy);
    va_end(copy);
    if (length > 0) {
        report->fill += length;
        return true;
    }
    report->buffer[used] = '\0';
    return false;
}

}  // namespace

void ReportPrintf(ReportBuf *report, const char *format, ...) {
    if (report == nullptr || report->buffer == nullptr || report->gaveUp) {
        return;
    }
    va_list arguments;
    va_start(arguments, format);
    while (!Fits(report, format, arguments)) {
        if (report->fill == 0) {
            LogDirect("No Space in buffer. Resize output buffer from %d bytes\n", static_cast<int>(report->capacity));
            LogDirectV(format, arguments);
            break;
        }
        if (ReportFlush(report) != 0) {
            report->gaveUp = true;
            break;
        }
    }
    va_end(arguments);
}

KnfStatus ReportFlush(ReportBuf *report) {
    if (report == nullptr || report->buffer == nullptr || report->fill < 1) {
        return 0;
    }
    if (report->gaveUp || terminateRequested != 0) {
        return KNF_FAILURE;
    }
    auto size = static_cast<std::size_t>(report->fill - report->sent);
    errno = 0;
    ssize_t written = WriteOutput(report->outFd, report->buffer + report->sent, size);
    if (written == static_cast<ssize_t>(size)) {
        report->fill = 0;
        report->sent = 0;
        return 0;
    }
    if (written > 0) {
        report->sent += static_cast<i32>(written);
    }
    if (terminateRequested == 0) {
        LogDirect("Unable to write to fd %d. Error %s\n", report->outFd, std::strerror(errno));
    }
    return KNF_FAILURE;
}

i32 OpenReportFile(const char *path, ReportBuf *report) {
    int fd = open64(path, O_WRONLY | O_CREAT | O_TRUNC, 0644);
    if (fd < 0) {
        if (terminateRequested == 0) {
            LogDirect("Unable to open file %s for writing. Error:%s\n", path, std::strerror(errno));
        }
        return fd;
    }
    report->outFd = fd;
    report->closeFd = fd;
    return fd;
}
