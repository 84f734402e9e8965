// Diagnostics on standard error. A message brings its own line end. Levels: 0 for errors, shown by default; 1 for
// expected refusals, tolerated failures and progress; 2 for dropped input. What is filtered out costs no formatting.
#pragma once

#include "support/corekit.h"
#include "support/types.h"

extern i32 logLevel;  // messages up to this level are shown; set by -d

void LogMsg(i32 level, const char *format, ...) __attribute__((format(printf, 2, 3)));

// The same, headed by the text of a status.
void LogStatus(i32 level, KnfStatus status, const char *format, ...) __attribute__((format(printf, 3, 4)));

// A message that no level hides, then exit(1). Neither flushes the report nor switches anything off in the kernel.
[[noreturn]] void Panic(const char *format, ...) __attribute__((format(printf, 1, 2)));
