// Diagnostics on standard error, one write a message. A message brings its own line end. Levels: 0 for errors, shown by
// default; 1 for expected refusals, tolerated failures and progress; 2 for dropped input. What is filtered out costs no
// formatting. A termination signal ends the wait for a reader, and what it did not take is dropped.
#pragma once

#include "interface/corekit.h"
#include "interface/types.h"

#include <cstdarg>

extern i32 logLevel;  // messages up to this level are shown; set by -d

void LogMsg(i32 level, const char *format, ...) __attribute__((format(printf, 2, 3)));

// The same, headed by the text of a status.
void LogStatus(i32 level, KnfStatus status, const char *format, ...) __attribute__((format(printf, 3, 4)));

// A message without a head, that no level hides.
void LogDirect(const char *format, ...) __attribute__((format(printf, 1, 2)));
void LogDirectV(const char *format, va_list arguments) __attribute__((format(printf, 1, 0)));

// A message that no level hides, then exit(1). Neither flushes the report nor switches anything off in the kernel, but
// behind a termination signal.
[[noreturn]] void Panic(const char *format, ...) __attribute__((format(printf, 1, 2)));
