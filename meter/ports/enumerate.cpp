#include "meter/ports/enumerate.h"

#include "meter/ports/port.h"
#include "meter/support/log.h"
#include "meter/support/node.h"
#include "meter/support/termination.h"

namespace {

constexpr u32 KNF_NODE_SWITCH_LIST = 245;
constexpr u32 KNF_NODE_SWITCH_PORT_LIST = 264;

// One line, behind the header when it is the first of the listing. A port that nobody may watch has none.
void ListPort(u64 portNum, bool *headed, ReportBuf *report) {
    PortInfo info = {};
    if (GetPortsInfo(portNum, &info) != 0) {
        return;
    }
    if (!*headed) {
        ReportPrintf(report, "%-16s Type SubType %-16s %-18s %s\n", "PortNum", "SwitchName", "MACAddress",
                     "ClientName");
        *headed = true;
    }
    ReportPrintf(report, "%-16Ld %4u %7u %-16s %-18s %s\n", static_cast<i64>(info.portNum), info.type.type,
                 info.type.subType, info.type.switchName, info.macText, info.status.clientName);
}

}  // namespace

KnfParamList GetSwitchList() {
    KnfParamList list = nullptr;
    if (KnfStatus status = KNF_GetInstanceListAlloc(KNF_NODE_SWITCH_LIST, nullptr, &list)) {
        LogStatus(0, status, "Unable to read switch list\n");
        return nullptr;
    }
    return list;
}

KnfParamList GetSwitchPorts(const char *switchName) {
    static KnfParamList switchParam = nullptr;  // made on first use and kept; empty between calls
    if (switchParam == nullptr) {
        switchParam = KNF_ParamListCreate(KNF_INSTANCE_LIST, 1);
    }
    if (switchParam == nullptr) {
        LogMsg(0, "Unable to create switch param to list ports\n");
        return nullptr;
    }
    VaryingKey name(switchParam, switchName);
    if (name.status != 0) {
        LogMsg(0, "Unable to add swich name to param\n");
        return nullptr;
    }
    KnfParamList list = nullptr;
    if (KnfStatus status = KNF_GetInstanceListAlloc(KNF_NODE_SWITCH_PORT_LIST, switchParam, &list)) {
        LogStatus(0, status, "Unable to read port list for %s switch\n", switchName);
        KNF_ParamListDestroy(list);
        return nullptr;
    }
    return list;
}

void ListPorts(ReportBuf *report) {
    LocalList switches(GetSwitchList());
    bool headed = false;
    for (u32 i = 0; i < KNF_ParamListUsedCount(switches.list); i++) {
        LocalList ports(GetSwitchPorts(KNF_ParamGetString(KNF_ParamListGetParam(switches.list, i))));
        for (u32 j = 0; j < KNF_ParamListUsedCount(ports.list) && terminateRequested == 0; j++) {
            ListPort(static_cast<u64>(KNF_ParamGetInt(KNF_ParamListGetParam(ports.list, j))), &headed, report);
        }
    }
}
