#include "meter/cpu/vcpu.h"

#include "meter/cpu/vcpu_histo.h"
#include "meter/support/alloc.h"
#include "meter/support/log.h"
#include "meter/support/node.h"
#include "meter/support/number.h"

#include <cstdlib>

namespace {

constexpr u32 KNF_NODE_WORLD_CARTEL = 457;
constexpr u32 KNF_NODE_GROUP_VCPU_LEADER = 658;
constexpr u32 KNF_NODE_CARTEL_GROUP = 738;
constexpr u32 KNF_NODE_VCPU_LIST = 753;
constexpr u32 KNF_NODE_VCPU_STATE_TIMES = 770;
constexpr u32 KNF_NODE_VCPU_EVENT_COUNTS = 772;
constexpr u32 KNF_NODE_VCPU_MIGRATIONS = 793;
constexpr u32 KNF_NODE_VCPU_L3_MIGRATIONS = 795;

struct __attribute__((packed)) VcpuEventCounts {
    u8 reserved0[36];
    u32 actNot;
    u8 reserved40[24];
};
static_assert(sizeof(VcpuEventCounts) == 64);

// One link of the chain from a world leader to its vcpus. On a failure `added` tells the read from its key.
struct Link {
    KnfStatus status;
    bool added;
};

template <typename Record>
Link Follow(KnfParamList list, u32 node, u64 id, Record *next) {
    VaryingKey key(list, static_cast<i64>(id));
    if (key.status != 0) {
        return {key.status, false};
    }
    return {NodeGet(node, list, next), true};
}

// The vcpu list of a world leader, or null.
KnfParamList FindVcpus(KnfParamList list, u32 worldLeader) {
    u32 cartelID = 0;
    Link link = Follow(list, KNF_NODE_WORLD_CARTEL, worldLeader, &cartelID);
    if (link.status != 0) {
        LogStatus(0, link.status,
                  link.added ? "Unable to get cartel id for %u leader\n" : "Unable to add param: worldLeader %u\n",
                  worldLeader);
        return nullptr;
    }
    u64 groupID = 0;
    link = Follow(list, KNF_NODE_CARTEL_GROUP, cartelID, &groupID);
    if (link.status != 0) {
        LogStatus(0, link.status,
                  link.added ? "Unable to get group ID for %u cartel\n" : "Unable to add param: cartelID %u\n",
                  cartelID);
        return nullptr;
    }
    u32 vcpuLeaderID = 0;
    link = Follow(list, KNF_NODE_GROUP_VCPU_LEADER, groupID, &vcpuLeaderID);
    if (link.status != 0) {
        LogStatus(0, link.status,
                  link.added ? "Unable to get vcpuleader for %Lu group\n" : "Unable to add param: groupID %Lu\n",
                  groupID);
        return nullptr;
    }
    if (KnfStatus status = KNF_ParamListAddInt(list, vcpuLeaderID)) {
        LogStatus(0, status, "Unable to add param: vcpuLeaderID %u\n", vcpuLeaderID);
        return nullptr;
    }
    KnfParamList vcpuList = nullptr;
    if (KnfStatus status = KNF_GetInstanceListAlloc(KNF_NODE_VCPU_LIST, list, &vcpuList)) {
        LogStatus(0, status, "Unable to get vcpuList from vcpuLeaderID %u\n", vcpuLeaderID);
        return nullptr;
    }
    return vcpuList;
}

void FillRecords(KnfParamList vcpuList, bool vcpuHisto, Vcpu *vcpus, i32 numVcpus) {
    bool wanted = vcpuHisto && VcpuHistoAvailable();
    for (i32 i = 0; i < numVcpus; i++) {
        KnfParam param = KNF_ParamListGetParam(vcpuList, static_cast<u32>(i));
        vcpus[i].id = static_cast<u64>(KNF_ParamGetInt(param));
        if (wanted && !VcpuHistoSetUp(&vcpus[i])) {
            VcpuHistoRelease(vcpus, numVcpus);
            wanted = false;
        }
    }
}

// Migrations go into the current fields whatever the pass, and the first pass copies them.
KnfStatus ReadOne(Vcpu *vcpu, KnfParamList args, bool first, bool *histoFailed) {
    VaryingKey id(args, static_cast<i64>(vcpu->id));
    if (id.status != 0) {
        LogStatus(0, id.status, "vcpuid %Lu: Unable to add id\n", vcpu->id);
        return id.status;
    }
    if (KnfStatus status =
            NodeUpdate(KNF_NODE_VCPU_STATE_TIMES, args, first ? &vcpu->prevStateTimes : &vcpu->curStateTimes)) {
        LogStatus(0, status, "vcpuid %Lu: Unable to read stateTimes\n", vcpu->id);
        return status;
    }
    VcpuHistoRead(vcpu, first, histoFailed);
    VcpuEventCounts events = {};
    if (KnfStatus status = NodeGet(KNF_NODE_VCPU_EVENT_COUNTS, args, &events)) {
        LogStatus(0, status, "vcpuid %Lu: Unable to read eventCounts\n", vcpu->id);
        return status;
    }
    if (KnfStatus status = NodeGet(KNF_NODE_VCPU_MIGRATIONS, args, &vcpu->curMigTotal)) {
        LogStatus(0, status, "vcpuid %Lu: Unable to read total migrations\n", vcpu->id);
        return status;
    }
    VaryingKey cache(args, "L3");
    if (cache.status != 0) {
        LogStatus(0, cache.status, "vcpuid %Lu: Unable to add id\n", vcpu->id);
        return cache.status;
    }
    if (KnfStatus status = NodeGet(KNF_NODE_VCPU_L3_MIGRATIONS, args, &vcpu->curMigL3)) {
        LogStatus(0, status, "vcpuid %Lu: Unable to read L3 migrations\n", vcpu->id);
        return status;
    }
    if (first) {
        vcpu->prevActNot = events.actNot;
        vcpu->prevMigTotal = vcpu->curMigTotal;
        vcpu->prevMigL3 = vcpu->curMigL3;
    } else {
        vcpu->curActNot = events.actNot;
    }
    return 0;
}

void PrintOne(Vcpu *vcpu, f32 scale, f32 elapsed, ReportBuf *report) {
    const VcpuStateTimes &cur = vcpu->curStateTimes;
    const VcpuStateTimes &prev = vcpu->prevStateTimes;
    VcpuTimes times = {SignedDelta(cur.usedTime, prev.usedTime), SignedDelta(cur.readyTime, prev.readyTime),
                       SignedDelta(cur.costopTime, prev.costopTime)};
    ReportPrintf(report,
                 "\"id\": %Lu, \"used\": %.2f, \"ready\": %.2f, \"cstp\": %.2f, \"actnot\": %.2f, \"migtot\": %.0f, "
                 "\"migl3\": %.0f",
                 vcpu->id, SignedRate(times.used, scale), SignedRate(times.ready, scale),
                 SignedRate(times.costop, scale), Rate(vcpu->curActNot - vcpu->prevActNot, elapsed),
                 Rate(vcpu->curMigTotal - vcpu->prevMigTotal, elapsed),
                 Rate(vcpu->curMigL3 - vcpu->prevMigL3, elapsed));
    VcpuHistoPrint(vcpu, times, report);
    ReportPrintf(report, " }");
    vcpu->prevStateTimes = vcpu->curStateTimes;
    vcpu->prevActNot = vcpu->curActNot;
    vcpu->prevMigTotal = vcpu->curMigTotal;
    vcpu->prevMigL3 = vcpu->curMigL3;
}

}  // namespace

