#include "meter/ports/port.h"

#include "meter/cpu/vcpu.h"
#include "meter/hoststack/hostnic.h"
#include "meter/pnic/physnic.h"
#include "meter/ports/histo.h"
#include "meter/support/alloc.h"
#include "meter/support/elapsed.h"
#include "meter/support/log.h"
#include "meter/support/number.h"
#include "meter/support/run.h"
#include "meter/vnic/vnic.h"
#include "meter/worldlet/wdt.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <utility>

PortPrefs physnicPrefs = PREF_QUEUE | PREF_INTR | PREF_VNIC | PREF_WDT;
PortPrefs vnicPrefs = PREF_VNIC | PREF_WDT;
PortPrefs hostNicPrefs = PREF_VNIC | PREF_WDT | PREF_QUEUE_DETAIL;
PortPrefs nullPrefs = 0;

namespace {

constexpr u32 KNF_NODE_PORT_TYPE = 368;
constexpr u32 KNF_NODE_PORT_STATUS = 266;
constexpr u32 KNF_NODE_PORT_CLIENT_STATS = 269;

// The lists of GetPortsInfo, made on first use and kept. Both are empty between calls.
KnfParamList statusParams = nullptr;
KnfParamList typeParams = nullptr;

bool CreateInfoLists(u64 portNum) {
    const char *failed = nullptr;
    if (statusParams == nullptr && (statusParams = KNF_ParamListCreate(KNF_INSTANCE_LIST, 2)) == nullptr) {
        failed = "Allocating mem for port params";
    } else if (typeParams == nullptr && (typeParams = KNF_ParamListCreate(KNF_INSTANCE_LIST, 1)) == nullptr) {
        failed = "Allocating mem for openPorts param";
    }
    if (failed != nullptr) {
        LogMsg(0, "GetPortsInfo %Ld %s\n", static_cast<i64>(portNum), failed);
    }
    return failed == nullptr;
}

bool IsManagement(u32 type) {
    return type == 10 || type < 2;
}

// The keys of all per-port nodes.
KnfStatus AddPortKeys(KnfParamList list, const PortIdentity &info) {
    KnfStatus status = KNF_ParamListAddString(list, info.switchName);
    return status != 0 ? status : KNF_ParamListAddInt(list, static_cast<i64>(info.portNum));
}

// Reads both records. On a failure of the library `*stage` says where; a refused port leaves it null.
KnfStatus ReadInfo(PortInfo *info, const char **stage) {
    auto portKey = static_cast<i64>(info->portNum);
    auto failedAt = [stage](KnfStatus status, const char *text) {
        *stage = status != 0 ? text : nullptr;
        return status;
    };
    if (KnfStatus status = failedAt(KNF_ParamListAddInt(typeParams, portKey), "Adding port num")) {
        return status;
    }
    if (KnfStatus status = failedAt(NodeGet(KNF_NODE_PORT_TYPE, typeParams, &info->type), "Port Type")) {
        return status;
    }
    if (IsManagement(info->type.type)) {
        LogMsg(1, "Mgmt Port %Ld will not be displayed\n", portKey);
        return KNF_FAILURE;
    }
    if (KnfStatus status =
            failedAt(KNF_ParamListAddString(statusParams, info->type.switchName), "Adding switch name to portParams")) {
        return status;
    }
    if (KnfStatus status = failedAt(KNF_ParamListAddInt(statusParams, portKey), "Adding port num")) {
        return status;
    }
    return failedAt(NodeGet(KNF_NODE_PORT_STATUS, statusParams, &info->status), "Port Status");
}

// Room for a longer name. Without memory for it the port keeps the one that it had: no pass ends the run.
void GrowName(u32 size, PortIdentity *info) {
    char *name = static_cast<char *>(std::malloc(size));
    if (name == nullptr) {
        LogMsg(0, "Allocating %d bytes for %s failed\n", static_cast<i32>(size), "Client Name");
        return;
    }
    std::free(info->clientName);
    info->clientName = name;
    info->clientRoom = size;
}

void KeepStatus(const PortStatusRecord &status, PortIdentity *info) {
    auto size = static_cast<u32>(std::strlen(status.clientName) + 1);
    if (size > info->clientRoom) {
        GrowName(size, info);
    }
    if (size <= info->clientRoom) {
        std::memcpy(info->clientName, status.clientName, size);
    }
    info->statusFlags = status.statusFlags;
    info->rxMode = status.rxMode;
}

void KeepInfo(const PortInfo &from, PortIdentity *info) {
    std::size_t size = std::strlen(from.type.switchName) + 1;
    info->portNum = from.portNum;
    info->type = from.type.type;
    info->subType = from.type.subType;
    info->switchName = static_cast<char *>(AllocOrPanic(size, "Switch Name"));
    std::memcpy(info->switchName, from.type.switchName, size);
    std::memcpy(info->macText, from.macText, sizeof info->macText);
    info->clientRoom = static_cast<u32>(std::strlen(from.status.clientName) + 1);
    info->clientName = static_cast<char *>(AllocOrPanic(info->clientRoom, "Client Name"));
    KeepStatus(from.status, info);
}

// Lists and keys of a new port; false, logged, when one can't be made.
bool CreateLists(Port *port) {
    auto portNum = static_cast<i64>(port->info.portNum);
    port->portParams = KNF_ParamListCreate(KNF_INSTANCE_LIST, 2);
    if (port->portParams == nullptr) {
        LogMsg(0, "Unable to create instance list\n");
        return false;
    }
    if (AddPortKeys(port->portParams, port->info) != 0) {
        LogMsg(0, "Unable to populate knf instance param for port %Ld\n", portNum);
        return false;
    }
    port->queueParams = KNF_ParamListCreate(KNF_INSTANCE_LIST, 3);
    if (port->queueParams == nullptr) {
        LogMsg(0, "Unable to create port queue params list\n");
        return false;
    }
    if (AddPortKeys(port->queueParams, port->info) != 0) {
        LogMsg(0, "Unable to populate knf queue param for port %Ld\n", portNum);
        return false;
    }
    return true;
}

PortPrefs DefaultPrefs(u32 type) {
    switch (type) {
    case PORT_TYPE_HOST_NIC:
        return hostNicPrefs;
    case PORT_TYPE_UPLINK:
        return physnicPrefs;
    case PORT_TYPE_VNIC:
        return vnicPrefs;
    default:
        return nullPrefs;
    }
}

// At most one NIC companion, by the port's type.
void CreateNic(Port *port) {
    bool nic = (*port->prefs & PREF_VNIC) != 0;
    u32 type = port->info.type;
    if (nic && type == PORT_TYPE_UPLINK) {
        port->physnic = PhysNicCreate(port->info.clientName, port->prefs);
    } else if (nic && type == PORT_TYPE_HOST_NIC) {
        port->hostNic = HostNicCreate();
    } else if (type == PORT_TYPE_VNIC && (*port->prefs & (PREF_VNIC | PREF_COALESCE)) != 0) {
        port->vnic = VnicCreate(port->info.subType, port->prefs);
    }
}

// The port's worldlets are those that bear the name of its NIC, or the world leader of its virtual machine.
void CreateWorldlets(Port *port, u32 worldLeader) {
    char mask[128] = "";
    u32 type = port->info.type;
    if (type == PORT_TYPE_UPLINK || type == PORT_TYPE_HOST_NIC) {
        Str_Snprintf(mask, sizeof mask, "%s", port->info.clientName);
    } else if (type == PORT_TYPE_VNIC) {
        Str_Snprintf(mask, sizeof mask, "NetWdt-Async-%u", worldLeader);
    }
    if (mask[0] != '\0') {
        port->wdt = WdtCreate(mask);
    }
}

// Null companions are no failure. False, logged, when the histograms' argument list can't be made.
bool CreateCompanions(Port *port, u32 worldLeader) {
    if (worldLeader != 0) {
        port->numVcpus = VcpusCreate(worldLeader, (*port->prefs & PREF_VCPU_HISTO) != 0, &port->vcpus);
    }
    CreateNic(port);
    if ((*port->prefs & PREF_WDT) != 0) {
        CreateWorldlets(port, worldLeader);
    }
    if ((*port->prefs & (PREF_HISTO | PREF_HISTO_ARGS)) != 0) {
        port->histoParams = KNF_ParamListCreate(KNF_INPUT_LIST, 2);
        if (port->histoParams == nullptr) {
            LogMsg(0, "Unable to create input arguments for histograms\n");
            return false;
        }
    }
    if ((*port->prefs & PREF_HISTO) != 0) {
        HistoAlloc(port);
    }
    return true;
}

// Undoes a creation that failed half-way.
void Unwind(Port *port) {
    DropList(&port->portParams);
    DropList(&port->queueParams);
    DropList(&port->histoParams);
    VcpusCleanup(port->vcpus, port->numVcpus);
    HistoFree(port);
    VnicCleanup(port->vnic);
    HostNicCleanup(port->hostNic);
    PhysNicCleanup(port->physnic);
    WdtCleanup(port->wdt);
    std::free(port->info.switchName);
    std::free(port->info.clientName);
    std::free(port->curStats);
    std::free(port->prevStats);
    std::free(port->prefs);
    std::free(port);
}

KnfStatus Disable(Port *port, KnfStatus status, const char *stage) {
    port->active = 0;
    LogStatus(0, status, "Port %Ld Stat \"%s\" read error. Stats Disabled\n", static_cast<i64>(port->info.portNum),
              stage);
    return status;
}

bool HasHistos(const Port *port) {
    return (*port->prefs & PREF_HISTO) != 0 && port->histoParams != nullptr;
}

// The port's one NIC companion. Only a virtual NIC's failure is the port's, with a status for it; the others go alone.
KnfStatus ReadNic(Port *port, bool first) {
    if (port->vnic != nullptr) {
        return VnicRead(port, first);
    }
    if (port->hostNic != nullptr) {
        if (HostNicRead(port->hostNic, first) != 0) {
            HostNicCleanup(port->hostNic);
            port->hostNic = nullptr;
        }
    } else if (port->physnic != nullptr && PhysNicRead(port->physnic, port->prefs, first) != 0) {
        PhysNicCleanup(port->physnic);
        port->physnic = nullptr;
    }
    return 0;
}

void PrintNic(Port *port, ReportBuf *report) {
    if (port->vnic != nullptr) {
        VnicPrint(port->vnic, port->prefs, port->elapsed, report);
    } else if (port->hostNic != nullptr) {
        HostNicPrint(port->hostNic, port->elapsed, report);
    } else if (port->physnic != nullptr) {
        PhysNicPrint(port->physnic, port->prefs, port->elapsed, report);
    }
}

f32 Divisor(const Port *port) {
    if (absCounts != 0) {
        return 1.0F;
    }
    return cacheEnabled != 0 ? cacheElapsedTime : ElapsedSecs(port->prevTime, port->curTime);
}

// The differences of one direction. Signed, so that a counter that went backwards shows as a negative figure.
struct Traffic {
    i64 packets;
    i64 bytes;
    i64 errors;
};

double ClientMegabits(const Traffic &traffic, f32 elapsed) {
    auto bits = static_cast<i64>(static_cast<u64>(traffic.bytes) * 8);
    return Megabits(static_cast<double>(bits), elapsed);
}

u32 ClientSize(const Traffic &traffic) {
    return static_cast<u32>(SignedMean(traffic.bytes, traffic.packets));
}

void PrintClientStats(const Port *port, f32 elapsed, ReportBuf *report) {
    const PortClientStats *c = port->curStats;
    const PortClientStats *p = port->prevStats;
    Traffic tx = {SignedDelta(c->txPkts + c->txPktsExtra, p->txPkts + p->txPktsExtra),
                  SignedDelta(c->txBytes + c->txBytesExtra, p->txBytes + p->txBytesExtra),
                  SignedDelta(c->txDropped, p->txDropped)};
    Traffic rx = {SignedDelta(c->rxPkts, p->rxPkts), SignedDelta(c->rxBytes, p->rxBytes),
                  SignedDelta(c->rxDropped, p->rxDropped)};
    ReportPrintf(report, ",\n  \"txpps\": %.0f, \"txmbps\": %.1f, \"txsize\": %u, \"txeps\": %.2f, ",
                 SignedRate(tx.packets, elapsed), ClientMegabits(tx, elapsed), ClientSize(tx),
                 SignedRate(tx.errors, elapsed));
    ReportPrintf(report, "\"rxpps\": %.0f, \"rxmbps\": %.1f, \"rxsize\": %u, \"rxeps\": %.2f",
                 SignedRate(rx.packets, elapsed), ClientMegabits(rx, elapsed), ClientSize(rx),
                 SignedRate(rx.errors, elapsed));
}

}  // namespace

