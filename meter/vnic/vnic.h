// The kernel's view of a virtual machine's NIC, beyond its port's client counters. Owned by the Port; VnicCleanup frees
// it. Up to four node reads a pass for coalescing, one for the transmit worldlet, one (parlan2) or three (parlan3) for
// the statistics.
#pragma once

#include "meter/support/prefs.h"
#include "meter/support/report.h"
#include "meter/vnic/vnic_records.h"

struct Port;

struct Parlan2Stats {
    Parlan2Sample prev;
    Parlan2Sample cur;
};

struct Parlan3Stats {
    Parlan3TxSummary txPrev;
    Parlan3TxSummary txCur;
    Parlan3RxSummary rxPrev;
    Parlan3RxSummary rxCur;
    Parlan3RxQueueStatus rxQueue;  // latest pass
};

// The coalescing records and the worldlet counters have one slot each: their reports show the latest values.
struct Vnic {
    VnicCoalesceInfo coalesceInfo;  // scheme is 0 until a read succeeded
    VnicTxWdtStats txWdtStats;
    VnicCoalesceRx coalesceRx;
    VnicCoalesceTx coalesceTx;
    VnicCoalesceTxComp coalesceTxComp;
    VnicCoalesceScheme2 coalesceScheme2;
    Parlan2Stats *parlan2Stats;  // null unless the NIC is a parlan2
    Parlan3Stats *parlan3Stats;  // null unless the NIC is a parlan3
};

// Null for a NIC model without statistics whose port asks for no coalescing information.
Vnic *VnicCreate(u32 subType, const PortPrefs *prefs);

// Samples what the port's prefs ask for. A coalescing read that fails clears its bit there, for good. Returns 0, or the
// status of a failed statistics read, logged, which costs the port its life.
KnfStatus VnicRead(Port *port, bool first);

// Writes up to three sections, "coalesce", "txwdt" and "vnic", and turns the statistics over. Always 0.
KnfStatus VnicPrint(Vnic *vnic, const PortPrefs *prefs, f32 elapsed, ReportBuf *report);

// Null does nothing.
void VnicCleanup(Vnic *vnic);