i32 VcpusCreate(u32 worldLeader, bool vcpuHisto, Vcpu **vcpus) {
    LocalList chain(KNF_ParamListCreate(KNF_INSTANCE_LIST, 1));
    if (chain.list == nullptr) {
        return 0;
    }
    LocalList vcpuList(FindVcpus(chain.list, worldLeader));
    if (vcpuList.list == nullptr) {
        return 0;
    }
    auto numVcpus = static_cast<i32>(KNF_ParamListUsedCount(vcpuList.list));
    if (numVcpus < 1) {
        LogMsg(0, "No vcpus present for worldLeader %u\n", worldLeader);
        return 0;
    }
    LogMsg(1, "%u worldLeader has %d vcpus\n", worldLeader, numVcpus);
    *vcpus = AllocArray<Vcpu>(static_cast<std::size_t>(numVcpus), "Vcpus");
    FillRecords(vcpuList.list, vcpuHisto, *vcpus, numVcpus);
    return numVcpus;
}

KnfStatus VcpusRead(Vcpu *vcpus, i32 numVcpus, bool first) {
    LocalList args(KNF_ParamListCreate(KNF_INSTANCE_LIST, 2));
    if (args.list == nullptr || numVcpus < 1) {
        return KNF_FAILURE;
    }
    KnfStatus status = 0;
    bool histoFailed = false;
    for (i32 i = 0; i < numVcpus && status == 0; i++) {
        status = ReadOne(&vcpus[i], args.list, first, &histoFailed);
    }
    if (histoFailed) {
        VcpuHistoRelease(vcpus, numVcpus);
    }
    return status;
}

KnfStatus VcpusPrint(Vcpu *vcpus, i32 numVcpus, f32 elapsed, ReportBuf *report) {
    auto scale = static_cast<f32>(elapsed * 10000.0);  // microseconds to a percentage of the elapsed time
    ReportPrintf(report, ",\n  \"vcpu\": [");
    for (i32 i = 0; i < numVcpus; i++) {
        ReportPrintf(report, i == 0 ? "\n    {" : ",\n    {");
        PrintOne(&vcpus[i], scale, elapsed, report);
    }
    ReportPrintf(report, " ]");
    return 0;
}

void VcpusCleanup(Vcpu *vcpus, i32 numVcpus) {
    if (vcpus != nullptr) {
        VcpuHistoRelease(vcpus, numVcpus);
        std::free(vcpus);
    }
}