KnfStatus GetPortsInfo(u64 portNum, PortInfo *info) {
    info->portNum = portNum;
    KnfStatus status = KNF_FAILURE;
    if (CreateInfoLists(portNum)) {
        const char *stage = nullptr;
        status = ReadInfo(info, &stage);
        if (stage != nullptr) {
            LogStatus(0, status, "GetPortsInfo %Ld %s\n", static_cast<i64>(portNum), stage);
        }
    }
    if (status == 0) {
        MacToText(info->type.type == PORT_TYPE_VNIC ? info->status.vnicMac : info->status.mac, info->macText);
    }
    // Removing from an empty list does nothing, so what was added need not be counted.
    KNF_ParamListRemoveLastParam(statusParams);
    KNF_ParamListRemoveLastParam(statusParams);
    KNF_ParamListRemoveLastParam(typeParams);
    return status;
}

void MacToText(const u8 *mac, char *text) {
    char octets[6 * 3 + 1];  // the last octet's colon and terminator need one byte more than the text has
    for (std::size_t i = 0; i < 6; i++) {
        Str_Snprintf(octets + 3 * i, 4, "%02x:", mac[i]);
    }
    octets[17] = '\0';
    std::copy_n(octets, 18, text);
}

Port *PortCreate(u64 portNum, const PortPrefs *prefs) {
    Port *port = AllocRecord<Port>("Port");
    port->curStats = AllocRecord<PortClientStats>("Client Stats");
    port->prevStats = AllocRecord<PortClientStats>("Client Stats");
    port->prefs = AllocRecord<PortPrefs>("PortPrefs");
    static PortInfo info;  // whole records, for the time of a creation
    if (GetPortsInfo(portNum, &info) != 0) {
        LogMsg(1, "Unable to get port info for port %Ld\n", static_cast<i64>(portNum));
        Unwind(port);
        return nullptr;
    }
    LogMsg(1, "Port %Lu Switch %s Client:%s Type: %d SubType: %d\n", portNum, info.type.switchName,
           info.status.clientName, static_cast<i32>(info.type.type), static_cast<i32>(info.type.subType));
    *port->prefs = prefs != nullptr ? *prefs : DefaultPrefs(info.type.type);
    KeepInfo(info, &port->info);
    if (!CreateLists(port) || !CreateCompanions(port, info.status.worldLeader)) {
        Unwind(port);
        return nullptr;
    }
    port->active = 1;
    return port;
}

