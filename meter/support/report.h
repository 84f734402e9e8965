// The buffered sink of the report. Each accepted text goes out whole and in order; a text that does not fit forces a
// flush ahead of it. No allocation, one write(2) a flush.
#pragma once

#include "interface/corekit.h"
#include "interface/types.h"

struct ReportBuf {
    i32 outFd;     // where a flush writes to
    i32 closeFd;   // second descriptor, closed at the end of a completed run and otherwise unused
    char *buffer;  // owned by main
    u32 capacity;  // bytes of buffer; fill stays below it
    i32 fill;      // bytes of text in buffer, the terminator not counted
    i32 sent;      // of these, bytes that a short write has put out already; never sent again
    bool gaveUp;   // a flush failed with a text still waiting: that text and all later ones are dropped
};

void ReportPrintf(ReportBuf *report, const char *format, ...) __attribute__((format(printf, 2, 3)));

// Writes what is buffered; 0 also when that is nothing. A failed or short write is told on standard error and gives
// KNF_FAILURE; the text stays for the next flush. A flush that a termination signal ended gives KNF_FAILURE silently.
KnfStatus ReportFlush(ReportBuf *report);

// Creates or empties the file and sends the report there. A negative descriptor, told on standard error, if it can't.
i32 OpenReportFile(const char *path, ReportBuf *report);
