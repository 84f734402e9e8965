// The worldlets of a port: named units of execution in the kernel, found by a text mask in one listing of all their
// names that serves the whole run. A set is built once with its port, which owns it until a read fails. One node read a
// worldlet and pass.
#pragma once

#include "interface/types.h"
#include "meter/support/prefs.h"
#include "meter/support/report.h"

// Counts and nanoseconds are running counters; 64-bit fields stand at multiples of 4.
struct __attribute__((packed)) WdtStats {
    u32 affinityPcpu;
    u32 affinityVcpu;  // 0: none
    u32 affinityWdt;   // 0xffffffff: none
    u64 runct;
    u8 reserved20[24];
    u64 migct;
    u8 reserved52[88];
    u64 overrunct;
    u64 remoteactct;
    u8 reserved156[64];
    u64 usedTime;
    u8 reserved228[288];
    u64 readyTime;
    u8 reserved524[288];
    u64 waitTime;
    u8 reserved820[640];
};
static_assert(sizeof(WdtStats) == 1460 && offsetof(WdtStats, runct) == 12 && offsetof(WdtStats, migct) == 44 &&
              offsetof(WdtStats, overrunct) == 140 && offsetof(WdtStats, remoteactct) == 148 &&
              offsetof(WdtStats, usedTime) == 220 && offsetof(WdtStats, readyTime) == 516 &&
              offsetof(WdtStats, waitTime) == 812);

struct Wdt {
    i32 count;             // at least 1
    char **names;          // own copies
    KnfParamList *params;  // each holds its worldlet's name
    WdtStats *statsCur;    // sample pair
    WdtStats *statsPrev;
};

// The set of all worldlets whose name holds the mask, at its first occurrence not followed by a digit, and not
// "backup". Null when there is none, or when a set or the listing could not be made, which is logged.
Wdt *WdtCreate(const char *mask);

// Samples up to the first worldlet that can't be read, whose status, logged, is the result.
KnfStatus WdtRead(Wdt *wdt, bool first);

// Writes the "wdt" array and turns the sample pair over. Always 0.
KnfStatus WdtPrint(Wdt *wdt, const PortPrefs *prefs, f32 elapsed, ReportBuf *report);

// Frees a set, a half-built one too. Null does nothing.
void WdtCleanup(Wdt *wdt);