KnfStatus PortRead(Port *port, bool first) {
    if (port->active == 0) {
        return 0;
    }
    if (port->numVcpus != 0 && port->vcpus != nullptr && VcpusRead(port->vcpus, port->numVcpus, first) != 0) {
        VcpusCleanup(port->vcpus, port->numVcpus);
        port->vcpus = nullptr;
        port->numVcpus = 0;
    }
    static PortStatusRecord record;  // one for all ports, which keep little of it
    if (KnfStatus status = NodeGet(KNF_NODE_PORT_STATUS, port->portParams, &record)) {
        return Disable(port, status, "portStatus");
    }
    KeepStatus(record, &port->info);
    PortClientStats *stats = first ? port->prevStats : port->curStats;
    if (KnfStatus status = NodeGet(KNF_NODE_PORT_CLIENT_STATS, port->portParams, stats)) {
        return Disable(port, status, "clientStats");
    }
    if (KnfStatus status = ReadNic(port, first)) {
        return Disable(port, status, "vnic stats");
    }
    if ((*port->prefs & PREF_WDT) != 0 && port->wdt != nullptr && WdtRead(port->wdt, first) != 0) {
        WdtCleanup(port->wdt);
        port->wdt = nullptr;
    }
    if (HasHistos(port)) {
        const char *stage = nullptr;
        if (KnfStatus status = HistoRead(port, first, &stage)) {
            return Disable(port, status, stage);
        }
    }
    gettimeofday(first ? &port->prevTime : &port->curTime, nullptr);
    return 0;
}

