#include "meter/pnic/physnic.h"
#include "meter/support/log.h"
#include "meter/support/node.h"
#include "meter/support/number.h"

#include <utility>

namespace {

constexpr u32 KNF_NODE_PNIC_RXQ_FILTERS = 123;
constexpr u32 KNF_NODE_PNIC_RXQ_FILTER = 126;
constexpr u32 BUSY_QUEUE = 100;  // packets per second above which a transmit queue counts as active

u64 TxErrors(const PnicStats &stats) {
    u64 sum = stats.txErrors40 + stats.txErrors56;
    for (u32 i = 0; i < PNIC_TX_ERRORS; i++) {
        sum += stats.txErrors128[i];
    }
    return sum;
}

u64 RxErrors(const PnicStats &stats) {
    u64 sum = stats.rxErrors32 + stats.rxErrors48;
    for (u32 i = 0; i < PNIC_RX_ERRORS; i++) {
        sum += stats.rxErrors80[i];
    }
    return sum;
}

// All link counters are unsigned: one that went backwards shows as an enormous rate.
void PrintLink(PhysNic *nic, f32 elapsed, ReportBuf *report) {
    const PnicStats &c = *nic->statsCurr;
    const PnicStats &p = *nic->statsPrev;
    u64 txPkts = c.txPkts - p.txPkts;
    u64 txBytes = c.txBytes - p.txBytes;
    u64 txErrors = TxErrors(c) - TxErrors(p);
    u64 rxPkts = c.rxPkts - p.rxPkts;
    u64 rxBytes = c.rxBytes - p.rxBytes;
    u64 rxErrors = RxErrors(c) - RxErrors(p);
    ReportPrintf(report, ",\n  \"physnic\": {\"devname\": \"%s\"", nic->name);
    ReportPrintf(report, ",\n    \"txpps\": %.0f, \"txmbps\": %.1f, \"txsize\": %u, \"txeps\": %.2f, ",
                 Rate(txPkts, elapsed), Megabits(static_cast<double>(txBytes * 8), elapsed), MeanSize(txBytes, txPkts),
                 Rate(txErrors, elapsed));
    ReportPrintf(report, "\"rxpps\": %.0f, \"rxmbps\": %.1f, \"rxsize\": %u, \"rxeps\": %.2f }", Rate(rxPkts, elapsed),
                 Megabits(static_cast<double>(rxBytes * 8), elapsed), MeanSize(rxBytes, rxPkts),
                 Rate(rxErrors, elapsed));
    std::swap(nic->statsCurr, nic->statsPrev);
}

// A queue counter that went backwards, as each does when its 32 bits wrap, gives 0.
u32 QueueRate(u32 curr, u32 prev, f32 elapsed) {
    return curr > prev ? WholeRate(curr - prev, elapsed) : 0;
}

void PrintTxQueues(PhysNic *nic, f32 elapsed, ReportBuf *report) {
    ReportPrintf(report, ",\n  \"txqueue\": { \"count\": %d, \"details\": [", nic->txqCount);
    i32 active = 0;
    for (i32 queue = 0; queue < nic->txqCount; queue++) {
        const TxqSample &curr = nic->txqCurr[queue];
        TxqSample &rates = nic->txqPrev[queue];
        rates.packets = QueueRate(curr.packets, rates.packets, elapsed);
        rates.errors = QueueRate(curr.errors, rates.errors, elapsed);
        rates.stops = QueueRate(curr.stops, rates.stops, elapsed);
        if (rates.packets > BUSY_QUEUE) {
            active++;
        }
        ReportPrintf(report, queue == 0 ? "\n    " : ",\n    ");
        ReportPrintf(report, "{\"pps\": %u, \"eps\": %u, \"qstops\": %u}", rates.packets, rates.errors, rates.stops);
    }
    ReportPrintf(report, "],\n    \"active\": %d }", active);
    std::swap(nic->txqCurr, nic->txqPrev);
}

// Totals of the receive queues that have filters.
struct RxTotals {
    i32 active;
    i32 filters;  // of all queues but the first
    i32 ports;    // filters of all queues
};

// Ends at the first filter that can't be named or read.
void PrintFilters(PhysNic *nic, KnfParamList filters, u32 count, ReportBuf *report) {
    for (u32 i = 0; i < count; i++) {
        auto index = static_cast<i32>(KNF_ParamGetInt(KNF_ParamListGetParam(filters, i)));
        VaryingKey key(nic->rxqParam, i64{index});
        if (key.status != 0) {
            LogMsg(0, "Error adding filter index for rxinfo\n");
            return;
        }
        PnicRxFilter filter = {};
        if (NodeGet(KNF_NODE_PNIC_RXQ_FILTER, nic->rxqParam, &filter) != 0) {
            return;
        }
        ReportPrintf(report, i == 0 ? "%u" : ", %u", filter.portId);
    }
}

// One queue's array, its index in the list already. The totals go by the length of the filter list, whatever of it
// could be read; a queue without a list changes none.
void PrintRxQueue(PhysNic *nic, i32 queue, RxTotals *totals, ReportBuf *report) {
    ReportPrintf(report, queue == 0 ? "\n    [" : ",\n    [");
    LocalList filters;
    KnfStatus status = KNF_GetInstanceListAlloc(KNF_NODE_PNIC_RXQ_FILTERS, nic->rxqParam, &filters.list);
    u32 count = status == 0 ? KNF_ParamListUsedCount(filters.list) : 0;
    if (count == 0) {
        ReportPrintf(report, "]");
        return;
    }
    if (queue != 0) {
        totals->filters += static_cast<i32>(count);
    }
    PrintFilters(nic, filters.list, count, report);
    totals->ports += static_cast<i32>(count);
    totals->active++;
    ReportPrintf(report, " ]");
}

// The filter tables are read while they are written; nothing of them is kept.
void PrintRxQueues(PhysNic *nic, ReportBuf *report) {
    ReportPrintf(report, ",\n  \"rxqueue\": { \"count\": %d, \"details\": [", nic->rxqCount);
    RxTotals totals = {};
    for (i32 queue = 0; queue < nic->rxqCount; queue++) {
        VaryingKey key(nic->rxqParam, i64{queue});
        if (key.status != 0) {
            LogMsg(0, "Error adding queue index for rxqinfo\n");
            break;
        }
        PrintRxQueue(nic, queue, &totals, report);
    }
    ReportPrintf(report, "],\n    \"active\": %d, \"filters\": %d, \"ports\": %d }", totals.active, totals.filters,
                 totals.ports);
}

}  // namespace

KnfStatus PhysNicPrint(PhysNic *nic, const PortPrefs *prefs, f32 elapsed, ReportBuf *report) {
    if (nic == nullptr) {
        return 0;
    }
    if ((*prefs & PREF_VNIC) != 0 && nic->statsCurr != nullptr) {
        PrintLink(nic, elapsed, report);
    }
    if ((*prefs & PREF_QUEUE) != 0) {
        PrintTxQueues(nic, elapsed, report);
        PrintRxQueues(nic, report);
    }
    if ((*prefs & PREF_INTR) != 0 && nic->intr != nullptr) {
        IntrPrint(nic->intr, elapsed, report);
    }
    return 0;
}
