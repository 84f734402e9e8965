// A physical NIC's interrupts. The kernel does not say which vectors are a NIC's: they are found by its name in the
// names on each vector, in one listing that serves all NICs of the run. Costs (vectors of the NIC) x (pcpus) node reads
// a pass. The record is owned by its PhysNic.
#pragma once

#include "interface/corekit.h"
#include "interface/types.h"
#include "meter/support/report.h"

// Sums over all vectors and pcpus: interrupts, and microseconds spent on them.
struct Interrupts {
    i32 vectorCount;  // at least 1
    i64 *vectors;
    u64 countPrev;
    u64 countCurr;
    u64 usedPrev;
    u64 usedCurr;
};

// Null when no vector bears the mask (not followed by a digit) or the listing can't be had, which is logged once.
Interrupts *IntrCreate(const char *mask);

// 0, or the logged status of the failure after which the record has to go.
KnfStatus IntrRead(Interrupts *intr, bool first);

// Writes the "intr" section and turns the sample over. Always 0.
KnfStatus IntrPrint(Interrupts *intr, f32 elapsed, ReportBuf *report);

// Null does nothing.
void IntrCleanup(Interrupts *intr);
