#include "meter/pnic/physnic.h"

#include "meter/support/alloc.h"
#include "meter/support/log.h"
#include "meter/support/node.h"

#include <cstdlib>
#include <cstring>

namespace {

constexpr u32 KNF_NODE_PNIC_PROPERTIES = 72;
constexpr u32 KNF_NODE_PNIC_STATS = 73;
constexpr u32 KNF_NODE_PNIC_RXQ_INFO = 121;
constexpr u32 KNF_NODE_PNIC_TXQ_INFO = 131;
constexpr u32 KNF_NODE_PNIC_TXQ_STATS = 132;

// What a NIC is built from.
struct NicFacts {
    PnicProperties properties;
    PnicQueueInfo txq;
    PnicQueueInfo rxq;
};

// Makes the lists and reads the facts. Null, or what failed.
const char *Gather(PhysNic *nic, const char *nicName, NicFacts *facts) {
    nic->statsParam = KNF_ParamListCreate(KNF_INSTANCE_LIST, 1);
    nic->txqParam = KNF_ParamListCreate(KNF_INSTANCE_LIST, 2);
    nic->rxqParam = KNF_ParamListCreate(KNF_INSTANCE_LIST, 3);
    if (nic->statsParam == nullptr || nic->txqParam == nullptr || nic->rxqParam == nullptr) {
        return "Param List Creation";
    }
    if (KNF_ParamListAddString(nic->statsParam, nicName) != 0 || KNF_ParamListAddString(nic->txqParam, nicName) != 0 ||
        KNF_ParamListAddString(nic->rxqParam, nicName) != 0) {
        return "Adding nicname to param list instance";
    }
    if (NodeGet(KNF_NODE_PNIC_PROPERTIES, nic->statsParam, &facts->properties) != 0) {
        return "Pnic Properties";
    }
    if (NodeGet(KNF_NODE_PNIC_TXQ_INFO, nic->statsParam, &facts->txq) != 0) {
        return "PNIC TxQ Properties";
    }
    if (NodeGet(KNF_NODE_PNIC_RXQ_INFO, nic->statsParam, &facts->rxq) != 0) {
        return "PNIC RxQ Properties";
    }
    return nullptr;
}

void NameNic(PhysNic *nic, const char *nicName, const char *device) {
    std::size_t size = std::strlen(nicName) + std::strlen(device) + 2;
    nic->name = static_cast<char *>(AllocOrPanic(size, "physnic name"));
    Str_Snprintf(nic->name, size, "%s.%s", nicName, device);
}

void CreateQueues(PhysNic *nic, const NicFacts &facts) {
    nic->txqCount = nic->txqCapacity = facts.txq.count;
    auto count = static_cast<std::size_t>(nic->txqCapacity);
    nic->txqCurr = AllocArray<TxqSample>(count, "TxQ Stats Curr");
    nic->txqPrev = AllocArray<TxqSample>(count, "TxQ Stats Prev");
    nic->rxqCount = nic->rxqCapacity = facts.rxq.count;
    LogMsg(1, "nic %s has %d rxQ and %d txQ\n", nic->name, nic->rxqCount, nic->txqCount);
}

KnfStatus Failed(const PhysNic *nic, KnfStatus status, const char *label) {
    LogStatus(0, status, "physnic %s stat \"%s\" read error. Cleaning nic\n", nic->name, label);
    return status;
}

template <typename Record>
KnfStatus ReadLabelled(const PhysNic *nic, u32 node, KnfParamList params, Record *record, const char *label) {
    KnfStatus status = NodeGet(node, params, record);
    return status != 0 ? Failed(nic, status, label) : 0;
}

KnfStatus ReadTxQueue(PhysNic *nic, i32 queue, TxqSample *sample) {
    VaryingKey key(nic->txqParam, i64{queue});
    if (key.status != 0) {
        return Failed(nic, key.status, "Adding txQ num to param list");
    }
    return ReadLabelled(nic, KNF_NODE_PNIC_TXQ_STATS, nic->txqParam, sample, "TxQ Stats");
}

// Counts within the capacity are taken over; the arrays do not grow.
KnfStatus ReadQueues(PhysNic *nic, bool first) {
    PnicQueueInfo info = {};
    if (KnfStatus status = ReadLabelled(nic, KNF_NODE_PNIC_RXQ_INFO, nic->statsParam, &info, "RxQInfo")) {
        return status;
    }
    if (nic->rxqCapacity < info.count) {
        LogMsg(0, "Restart the program again as #RX queues has increased from %d to %d for %s physnic\n",
               nic->rxqCapacity, info.count, nic->name);
        return KNF_FAILURE;
    }
    nic->rxqCount = info.count;
    if (KnfStatus status = ReadLabelled(nic, KNF_NODE_PNIC_TXQ_INFO, nic->statsParam, &info, "TxQInfo")) {
        return status;
    }
    if (nic->txqCapacity < info.count) {
        LogMsg(0, "Restart the program again as #TX queues has increased from %d to %d for %s physnic\n",
               nic->txqCapacity, info.count, nic->name);
        return KNF_FAILURE;
    }
    nic->txqCount = info.count;
    TxqSample *samples = first ? nic->txqPrev : nic->txqCurr;
    for (i32 queue = 0; queue < nic->txqCount; queue++) {
        if (KnfStatus status = ReadTxQueue(nic, queue, &samples[queue])) {
            return status;
        }
    }
    return 0;
}

}  // namespace

