#include "meter/cpu/pcpu.h"

#include "meter/cpu/vcpu_histo.h"
#include "meter/support/alloc.h"
#include "meter/support/log.h"
#include "meter/support/node.h"
#include "meter/support/number.h"
#include "meter/support/run.h"

#include <cstdlib>
#include <cstring>
#include <utility>

char *hostName = nullptr;
KnfParamList instanceParams = nullptr;

namespace {

constexpr u32 KNF_NODE_CONFIG_OPTION = 519;
constexpr u32 KNF_NODE_CPU_TOPOLOGY = 603;
constexpr u32 KNF_NODE_PCPU_INFO = 605;
constexpr u32 KNF_NODE_PCPU_STATS = 797;

struct __attribute__((packed)) CpuTopology {
    u8 reserved0[8];
    u32 packages;
    u32 cores;
    u32 pcpus;
    u8 reserved20[16];
};
static_assert(sizeof(CpuTopology) == 36 && offsetof(CpuTopology, pcpus) == 16);

struct __attribute__((packed)) PcpuInfo {
    u8 reserved0[196];
    u32 llc;  // last-level-cache figure
};
static_assert(sizeof(PcpuInfo) == 200);

struct __attribute__((packed)) ConfigOption {
    u8 reserved0[544];
    char value[1028];

    void EndTexts() { EndText(value); }
};
static_assert(sizeof(ConfigOption) == 1572);

// Running counters in one unit; only their ratios are used.
struct __attribute__((packed)) PcpuStats {
    u64 busyTime;
    u8 reserved8[8];
    u64 wdtTime;  // spent in worldlets
    u8 reserved24[24];
    u64 elapsedTime;
    u8 reserved56[104];
};
static_assert(sizeof(PcpuStats) == 160 && offsetof(PcpuStats, wdtTime) == 16 && offsetof(PcpuStats, elapsedTime) == 48);

u32 topologyCore = 0;  // pcpus of a core
u32 topologyLlc = 0;
u32 topologyPackage = 0;  // pcpus of a package
PcpuStats *pcpuStatsPrev = nullptr;
PcpuStats *pcpuStatsCur = nullptr;
f32 *wdtPct = nullptr;  // of each pcpu, within one report

KnfStatus ReadPcpuInfo(PcpuInfo *info) {
    VaryingKey pcpu(instanceParams, i64{0});
    if (pcpu.status != 0) {
        LogMsg(0, "Unable to add to knfparam list to read cpu 0 info:%s\n", HCK_ReturnStatusToString(pcpu.status));
        return KNF_FAILURE;
    }
    KnfStatus status = NodeGet(KNF_NODE_PCPU_INFO, instanceParams, info);
    if (status != 0) {
        LogMsg(0, "Unable to read cpu 0 info:%s\n", HCK_ReturnStatusToString(status));
    }
    return status;
}

KnfStatus ReadTopology() {
    CpuTopology topology = {};
    PcpuInfo info = {};
    if (KnfStatus status = NodeGet(KNF_NODE_CPU_TOPOLOGY, nullptr, &topology)) {
        return status;
    }
    if (KnfStatus status = ReadPcpuInfo(&info)) {
        return status;
    }
    if (topology.packages == 0 || topology.cores == 0 || topology.pcpus == 0) {
        LogMsg(0, "Unusable cpu topology: %u packages %u cores %u pcpus\n", topology.packages, topology.cores,
               topology.pcpus);
        return KNF_FAILURE;
    }
    NUM_PCPUS = topology.pcpus;
    topologyPackage = topology.pcpus / topology.packages;
    topologyLlc = info.llc;
    topologyCore = topology.pcpus / topology.cores;
    return 0;
}

// The option list serves for the host name first and then keeps the group of the tracking option.
KnfStatus ReadHostName() {
    KNF_ParamListAddString(trackHistoPath, "Misc");
    KNF_ParamListAddString(trackHistoPath, "HostName");
    ConfigOption option = {};
    KnfStatus status = NodeGet(KNF_NODE_CONFIG_OPTION, trackHistoPath, &option);
    if (status != 0) {
        LogStatus(0, status, "Unable to read hostName");
        return KNF_FAILURE;
    }
    std::size_t length = std::strlen(option.value);
    hostName = static_cast<char *>(std::malloc(length + 1));
    if (hostName == nullptr) {
        LogMsg(0, "Error allocating mem for hostname: %d bytes", static_cast<int>(length));
        return KNF_FAILURE;
    }
    std::memcpy(hostName, option.value, length + 1);
    KNF_ParamListRemoveLastParam(trackHistoPath);
    KNF_ParamListRemoveLastParam(trackHistoPath);
    return 0;
}

// One figure of a pcpu as a percentage of its elapsed time, as the report keeps it.
f32 Share(i64 part, i64 elapsed) {
    return static_cast<f32>(Quotient(100.0 * static_cast<double>(part), static_cast<double>(elapsed)));
}

void PrintLoads(ReportBuf *report) {
    ReportPrintf(report, ",\n\"used\": [");
    f32 usedSum = 0;
    f32 wdtSum = 0;
    for (u32 i = 0; i < NUM_PCPUS; i++) {
        const PcpuStats &cur = pcpuStatsCur[i];
        const PcpuStats &prev = pcpuStatsPrev[i];
        i64 elapsed = SignedDelta(cur.elapsedTime, prev.elapsedTime);
        f32 used = Share(SignedDelta(cur.busyTime, prev.busyTime), elapsed);
        wdtPct[i] = Share(SignedDelta(cur.wdtTime, prev.wdtTime), elapsed);
        usedSum += used;
        wdtSum += wdtPct[i];
        ReportPrintf(report, "%6.2f, ", static_cast<double>(used));
    }
    ReportPrintf(report, "%7.2f],\n\"wdt\": [", static_cast<double>(usedSum));
    for (u32 i = 0; i < NUM_PCPUS; i++) {
        ReportPrintf(report, "%6.2f, ", static_cast<double>(wdtPct[i]));
    }
    ReportPrintf(report, "%7.2f] }", static_cast<double>(wdtSum));
}

}  // namespace

