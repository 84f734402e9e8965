#include "meter/cpu/vcpu_histo.h"

#include "meter/cpu/vcpu.h"
#include "meter/support/log.h"
#include "meter/support/node.h"
#include "meter/support/number.h"
#include "meter/support/run.h"
#include "meter/support/termination.h"

#include <array>
#include <cstdlib>
#include <utility>

// Running totals; a report shows the differences of two samples.
struct __attribute__((packed)) VcpuHisto {
    struct __attribute__((packed)) Bucket {
        u64 samples;
        u64 limit;  // 0: this bucket and those behind it are not in use
    };

    u8 reserved0[24];
    u64 count;
    Bucket buckets[20];
};
static_assert(sizeof(VcpuHisto) == 352 && offsetof(VcpuHisto, buckets) == 32);

KnfParamList trackHistoPath = nullptr;

namespace {

constexpr u32 KNF_NODE_CONFIG_OPTION_SET = 520;
constexpr u32 KNF_NODE_VCPU_HISTO = 776;
constexpr i32 NUM_BUCKETS = 20;

struct HistoKind {
    const char *key;   // in the node's parameters
    const char *name;  // in the report
};
constexpr std::array<HistoKind, 4> KINDS = {{{"RUN", "run"}, {"READY", "ready"}, {"COSTOP", "cstp"}, {"WAIT", "wait"}}};

KnfParamList trackHistoValue = nullptr;  // the new value during a write; null: histograms are out of reach for good
KnfParamList worldHistoArgs = nullptr;   // vcpu id and kind during a read
u32 histoUsers = 0;                      // vcpus of all ports whose histoEnabled is set
u8 histoTracking = 0;                    // what was last written to the option, which is never read back

void EndUse(Vcpu *vcpu) {
    if (vcpu->histoEnabled != 0 && --histoUsers == 0) {
        VcpuHistoTrack(0);
    }
    vcpu->histoEnabled = 0;
}

KnfStatus DisableForever(KnfStatus status) {
    VcpuHistoDropLists();
    return status;
}

// A list whose add failed is in an unknown state and never used again.
void LoseReadArgs(KnfStatus status, u64 id, const char *what) {
    LogStatus(0, status, "vcpu %Lu err %s", id, what);
    DropList(&worldHistoArgs);
}

bool ReadKinds(const Vcpu *vcpu, VcpuHisto *bank) {
    for (std::size_t kind = 0; kind < KINDS.size(); kind++) {
        KnfStatus status = KNF_ParamListAddString(worldHistoArgs, KINDS[kind].key);
        if (status != 0) {
            LoseReadArgs(status, vcpu->id, "Unable to add histotype to worldHistoArgs");
            return false;
        }
        status = NodeGet(KNF_NODE_VCPU_HISTO, worldHistoArgs, &bank[kind]);
        KNF_ParamListRemoveLastParam(worldHistoArgs);
        if (status != 0) {
            LogStatus(0, status, "vcpu %Lu err %s", vcpu->id, "Unable to read vcpu histo");
            return false;
        }
    }
    return true;
}

// Buckets in use; one table of limits serves all kinds.
i32 BucketsInUse(const VcpuHisto &table) {
    for (i32 i = 1; i < NUM_BUCKETS; i++) {
        if (table.buckets[i].limit == 0) {
            return i;
        }
    }
    return NUM_BUCKETS;
}

// The last bucket has no upper limit: its label is the first value above the bucket ahead of it.
void PrintLimits(const VcpuHisto &table, i32 used, ReportBuf *report) {
    ReportPrintf(report, ",\n    \"histos\":{\"buckets\": [ ");
    for (i32 i = 0; i < used - 1; i++) {
        ReportPrintf(report, "%Ld, ", static_cast<i64>(table.buckets[i].limit));
    }
    u64 last = used < 2 ? 0 : table.buckets[used - 2].limit + 1;
    ReportPrintf(report, "%Ld],\n      \"values\":[", static_cast<i64>(last));
}

void PrintSamples(const VcpuHisto &cur, const VcpuHisto &prev, i32 used, ReportBuf *report) {
    for (i32 i = 0; i < used; i++) {
        ReportPrintf(report, i < used - 1 ? "%Ld, " : "%Ld] }",
                     SignedDelta(cur.buckets[i].samples, prev.buckets[i].samples));
    }
}

}  // namespace

bool VcpuHistoCreateLists() {
    trackHistoValue = KNF_ParamListCreate(KNF_INPUT_LIST, 1);
    trackHistoPath = KNF_ParamListCreate(KNF_INSTANCE_LIST, 2);
    worldHistoArgs = KNF_ParamListCreate(KNF_INSTANCE_LIST, 2);
    return trackHistoValue != nullptr && trackHistoPath != nullptr && worldHistoArgs != nullptr;
}