u64 PhysNicPortOf(const char *nicName) {
    static KnfParamList nicPropsParam = nullptr;
    if (nicPropsParam == nullptr) {
        nicPropsParam = KNF_ParamListCreate(KNF_INSTANCE_LIST, 1);
    }
    if (nicPropsParam == nullptr) {
        LogMsg(0, "Unable to create nic props param\n");
        return 0;
    }
    if (KNF_ParamListAddString(nicPropsParam, nicName) != 0) {
        LogMsg(0, "Unable to add nic name to nicPropsParam\n");
        return 0;
    }
    PnicProperties properties = {};
    if (KnfStatus status = NodeGet(KNF_NODE_PNIC_PROPERTIES, nicPropsParam, &properties)) {
        LogStatus(0, status, "Unable to read properties for nic %s\n", nicName);
        return 0;
    }
    return properties.portNum;
}

PhysNic *PhysNicCreate(const char *nicName, const PortPrefs *prefs) {
    PhysNic *nic = AllocRecord<PhysNic>("physnic");
    NicFacts facts = {};
    if (const char *label = Gather(nic, nicName, &facts)) {
        LogMsg(0, "Error in physnic creation:%s\n", label);
        PhysNicCleanup(nic);
        return nullptr;
    }
    NameNic(nic, nicName, facts.properties.device);
    if ((*prefs & PREF_VNIC) != 0) {
        nic->statsCurr = AllocRecord<PnicStats>("Nic Statistics");
        nic->statsPrev = AllocRecord<PnicStats>("Nic Statistics");
    }
    if ((*prefs & PREF_QUEUE) != 0) {
        CreateQueues(nic, facts);
    }
    if ((*prefs & PREF_INTR) != 0) {
        nic->intr = IntrCreate(nicName);
    }
    return nic;
}

KnfStatus PhysNicRead(PhysNic *nic, const PortPrefs *prefs, bool first) {
    if (nic == nullptr) {
        return 0;
    }
    if ((*prefs & PREF_VNIC) != 0 && nic->statsCurr != nullptr) {
        PnicStats *stats = first ? nic->statsPrev : nic->statsCurr;
        if (KnfStatus status = ReadLabelled(nic, KNF_NODE_PNIC_STATS, nic->statsParam, stats, "pnic stats")) {
            return status;
        }
    }
    if ((*prefs & PREF_QUEUE) != 0 && nic->txqCurr != nullptr) {
        if (KnfStatus status = ReadQueues(nic, first)) {
            return status;
        }
    }
    if (nic->intr != nullptr && (*prefs & PREF_INTR) != 0 && IntrRead(nic->intr, first) != 0) {
        IntrCleanup(nic->intr);
        nic->intr = nullptr;
    }
    return 0;
}

void PhysNicCleanup(PhysNic *nic) {
    if (nic == nullptr) {
        return;
    }
    std::free(nic->name);
    std::free(nic->statsCurr);
    std::free(nic->statsPrev);
    std::free(nic->txqCurr);
    std::free(nic->txqPrev);
    DropList(&nic->statsParam);
    DropList(&nic->txqParam);
    DropList(&nic->rxqParam);
    IntrCleanup(nic->intr);
    std::free(nic);
}