KnfStatus SchedStatsCpuGlobalInfoInit() {
    instanceParams = KNF_ParamListCreate(KNF_INSTANCE_LIST, 2);
    if (instanceParams == nullptr) {
        LogMsg(0, "Error on KNF_ParamListCreate()\n");
        return KNF_FAILURE;
    }
    if (KnfStatus status = ReadTopology()) {
        return status;
    }
    pcpuStatsCur = AllocArray<PcpuStats>(NUM_PCPUS, "CPU Set");
    pcpuStatsPrev = AllocArray<PcpuStats>(NUM_PCPUS, "CPU Set");
    if (VcpuHistoCreateLists()) {
        if (KnfStatus status = ReadHostName()) {
            return status;
        }
        if (KNF_ParamListAddString(trackHistoPath, "Cpu") == 0) {
            return 0;
        }
    }
    LogMsg(0, "Will not be able to track vcpu histograms due to paramlist errs");
    VcpuHistoDropLists();
    return 0;
}

KnfStatus SchedStatsPcpuStats(bool first) {
    PcpuStats *stats = first ? pcpuStatsPrev : pcpuStatsCur;
    for (u32 i = 0; i < NUM_PCPUS; i++) {
        VaryingKey pcpu(instanceParams, i64{i});
        if (pcpu.status != 0) {
            LogDirect("SchedStatsPcpuStats: KNF_ParamListAddInt()\n");
            return pcpu.status;
        }
        if (KnfStatus status = NodeUpdate(KNF_NODE_PCPU_STATS, instanceParams, &stats[i])) {
            LogMsg(0, "Unable to read pcpu %d stats: %s", static_cast<i32>(i), HCK_ReturnStatusToString(status));
            return status;
        }
    }
    return 0;
}

void SchedStatsCpuPrint(ReportBuf *report) {
    if (wdtPct == nullptr) {
        wdtPct = AllocArray<f32>(NUM_PCPUS, "Wdt Pct Array");
    }
    ReportPrintf(report, ",\n\"cpu\": { \"topology\": { \"core\": %d, \"llc\": %d, \"package\": %d}",
                 static_cast<i32>(topologyCore), static_cast<i32>(topologyLlc), static_cast<i32>(topologyPackage));
    if (pcpuStatsCur[0].elapsedTime > pcpuStatsPrev[0].elapsedTime) {
        PrintLoads(report);
    } else {
        ReportPrintf(report, ",\n\"used\":[0.00 ], \"wdt\": [0.00 ] }");
    }
    std::swap(pcpuStatsCur, pcpuStatsPrev);
}
