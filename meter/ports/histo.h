// The kernel's histograms of a port: packet sizes, cluster sizes and packet intervals, each for input and output. They
// cost the host while they are on: started on the port's first pass, read and reset on every later one, stopped at the
// end of the run. Six node reads and six writes a pass.
#pragma once

#include "meter/ports/port_record.h"
#include "meter/support/report.h"

struct __attribute__((packed)) HistoBucket {
    u64 count;
    u64 limit;  // upper; the last bucket of a histogram has none, and its field is not read
};

struct __attribute__((packed)) HistoTotals {
    u64 min;
    u64 max;
    u64 mean;
    u64 count;  // samples, over which the buckets are percentages
};

// One bucket more than limits: the last holds what lies above them all.
template <u32 Limits>
struct __attribute__((packed)) PortHistogram {
    HistoTotals totals;
    HistoBucket bucket[Limits + 1];
};
static_assert(sizeof(PortHistogram<11>) == 224 && sizeof(PortHistogram<14>) == 272 && sizeof(PortHistogram<18>) == 336);
static_assert(offsetof(PortHistogram<11>, bucket) == 32);

// Gives a new port its six records.
void HistoAlloc(Port *port);

void HistoFree(Port *port);

// One pass: reads the records unless `first`, then has the kernel start or reset them. 0, or the status of a failed
// read, with the text for its message in *stage.
KnfStatus HistoRead(Port *port, bool first, const char **stage);

enum HistoOperation : u8 { HISTO_START, HISTO_RESET, HISTO_STOP };

// Writes one operation to all histograms of the port. Only a stop that fails, or a failure ahead of the first write,
// ends the port's histograms: logged, its argument list destroyed.
KnfStatus HistoOp(HistoOperation op, Port *port);

// The "histos" section.
void HistoPrint(Port *port, ReportBuf *report);

// Gives the port a new prefs word and stops in the kernel what only the old one asked for. Always 0.
KnfStatus PortSetPrefs(Port *port, const PortPrefs *prefs);
