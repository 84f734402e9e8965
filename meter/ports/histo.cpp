#include "meter/ports/histo.h"

#include "meter/cpu/vcpu_histo.h"
#include "meter/support/alloc.h"
#include "meter/support/log.h"
#include "meter/support/number.h"
#include "meter/support/run.h"

#include <cstdlib>
#include <cstring>
#include <iterator>

namespace {

constexpr u32 KNF_NODE_PORT_HISTO_CLUSTER_SIZES = 326;
constexpr u32 KNF_NODE_PORT_HISTO_CLUSTER_IN = 327;
constexpr u32 KNF_NODE_PORT_HISTO_CLUSTER_OUT = 328;
constexpr u32 KNF_NODE_PORT_HISTO_PKT_SIZES = 331;
constexpr u32 KNF_NODE_PORT_HISTO_PKT_IN = 332;
constexpr u32 KNF_NODE_PORT_HISTO_PKT_OUT = 333;
constexpr u32 KNF_NODE_PORT_HISTO_PKT_INTERVALS = 336;
constexpr u32 KNF_NODE_PORT_HISTO_INTERVAL_IN = 337;
constexpr u32 KNF_NODE_PORT_HISTO_INTERVAL_OUT = 338;

// The six records in the order of reading and reporting.
struct HistoKind {
    PortHistogram *Port::*record;
    u32 node;
    u32 limits;  // buckets with a limit of their own; one more follows them
    const char *tag;
    const char *stage;
    const char *name;
};
constexpr HistoKind KINDS[] = {
    {&Port::pktSizeIn, KNF_NODE_PORT_HISTO_PKT_IN, 11, "Pkt Input Histograms", "Port Pkt Input Histo", "pktsizein"},
    {&Port::pktSizeOut, KNF_NODE_PORT_HISTO_PKT_OUT, 11, "Pkt Output Histograms", "Port Pkt Output Histo",
     "pktsizeout"},
    {&Port::clusterIn, KNF_NODE_PORT_HISTO_CLUSTER_IN, 14, "Cluster Input Histograms", "Port Cluster Input Histo",
     "clusterin"},
    {&Port::clusterOut, KNF_NODE_PORT_HISTO_CLUSTER_OUT, 14, "Cluster Output Histograms", "Port Cluster Output Histo",
     "clusterout"},
    {&Port::pktIntervalIn, KNF_NODE_PORT_HISTO_INTERVAL_IN, 18, "Pkt Interval Input Histograms",
     "Port Cluster Intervals Input Histo", "pktintervalin"},
    {&Port::pktIntervalOut, KNF_NODE_PORT_HISTO_INTERVAL_OUT, 18, "Pkt Interval Output Histograms",
     "Port Cluster Intervals Output Histo", "pktintervalout"},
};

constexpr u32 RecordSize(u32 limits) {
    return static_cast<u32>(offsetof(PortHistogram, bucket) + (limits + 1) * sizeof(HistoBucket));
}
static_assert(RecordSize(11) == 224 && RecordSize(14) == 272 && RecordSize(18) == 336);

// The writes of one direction, in order.
struct HistoWrite {
    u32 node;
    const char *stage;
};
constexpr HistoWrite INPUT_WRITES[] = {{KNF_NODE_PORT_HISTO_CLUSTER_SIZES, "input on clusterSizes"},
                                       {KNF_NODE_PORT_HISTO_PKT_SIZES, "input on pktSizes"},
                                       {KNF_NODE_PORT_HISTO_PKT_INTERVALS, "input on pktIntervals"}};
constexpr HistoWrite OUTPUT_WRITES[] = {{KNF_NODE_PORT_HISTO_CLUSTER_SIZES, "output on clusterSizes"},
                                        {KNF_NODE_PORT_HISTO_PKT_SIZES, "output on pktSizes"},
                                        {KNF_NODE_PORT_HISTO_PKT_INTERVALS, "output on pktIntverals"}};

KnfStatus Abort(Port *port, const char *op, KnfStatus status, const char *stage) {
    DropList(&port->histoParams);
    LogStatus(0, status, "Histogram op %s failed in stage %s\n", op, stage);
    return status;
}

// Once the input side is set up, "start" and "reset" pass over failures: a histogram that does not run reads as it is.
bool Stopping(const char *op) {
    return std::strcmp(op, "stop") == 0;
}

KnfStatus Write(Port *port, const char *op, const HistoWrite (&writes)[3]) {
    for (const HistoWrite &write : writes) {
        KnfStatus status = KNF_Set(write.node, port->portParams, port->histoParams, nullptr, 0);
        if (status != 0 && Stopping(op)) {
            return Abort(port, op, status, write.stage);
        }
    }
    return 0;
}

double BucketPercent(const PortHistogram &histo, u32 bucket) {
    return Quotient(100.0 * static_cast<double>(histo.bucket[bucket].count), static_cast<double>(histo.count));
}

void PrintOne(const HistoKind &kind, PortHistogram *histo, f32 elapsed, ReportBuf *report) {
    ReportPrintf(report, "    { \"name\": \"%s\", \"min\": %Lu, \"max\": %Lu ,\"mean\": %Lu, \"count\": %.0f",
                 kind.name, histo->min, histo->max, histo->mean, Rate(histo->count, elapsed));
    if (histo->count == 0) {
        histo->count = 1;  // the divisor of the percentages; gone with the next read
    }
    ReportPrintf(report, ",\n      \"values\":[");
    for (u32 i = 0; i < kind.limits; i++) {
        ReportPrintf(report, "[%Ld, %.1f], ", static_cast<i64>(histo->bucket[i].limit), BucketPercent(*histo, i));
    }
    ReportPrintf(report, "[%Ld, %.1f]] }", static_cast<i64>(histo->bucket[kind.limits - 1].limit + 1),
                 BucketPercent(*histo, kind.limits));
}

}  // namespace