KnfStatus PortPrint(Port *port, ReportBuf *report) {
    if (port->active == 0) {
        return 0;
    }
    f32 elapsed = Divisor(port);
    const PortIdentity &info = port->info;
    ReportPrintf(report,
                 "\"name\": \"%s\", \"switch\": \"%s\", \"id\": %Ld, \"mac\": \"%s\", \"rxmode\": %d, "
                 "\"uplink\": \"%s\"",
                 info.clientName, info.switchName, static_cast<i64>(info.portNum), info.macText,
                 static_cast<i32>(info.rxMode), (info.statusFlags & PORT_STATUS_UPLINK) != 0 ? "true" : "false");
    PrintClientStats(port, elapsed, report);
    port->elapsed = elapsed;
    port->prevTime = port->curTime;
    std::swap(port->curStats, port->prevStats);
    if (port->vcpus == nullptr && *port->prefs == nullPrefs) {
        return 0;
    }
    PrintNic(port, report);
    if ((*port->prefs & PREF_WDT) != 0 && port->wdt != nullptr) {
        WdtPrint(port->wdt, port->prefs, elapsed, report);
    }
    if (port->vcpus != nullptr && port->numVcpus != 0) {
        VcpusPrint(port->vcpus, port->numVcpus, elapsed, report);
    }
    if (HasHistos(port)) {
        HistoPrint(port, report);
    }
    return 0;
}
