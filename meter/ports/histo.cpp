#include "meter/ports/histo.h"

#include "meter/cpu/vcpu_histo.h"
#include "meter/support/alloc.h"
#include "meter/support/log.h"
#include "meter/support/number.h"
#include "meter/support/run.h"
#include "meter/support/termination.h"

#include <cstdlib>
#include <tuple>

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
template <u32 Limits>
struct HistoKind {
    PortHistogram<Limits> *Port::*record;
    u32 node;
    const char *tag;
    const char *stage;
    const char *name;
};
constexpr std::tuple KINDS = {
    HistoKind<11>{&Port::pktSizeIn, KNF_NODE_PORT_HISTO_PKT_IN, "Pkt Input Histograms", "Port Pkt Input Histo",
                  "pktsizein"},
    HistoKind<11>{&Port::pktSizeOut, KNF_NODE_PORT_HISTO_PKT_OUT, "Pkt Output Histograms", "Port Pkt Output Histo",
                  "pktsizeout"},
    HistoKind<14>{&Port::clusterIn, KNF_NODE_PORT_HISTO_CLUSTER_IN, "Cluster Input Histograms",
                  "Port Cluster Input Histo", "clusterin"},
    HistoKind<14>{&Port::clusterOut, KNF_NODE_PORT_HISTO_CLUSTER_OUT, "Cluster Output Histograms",
                  "Port Cluster Output Histo", "clusterout"},
    HistoKind<18>{&Port::pktIntervalIn, KNF_NODE_PORT_HISTO_INTERVAL_IN, "Pkt Interval Input Histograms",
                  "Port Cluster Intervals Input Histo", "pktintervalin"},
    HistoKind<18>{&Port::pktIntervalOut, KNF_NODE_PORT_HISTO_INTERVAL_OUT, "Pkt Interval Output Histograms",
                  "Port Cluster Intervals Output Histo", "pktintervalout"},
};

// Visits the kinds in their order until a visit gives false.
template <typename Visit>
void EachKind(Visit visit) {
    std::apply([&visit](const auto &...kind) { (void)(visit(kind) && ...); }, KINDS);
}

// As the node takes them, and the messages name them.
constexpr const char *OPERATIONS[] = {"start", "reset", "stop"};

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

KnfStatus Abort(Port *port, HistoOperation op, KnfStatus status, const char *stage) {
    DropList(&port->histoParams);
    LogStatus(0, status, "Histogram op %s failed in stage %s\n", OPERATIONS[op], stage);
    return status;
}

// Once the input side is set up, start and reset pass over failures: a histogram that does not run reads as it is.
KnfStatus Write(Port *port, HistoOperation op, const HistoWrite (&writes)[3]) {
    for (const HistoWrite &write : writes) {
        UncutCalls uncut;
        KnfStatus status = KNF_Set(write.node, port->portParams, port->histoParams, nullptr, 0);
        if (status != 0 && op == HISTO_STOP) {
            return Abort(port, op, status, write.stage);
        }
    }
    return 0;
}

void PrintOne(const char *name, HistoTotals *totals, const HistoBucket *bucket, u32 limits, f32 elapsed,
              ReportBuf *report) {
    ReportPrintf(report, "    { \"name\": \"%s\", \"min\": %Lu, \"max\": %Lu ,\"mean\": %Lu, \"count\": %.0f", name,
                 totals->min, totals->max, totals->mean, Rate(totals->count, elapsed));
    if (totals->count == 0) {
        totals->count = 1;  // the divisor of the percentages; gone with the next read
    }
    auto percent = [totals, bucket](u32 i) {
        return Quotient(100.0 * static_cast<double>(bucket[i].count), static_cast<double>(totals->count));
    };
    ReportPrintf(report, ",\n      \"values\":[");
    for (u32 i = 0; i < limits; i++) {
        ReportPrintf(report, "[%Ld, %.1f], ", static_cast<i64>(bucket[i].limit), percent(i));
    }
    ReportPrintf(report, "[%Ld, %.1f]] }", static_cast<i64>(bucket[limits - 1].limit + 1), percent(limits));
}

}  // namespace

void HistoAlloc(Port *port) {
    EachKind([port]<u32 Limits>(const HistoKind<Limits> &kind) {
        port->*kind.record = AllocArray<PortHistogram<Limits>>(1, kind.tag);
        return true;
    });
    port->histoStarted = 0;
}

void HistoFree(Port *port) {
    EachKind([port](const auto &kind) {
        std::free(port->*kind.record);
        return true;
    });
}

KnfStatus HistoRead(Port *port, bool first, const char **stage) {
    KnfStatus status = 0;
    if (!first) {
        EachKind([&](const auto &kind) {
            *stage = kind.stage;
            status = NodeGet(kind.node, port->portParams, port->*kind.record);
            return status == 0;
        });
    }
    if (status == 0) {
        HistoOp(port->histoStarted != 0 ? HISTO_RESET : HISTO_START, port);
        port->histoStarted = 1;
    }
    return status;
}

KnfStatus HistoOp(HistoOperation op, Port *port) {
    if (cacheEnabled != 0 || (*port->prefs & PREF_HISTO) == 0 || port->histoParams == nullptr) {
        return 0;
    }
    if (KnfStatus status = KNF_ParamListAddString(port->histoParams, OPERATIONS[op])) {
        return Abort(port, op, status, OPERATIONS[op]);
    }
    if (KnfStatus status = KNF_ParamListAddString(port->histoParams, "input")) {
        return Abort(port, op, status, "adding input histo");
    }
    if (KnfStatus status = Write(port, op, INPUT_WRITES)) {
        return status;
    }
    KNF_ParamListRemoveLastParam(port->histoParams);
    KnfStatus added = KNF_ParamListAddString(port->histoParams, "output");
    if (added != 0 && op == HISTO_STOP) {
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
    bool behind = false;
    EachKind([&]<u32 Limits>(const HistoKind<Limits> &kind) {
        PortHistogram<Limits> *histo = port->*kind.record;
        if (behind) {
            ReportPrintf(report, ",\n");
        }
        PrintOne(kind.name, &histo->totals, histo->bucket, Limits, port->elapsed, report);
        behind = true;
        return true;
    });
    ReportPrintf(report, " ]");
}

KnfStatus PortSetPrefs(Port *port, const PortPrefs *prefs) {
    bool hadHistos = (*port->prefs & PREF_HISTO) != 0 && port->pktSizeIn != nullptr;
    if (hadHistos && (*prefs & PREF_HISTO) == 0) {
        HistoOp(HISTO_STOP, port);
        port->histoStarted = 0;
    }
    if ((*prefs & PREF_VCPU_HISTO) == 0 && port->numVcpus != 0) {
        VcpuHistoDisable(port->vcpus, port->numVcpus);
    }
    *port->prefs = *prefs;
    return 0;
}
