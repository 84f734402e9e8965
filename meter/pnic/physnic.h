// The physical NIC behind an uplink port: its counters, transmit queues, receive filters and interrupts. Owned by the
// Port until a failed read costs the port all of it. A pass costs one node read for the counters, two for the queue
// summaries, one a transmit queue and those of the interrupts; the report one list a receive queue and one read a
// filter.
#pragma once

#include "meter/pnic/intr.h"
#include "meter/pnic/pnic_records.h"
#include "meter/support/prefs.h"
#include "meter/support/report.h"

struct PhysNic {
    char *name;               // the NIC's name, a point, its device text: the NIC of messages and report
    KnfParamList statsParam;  // each list holds the NIC's bare name
    KnfParamList txqParam;    // with room for a queue index
    KnfParamList rxqParam;    // with room for a queue index and a filter index
    PnicStats *statsCurr;     // sample pair; null unless the prefs asked for NIC statistics
    PnicStats *statsPrev;
    i32 txqCapacity;  // queues at creation: the size of the arrays, which never grow
    i32 rxqCapacity;
    Interrupts *intr;    // null if none
    i32 txqCount;        // queues in the latest read, never above the capacity
    TxqSample *txqCurr;  // sample pair; null unless the prefs asked for queues
    TxqSample *txqPrev;  // overwritten with rates by the report, ahead of the swap
    i32 rxqCount;
};

// The uplink port of a NIC; 0, logged, if it can't be found. Serves one call a run.
u64 PhysNicPortOf(const char *nicName);

// Null, logged, when the NIC can't be read.
PhysNic *PhysNicCreate(const char *nicName, const PortPrefs *prefs);

// Samples what the prefs ask for. 0, or the logged status after which the record has to go; interrupts that can't be
// read go alone. A null NIC gives 0.
KnfStatus PhysNicRead(PhysNic *nic, const PortPrefs *prefs, bool first);

// Writes the sections "physnic", "txqueue", "rxqueue" and "intr" that the prefs ask for and turns their samples over.
// Always 0.
KnfStatus PhysNicPrint(PhysNic *nic, const PortPrefs *prefs, f32 elapsed, ReportBuf *report);

// Frees a NIC, a half-built one too. Null does nothing.
void PhysNicCleanup(PhysNic *nic);
