#include "meter/pnic/intr.h"

#include "meter/support/alloc.h"
#include "meter/support/log.h"
#include "meter/support/node.h"
#include "meter/support/number.h"
#include "meter/support/run.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>

namespace {

constexpr u32 KNF_NODE_INTR_LIST = 639;
constexpr u32 KNF_NODE_INTR_NAMES = 641;
constexpr u32 KNF_NODE_INTR_STATS = 840;

// Running totals of one vector on one pcpu.
struct __attribute__((packed)) IntrStats {
    u64 count;
    u64 usedTime;  // microseconds
};
static_assert(sizeof(IntrStats) == 16);

// The text that a mask is looked for in: a marker letter, then all names on the vector, joined. What does not fit is
// cut, so that a mask in it does not match.
struct NameSlot {
    char text[64];
};

i32 intrCount = 0;  // vectors listed; 0: not listed yet, or none found; -1: the listing failed and is not tried again
NameSlot *intrNames = nullptr;
i64 *intrList = nullptr;

void FillSlot(KnfParamList names, NameSlot *slot) {
    constexpr std::size_t END = sizeof slot->text - 1;
    u32 count = KNF_ParamListUsedCount(names);
    slot->text[0] = count < 2 ? 'i' : 's';
    slot->text[1] = '\0';
    std::size_t position = 1;
    for (u32 i = 0; i < count && position < END; i++) {
        const char *name = KNF_ParamGetString(KNF_ParamListGetParam(names, i));
        std::size_t size = std::min(std::strlen(name), END - position);
        std::memcpy(slot->text + position, name, size);
        position += size;
        slot->text[position] = '\0';
    }
}

// Lists one vector; false, logged, when its names can't be had.
bool AddVector(KnfParamList keys, i64 vector, NameSlot *slot) {
    LocalList names;
    VaryingKey key(keys, vector);
    if (key.status != 0) {
        LogStatus(0, key.status, "Unable to add param for interrupt %Ld\n", vector);
        return false;
    }
    if (KnfStatus status = KNF_GetInstanceListAlloc(KNF_NODE_INTR_NAMES, keys, &names.list)) {
        LogStatus(0, status, "Unable to get names for interrupt %Ld\n", vector);
        return false;
    }
    FillSlot(names.list, slot);
    return true;
}

// False, logged, when the listing failed. An empty listing is none.
bool BuildList() {
    LocalList vectors;
    if (KnfStatus status = KNF_GetInstanceListAlloc(KNF_NODE_INTR_LIST, nullptr, &vectors.list)) {
        LogStatus(0, status, "Unable to build interrupt list\n");
        intrCount = -1;
        return false;
    }
    intrCount = static_cast<i32>(KNF_ParamListUsedCount(vectors.list));
    if (intrCount > 0) {
        intrNames = AllocArray<NameSlot>(static_cast<std::size_t>(intrCount), "Interrupt Names");
        intrList = AllocArray<i64>(static_cast<std::size_t>(intrCount), "Interrupt List");
    }
    LocalList keys(KNF_ParamListCreate(KNF_INSTANCE_LIST, 1));
    for (i32 i = 0; i < intrCount; i++) {
        intrList[i] = KNF_ParamGetInt(KNF_ParamListGetParam(vectors.list, static_cast<u32>(i)));
        if (!AddVector(keys.list, intrList[i], &intrNames[i])) {
            intrCount = -1;
            return false;
        }
    }
    return true;
}

// The mask of one NIC must not take the vectors of another whose name goes on with a digit.
bool Matches(const NameSlot &slot, const char *mask) {
    const char *found = std::strstr(slot.text, mask);
    if (found == nullptr) {
        return false;
    }
    char behind = found[std::strlen(mask)];
    return behind < '0' || behind > '9';
}

// Adds up one vector's counters over all pcpus. Its number is in the list already.
KnfStatus SumVector(KnfParamList args, i64 vector, u64 *count, u64 *used) {
    for (u32 cpu = 0; cpu < NUM_PCPUS; cpu++) {
        VaryingKey key(args, i64{cpu});
        if (key.status != 0) {
            LogStatus(0, key.status, "Unable to add param: CPU %d for intr stats\n", static_cast<i32>(cpu));
            return key.status;
        }
        IntrStats stats = {};
        if (KnfStatus status = NodeGet(KNF_NODE_INTR_STATS, args, &stats)) {
            LogStatus(0, status, "Unable to read stats Intr:%Ld CPU %d\n", vector, static_cast<i32>(cpu));
            return status;
        }
        *count += stats.count;
        *used += stats.usedTime;
    }
    return 0;
}

}  // namespace

Interrupts *IntrCreate(const char *mask) {
    if (intrCount < 0 || (intrCount == 0 && !BuildList())) {
        return nullptr;
    }
    auto matches = [mask](const NameSlot &slot) { return Matches(slot, mask); };
    auto vectorCount = static_cast<i32>(std::count_if(intrNames, intrNames + intrCount, matches));
    if (vectorCount == 0) {
        LogMsg(1, "No interrupts found for %s mask\n", mask);
        return nullptr;
    }
    LogMsg(1, "%d intr vector found for %s mask\n", vectorCount, mask);
    Interrupts *intr = AllocRecord<Interrupts>("Interrupts");
    intr->vectorCount = vectorCount;
    intr->vectors = AllocArray<i64>(static_cast<std::size_t>(vectorCount), "Interrupt Vectors");
    i64 *next = intr->vectors;
    for (i32 i = 0; i < intrCount; i++) {
        if (matches(intrNames[i])) {
            *next++ = intrList[i];
        }
    }
    return intr;
}

KnfStatus IntrRead(Interrupts *intr, bool first) {
    LocalList args(KNF_ParamListCreate(KNF_INSTANCE_LIST, 2));
    if (args.list == nullptr) {
        LogMsg(0, "Unable to allocate mem for Interrupt argList\n");
        return KNF_FAILURE;
    }
    u64 *count = first ? &intr->countPrev : &intr->countCurr;
    u64 *used = first ? &intr->usedPrev : &intr->usedCurr;
    *count = 0;
    *used = 0;
    for (i32 i = 0; i < intr->vectorCount; i++) {
        i64 vector = intr->vectors[i];
        VaryingKey key(args.list, vector);
        if (key.status != 0) {
            LogStatus(0, key.status, "Unable to add param: intr %Ld for stats\n", vector);
            return key.status;
        }
        if (KnfStatus status = SumVector(args.list, vector, count, used)) {
            return status;
        }
    }
    return 0;
}

KnfStatus IntrPrint(Interrupts *intr, f32 elapsed, ReportBuf *report) {
    auto used = static_cast<f32>(intr->usedCurr - intr->usedPrev);
    ReportPrintf(report, ",\n  \"intr\": {\"count\": %.0f, \"used\": %.2f}",
                 Rate(intr->countCurr - intr->countPrev, elapsed), Quotient(used, 10000.0 * elapsed));
    intr->countPrev = intr->countCurr;
    intr->usedPrev = intr->usedCurr;
    return 0;
}

void IntrCleanup(Interrupts *intr) {
    if (intr != nullptr) {
        std::free(intr->vectors);
        std::free(intr);
    }
}