void VcpuHistoDropLists() {
    DropList(&trackHistoValue);
    DropList(&trackHistoPath);
    DropList(&worldHistoArgs);
}

KnfStatus VcpuHistoTrack(i32 state) {
    if (trackHistoValue == nullptr || state == histoTracking) {
        return 0;
    }
    if (cacheEnabled != 0) {
        histoTracking = static_cast<u8>(state);
        return 0;
    }
    KnfStatus status = KNF_ParamListAddString(trackHistoPath, "TrackHistos");
    if (status == 0) {
        status = KNF_ParamListAddInt(trackHistoValue, state);
    }
    if (status != 0) {
        LogStatus(0, status, "Unable to add params to change vcpu histo stateto %d. Disabling forever.", state);
        return DisableForever(status);
    }
    u32 result = 0;
    {
        UncutCalls uncut;
        status = KNF_Set(KNF_NODE_CONFIG_OPTION_SET, trackHistoPath, trackHistoValue, &result, sizeof result);
    }
    if (status != 0) {
        LogStatus(0, status, "Unable to change vcpu histo stateto %d. Disabling forever.", state);
        return DisableForever(status);
    }
    histoTracking = state != 0 ? 1 : 0;
    KNF_ParamListRemoveLastParam(trackHistoPath);
    KNF_ParamListRemoveLastParam(trackHistoValue);
    return 0;
}

bool VcpuHistoAvailable() {
    return trackHistoValue != nullptr;
}

bool VcpuHistoSetUp(Vcpu *vcpu) {
    vcpu->histos = static_cast<VcpuHisto *>(std::calloc(2 * KINDS.size(), sizeof(VcpuHisto)));
    if (vcpu->histos == nullptr) {
        LogMsg(0, "vcpu %d cannot get histos due to calloc err", static_cast<i32>(vcpu->id));
        return false;
    }
    if (histoUsers == 0 && VcpuHistoTrack(1) != 0) {
        return false;
    }
    histoUsers++;
    vcpu->prevHistos = vcpu->histos;
    vcpu->curHistos = vcpu->histos + KINDS.size();
    vcpu->histoEnabled = 1;
    return true;
}

void VcpuHistoRead(Vcpu *vcpu, bool first, bool *failed) {
    if (vcpu->histoEnabled == 0 || vcpu->histos == nullptr || *failed || histoTracking == 0) {
        return;
    }
    if (worldHistoArgs == nullptr) {
        *failed = true;
        return;
    }
    if (KnfStatus status = KNF_ParamListAddInt(worldHistoArgs, static_cast<i64>(vcpu->id))) {
        LoseReadArgs(status, vcpu->id, "Unable to add vcpu id to worldHistoArgs");
        *failed = true;
        return;
    }
    *failed = !ReadKinds(vcpu, first ? vcpu->prevHistos : vcpu->curHistos);
    if (worldHistoArgs != nullptr) {
        KNF_ParamListRemoveLastParam(worldHistoArgs);
    }
}

void VcpuHistoPrint(Vcpu *vcpu, const VcpuTimes &times, ReportBuf *report) {
    if (vcpu->histoEnabled == 0 || histoTracking == 0 || vcpu->histos == nullptr) {
        return;
    }
    i32 used = BucketsInUse(vcpu->histos[0]);
    PrintLimits(vcpu->histos[0], used, report);
    const std::array<i64, KINDS.size()> total = {times.used, times.ready, times.costop, 0};
    for (std::size_t kind = 0; kind < KINDS.size(); kind++) {
        const VcpuHisto &cur = vcpu->curHistos[kind];
        const VcpuHisto &prev = vcpu->prevHistos[kind];
        i64 count = SignedDelta(cur.count, prev.count);
        ReportPrintf(report,
                     kind == 0 ? "\n        { \"name\": \"%s\", \"count\": %Ld, \"mean\": %Ld, \"values\": ["
                               : ",\n        { \"name\": \"%s\", \"count\": %Ld, \"mean\": %Ld, \"values\": [",
                     KINDS[kind].name, count, SignedMean(total[kind], count));
        PrintSamples(cur, prev, used, report);
    }
    ReportPrintf(report, "] }");
    std::swap(vcpu->prevHistos, vcpu->curHistos);
}

void VcpuHistoRelease(Vcpu *vcpus, i32 numVcpus) {
    for (i32 i = 0; i < numVcpus; i++) {
        std::free(vcpus[i].histos);
        vcpus[i].histos = nullptr;
        EndUse(&vcpus[i]);
    }
}

KnfStatus VcpuHistoDisable(Vcpu *vcpus, i32 numVcpus) {
    for (i32 i = 0; i < numVcpus; i++) {
        EndUse(&vcpus[i]);
    }
    if (histoUsers == 0) {
        VcpuHistoTrack(0);
    }
    return 0;
}
