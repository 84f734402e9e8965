#include "meter/support/number.h"
#include "meter/vnic/coalesce_report.h"
#include "meter/vnic/vnic.h"

namespace {

// Differences wrap in the width of their field and are unsigned. "maxpend" is a current value and "qstop" a count over
// the interval; all else is a rate or a percentage.
void PrintParlan2(Parlan2Stats *stats, f32 elapsed, ReportBuf *report) {
    const Parlan2Sample &c = stats->cur;
    const Parlan2Sample &p = stats->prev;
    u32 copyBase = c.copyBase - p.copyBase + 1;
    u64 rxBufUnderflow = c.rxBufUnderflow - p.rxBufUnderflow;
    u64 rxErrors = rxBufUnderflow + (c.outOfSlots - p.outOfSlots) + (c.rxOverflow - p.rxOverflow) +
                   (c.rxErrA - p.rxErrA) + (c.ring2Errors - p.ring2Errors) + (c.maxFrags - p.maxFrags) +
                   (c.mapFailures - p.mapFailures) + (c.rxErrB - p.rxErrB) + (c.rxErrC - p.rxErrC) +
                   (c.rxErrD - p.rxErrD);
    ReportPrintf(report,
                 ",\n  \"vnic\": { \"type\": \"parlan2\", \"txcalls\": %.0f, \"copypct\": %.2f, \"maxpend\": %.0f, "
                 "\"intr\": %.0f, \"qstop\": %.0f, \"txeps\": %.1f, \"rxeps\": %.1f",
                 Rate32(c.txCalls - p.txCalls, elapsed), Percent(c.copyCount - p.copyCount, copyBase),
                 static_cast<double>(c.maxPending), Rate32(c.interrupts - p.interrupts, elapsed),
                 static_cast<double>(c.queueStops - p.queueStops), Rate32(c.txOverflow - p.txOverflow, elapsed),
                 Rate(rxErrors, elapsed));
    ReportPrintf(report,
                 ",\n    \"txoflow\": %.1f, \"rxbuflow\": %.1f, \"ooslots\": %.1f, \"rxoflow\": %.1f, "
                 "\"ring2err\": %.1f, \"maxfrags\": %.1f, \"mapfail\": %.1f}",
                 Rate32(c.txOverflow - p.txOverflow, elapsed), Rate32(c.rxBufUnderflow - p.rxBufUnderflow, elapsed),
                 Rate(c.outOfSlots - p.outOfSlots, elapsed), Rate(c.rxOverflow - p.rxOverflow, elapsed),
                 Rate(c.ring2Errors - p.ring2Errors, elapsed), Rate(c.maxFrags - p.maxFrags, elapsed),
                 Rate(c.mapFailures - p.mapFailures, elapsed));
    stats->prev = stats->cur;
}

void PrintParlan3(Parlan3Stats *stats, f32 elapsed, ReportBuf *report) {
    const Parlan3TxSummary &tc = stats->txCur;
    const Parlan3TxSummary &tp = stats->txPrev;
    const Parlan3RxSummary &rc = stats->rxCur;
    const Parlan3RxSummary &rp = stats->rxPrev;
    u64 txPkts = tc.txPkts - tp.txPkts + 1;
    u64 rxPkts = rc.rxPkts - rp.rxPkts + 1;
    ReportPrintf(report,
                 ",\n  \"vnic\": { \"type\": \"parlan3\", \"ring1sz\": %d, \"ring2sz\": %d, \"tsopct\": %.1f, "
                 "\"tsotputpct\": %.1f, \"txucastpct\": %.1f, \"txeps\": %.1f,",
                 static_cast<i32>(stats->rxQueue.ring1Size), static_cast<i32>(stats->rxQueue.ring2Size),
                 Percent(tc.tsoPkts - tp.tsoPkts, txPkts),
                 Percent(tc.tsoBytes - tp.tsoBytes, tc.txBytes - tp.txBytes + 1),
                 Percent(tc.ucastPkts - tp.ucastPkts, txPkts), Rate(tc.txErrors - tp.txErrors, elapsed));
    ReportPrintf(
        report, "\n    \"lropct\": %.1f, \"lrotputpct\": %.1f, \"rxucastpct\": %.1f, \"rxeps\": %.1f",
        Percent(rc.lroPkts - rp.lroPkts, rxPkts), Percent(rc.lroBytes - rp.lroBytes, rc.rxBytes - rp.rxBytes + 1),
        Percent(rc.ucastPkts - rp.ucastPkts, rxPkts), Rate((rc.rxErrA - rp.rxErrA) + (rc.rxErrB - rp.rxErrB), elapsed));
    ReportPrintf(report,
                 ",\n    \"txdisc\": %.1f, \"qstop\": %.1f, \"txallocerr\": %.1f, \"txtsosplit\": %.1f, "
                 "\"r1full\": %.1f, \"r2full\": %.1f, \"sgerr\": %.1f}",
                 Rate(tc.txDiscards - tp.txDiscards, elapsed), Rate32(tc.queueStops - tp.queueStops, elapsed),
                 Rate32(tc.txAllocErrors - tp.txAllocErrors, elapsed), Rate32(tc.txTsoSplits - tp.txTsoSplits, elapsed),
                 Rate32(rc.ring1Full - rp.ring1Full, elapsed), Rate32(rc.ring2Full - rp.ring2Full, elapsed),
                 Rate32(rc.sgErrors - rp.sgErrors, elapsed));
    stats->txPrev = stats->txCur;
    stats->rxPrev = stats->rxCur;
}

}  // namespace

KnfStatus VnicPrint(Vnic *vnic, const PortPrefs *prefs, f32 elapsed, ReportBuf *report) {
    if ((*prefs & PREF_COALESCE) != 0) {
        CoalescePrint(vnic, elapsed, report);
    }
    if ((*prefs & PREF_COALESCE_DETAIL) != 0) {
        TxWdtPrint(vnic, elapsed, report);
    }
    if ((*prefs & PREF_VNIC) == 0) {
        return 0;
    }
    if (vnic->parlan2Stats != nullptr) {
        PrintParlan2(vnic->parlan2Stats, elapsed, report);
    } else if (vnic->parlan3Stats != nullptr) {
        PrintParlan3(vnic->parlan3Stats, elapsed, report);
    }
    return 0;
}