void HistoAlloc(Port *port) {
    for (const HistoKind &kind : KINDS) {
        port->*kind.record = static_cast<PortHistogram *>(AllocClearedOrPanic(1, RecordSize(kind.limits), kind.tag));
    }
    port->histoStarted = 0;
}

void HistoFree(Port *port) {
    for (const HistoKind &kind : KINDS) {
        std::free(port->*kind.record);
    }
}

// A record's size goes by its kind, so these reads name it themselves.
KnfStatus HistoRead(Port *port, bool first, const char **stage) {
    for (std::size_t i = 0; !first && i < std::size(KINDS); i++) {
        const HistoKind &kind = KINDS[i];
        if (KnfStatus status = KNF_Get(kind.node, port->portParams, port->*kind.record, RecordSize(kind.limits))) {
            *stage = kind.stage;
            return status;
        }
    }
    HistoOp(port->histoStarted != 0 ? "reset" : "start", port);
    port->histoStarted = 1;
    return 0;
}

KnfStatus HistoOp(const char *op, Port *port) {
    if (cacheEnabled != 0 || (*port->prefs & PREF_HISTO) == 0 || port->histoParams == nullptr) {
        return 0;
    }
    if (KnfStatus status = KNF_ParamListAddString(port->histoParams, op)) {
        return Abort(port, op, status, op);
    }
    if (KnfStatus status = KNF_ParamListAddString(port->histoParams, "input")) {
        return Abort(port, op, status, "adding input histo");
    }
    if (KnfStatus status = Write(port, op, INPUT_WRITES)) {
        return status;
    }
    KNF_ParamListRemoveLastParam(port->histoParams);
    KnfStatus added = KNF_ParamListAddString(port->histoParams, "output");
    if (added != 0 && Stopping(op)) {
        return Abort(port, op, added, "adding output histo");
    }
    if (KnfStatus status = Write(port, op, OUTPUT_WRITES)) {
        return status;
    }
    KNF_ParamListRemoveLastParam(port->histoParams);
    KNF_ParamListRemoveLastParam(port->histoParams);
    return 0;
}

void HistoPrint(Port *port, ReportBuf *report) {
    ReportPrintf(report, ",\n  \"histos\":[\n");
    for (const HistoKind &kind : KINDS) {
        PrintOne(kind, port->*kind.record, port->elapsed, report);
        if (&kind != std::end(KINDS) - 1) {
            ReportPrintf(report, ",\n");
        }
    }
    ReportPrintf(report, " ]");
}

KnfStatus PortSetPrefs(Port *port, const PortPrefs *prefs) {
    bool hadHistos = (*port->prefs & PREF_HISTO) != 0 && port->pktSizeIn != nullptr;
    if (hadHistos && (*prefs & PREF_HISTO) == 0) {
        HistoOp("stop", port);
        port->histoStarted = 0;
    }
    if ((*prefs & PREF_VCPU_HISTO) == 0 && port->numVcpus != 0) {
        VcpuHistoDisable(port->vcpus, port->numVcpus);
    }
    *port->prefs = *prefs;
    return 0;
}
