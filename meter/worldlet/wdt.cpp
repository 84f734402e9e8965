#include "meter/worldlet/wdt.h"

#include "meter/support/alloc.h"
#include "meter/support/log.h"
#include "meter/support/node.h"
#include "meter/support/number.h"

#include <cstdlib>
#include <cstring>
#include <utility>

namespace {

constexpr u32 KNF_NODE_WORLDLET_LIST = 1476;
constexpr u32 KNF_NODE_WORLDLET_STATS = 1478;
constexpr u32 NO_WORLDLET = 0xffffffff;

KnfParamList wdtList = nullptr;   // all worldlets of the host; asked for again only while it is empty
const char **wdtNames = nullptr;  // entry 0: the name under test; behind it the matches. The texts are wdtList's
i32 wdtNameSize = 0;              // entries of wdtNames; -1 for good once the listing failed

bool Refresh() {
    DropList(&wdtList);
    if (KnfStatus status = KNF_GetInstanceListAlloc(KNF_NODE_WORLDLET_LIST, nullptr, &wdtList)) {
        LogStatus(0, status, "Unable to build worldlet list\n");
        wdtNameSize = -1;
        return false;
    }
    auto size = static_cast<i32>(KNF_ParamListUsedCount(wdtList) + 1);
    if (size > wdtNameSize) {
        std::free(static_cast<void *>(wdtNames));
        wdtNameSize = size;
        wdtNames = AllocArray<const char *>(static_cast<std::size_t>(size), "Worldlet Names");
    }
    return true;
}

bool Matches(const char *name, const char *mask) {
    const char *found = std::strstr(name, mask);
    if (found == nullptr || std::strstr(name, "backup") != nullptr) {
        return false;
    }
    char behind = found[std::strlen(mask)];
    return behind < '0' || behind > '9';
}

// Leaves the matches in wdtNames from entry 1 on and returns their number.
i32 FindMatches(const char *mask) {
    i32 matches = 0;
    u32 count = KNF_ParamListUsedCount(wdtList);
    for (u32 i = 0; i < count; i++) {
        if (KNF_ParamListGetString(wdtList, i, &wdtNames[0]) == 0 && Matches(wdtNames[0], mask)) {
            matches++;
            wdtNames[matches] = wdtNames[0];
        }
    }
    return matches;
}

bool AddWorldlet(Wdt *wdt, i32 index, const char *name) {
    std::size_t size = std::strlen(name) + 1;
    wdt->names[index] = static_cast<char *>(AllocOrPanic(size, "Per-Wdt Name"));
    std::memcpy(wdt->names[index], name, size);
    wdt->params[index] = KNF_ParamListCreate(KNF_INSTANCE_LIST, 1);
    KnfStatus status = KNF_FAILURE;
    if (wdt->params[index] != nullptr) {
        status = KNF_ParamListAddString(wdt->params[index], name);
    }
    if (status != 0) {
        LogStatus(0, status, "Unable to create param list for %s wdt\n", name);
    }
    return status == 0;
}

struct Affinity {
    const char *type;
    u32 value;
};

Affinity AffinityOf(const WdtStats &stats) {
    if (stats.affinityVcpu != 0) {
        return {"vcpu", stats.affinityVcpu};
    }
    if (stats.affinityWdt != NO_WORLDLET) {
        return {"wdt", stats.affinityWdt};
    }
    return {"pcpu", stats.affinityPcpu};
}

double TimePercent(u64 nanoseconds, f32 scale) {
    return Quotient(static_cast<double>(nanoseconds) * 100.0, scale);
}

void PrintOne(const char *name, const WdtStats &cur, const WdtStats &prev, f32 elapsed, ReportBuf *report) {
    auto scale = static_cast<f32>(elapsed * 1000000000.0);
    ReportPrintf(report,
                 "{\"used\": %.2f, \"ready\": %.2f, \"wait\": %.2f, \"runct\": %.0f, \"remoteactct\": %.0f, "
                 "\"migct\": %.0f, \"overrunct\": %.0f, ",
                 TimePercent(cur.usedTime - prev.usedTime, scale), TimePercent(cur.readyTime - prev.readyTime, scale),
                 TimePercent(cur.waitTime - prev.waitTime, scale), Rate(cur.runct - prev.runct, elapsed),
                 Rate(cur.remoteactct - prev.remoteactct, elapsed), Rate(cur.migct - prev.migct, elapsed),
                 Rate(cur.overrunct - prev.overrunct, elapsed));
    Affinity affinity = AffinityOf(cur);
    ReportPrintf(report, "\"afftype\": \"%s\", \"affval\": %d, \"name\": \"%s\"}", affinity.type,
                 static_cast<i32>(affinity.value), name);
}

}  // namespace

Wdt *WdtCreate(const char *mask) {
    if (wdtNameSize < 0 || (KNF_ParamListUsedCount(wdtList) == 0 && !Refresh())) {
        return nullptr;
    }
    i32 matches = FindMatches(mask);
    if (matches == 0) {
        LogMsg(1, "No worldlet matches found for %s mask\n", mask);
        return nullptr;
    }
    auto count = static_cast<std::size_t>(matches);
    Wdt *wdt = AllocRecord<Wdt>("Wdt Structure");
    wdt->count = matches;
    wdt->names = AllocArray<char *>(count, "Wdt name array");
    wdt->params = AllocArray<KnfParamList>(count, "Param List for wdt");
    wdt->statsCur = AllocArray<WdtStats>(count, "Worldlet stats");
    wdt->statsPrev = AllocArray<WdtStats>(count, "Worldlet stats");
    for (i32 i = 0; i < matches; i++) {
        const char *name = wdtNames[i + 1];
        if (!AddWorldlet(wdt, i, name)) {
            WdtCleanup(wdt);
            return nullptr;
        }
        LogMsg(1, "Added %s wdt for %s mask\n", name, mask);
    }
    return wdt;
}

KnfStatus WdtRead(Wdt *wdt, bool first) {
    WdtStats *stats = first ? wdt->statsPrev : wdt->statsCur;
    for (i32 i = 0; i < wdt->count; i++) {
        if (KnfStatus status = NodeGet(KNF_NODE_WORLDLET_STATS, wdt->params[i], &stats[i])) {
            LogStatus(0, status, "%s wdt: stats read error. Cleaning up wdt\n", wdt->names[i]);
            return status;
        }
    }
    return 0;
}

KnfStatus WdtPrint(Wdt *wdt, const PortPrefs * /*prefs*/, f32 elapsed, ReportBuf *report) {
    ReportPrintf(report, ",\n  \"wdt\": [");
    for (i32 i = 0; i < wdt->count; i++) {
        ReportPrintf(report, i == 0 ? "\n    " : ",\n    ");
        PrintOne(wdt->names[i], wdt->statsCur[i], wdt->statsPrev[i], elapsed, report);
    }
    ReportPrintf(report, " ]");
    std::swap(wdt->statsCur, wdt->statsPrev);
    return 0;
}

void WdtCleanup(Wdt *wdt) {
    if (wdt == nullptr) {
        return;
    }
    for (i32 i = 0; i < wdt->count; i++) {
        std::free(wdt->names[i]);
        DropList(&wdt->params[i]);
    }
    std::free(static_cast<void *>(wdt->names));
    std::free(static_cast<void *>(wdt->params));
    std::free(wdt->statsCur);
    std::free(wdt->statsPrev);
    std::free(wdt);
}
