#include "meter/vnic/vnic.h"

#include "meter/ports/port_record.h"
#include "meter/support/alloc.h"
#include "meter/support/log.h"
#include "meter/support/node.h"

#include <cstdlib>

namespace {

constexpr u32 KNF_NODE_PORT_PARLAN2_STATS = 270;
constexpr u32 KNF_NODE_PORT_TXWDT_STATS = 275;
constexpr u32 KNF_NODE_PORT_COALESCE_INFO = 278;
constexpr u32 KNF_NODE_PORT_COALESCE_SCHEME2 = 279;
constexpr u32 KNF_NODE_PORT_COALESCE_RX = 280;
constexpr u32 KNF_NODE_PORT_COALESCE_TX = 281;
constexpr u32 KNF_NODE_PORT_COALESCE_TXCOMP = 282;
constexpr u32 KNF_NODE_PORT_PARLAN3_TX_SUMMARY = 341;
constexpr u32 KNF_NODE_PORT_PARLAN3_RX_SUMMARY = 342;
constexpr u32 KNF_NODE_PORT_PARLAN3_RXQUEUE_STATUS = 354;

constexpr u32 PARLAN2 = 8;
constexpr u32 PARLAN3 = 9;

// A read that the port can do without: its failure clears the bit that asked for it.
template <typename Record>
void ReadTolerated(Port *port, u32 node, PortPrefs bit, Record *record) {
    if (KnfStatus status = NodeUpdate(node, port->portParams, record)) {
        LogStatus(1, status, "%s", "");
        *port->prefs &= ~bit;
    }
}

// A failure of the first read does not stop the others, which go by the scheme of the last good one.
void ReadCoalescing(Port *port) {
    Vnic *vnic = port->vnic;
    ReadTolerated(port, KNF_NODE_PORT_COALESCE_INFO, PREF_COALESCE, &vnic->coalesceInfo);
    if (vnic->coalesceInfo.scheme == 1) {
        ReadTolerated(port, KNF_NODE_PORT_COALESCE_RX, PREF_COALESCE, &vnic->coalesceRx);
        ReadTolerated(port, KNF_NODE_PORT_COALESCE_TX, PREF_COALESCE, &vnic->coalesceTx);
        ReadTolerated(port, KNF_NODE_PORT_COALESCE_TXCOMP, PREF_COALESCE, &vnic->coalesceTxComp);
    } else if (vnic->coalesceInfo.scheme == 2) {
        ReadTolerated(port, KNF_NODE_PORT_COALESCE_SCHEME2, PREF_COALESCE, &vnic->coalesceScheme2);
    }
}

template <typename Record>
KnfStatus ReadStats(const Port *port, u32 node, KnfParamList params, Record *record, const char *stage) {
    KnfStatus status = NodeGet(node, params, record);
    if (status != 0) {
        LogStatus(0, status, "Port %Ld Stat \"%s\" read error. Stats Disabled\n", static_cast<i64>(port->info.portNum),
                  stage);
    }
    return status;
}

KnfStatus ReadRxQueue(Port *port) {
    VaryingKey queue(port->queueParams, i64{0});
    if (queue.status != 0) {
        LogMsg(0, "Unable to set 0 in queueParams for port %Ld\n", static_cast<i64>(port->info.portNum));
        return 0;
    }
    return ReadStats(port, KNF_NODE_PORT_PARLAN3_RXQUEUE_STATUS, port->queueParams, &port->vnic->parlan3Stats->rxQueue,
                     "parlan3 rxqueue0 status");
}

KnfStatus ReadParlan3(Port *port, bool first) {
    Parlan3Stats *stats = port->vnic->parlan3Stats;
    if (KnfStatus status = ReadRxQueue(port)) {
        return status;
    }
    if (KnfStatus status = ReadStats(port, KNF_NODE_PORT_PARLAN3_RX_SUMMARY, port->portParams,
                                     first ? &stats->rxPrev : &stats->rxCur, "parlan3 rx summary")) {
        return status;
    }
    return ReadStats(port, KNF_NODE_PORT_PARLAN3_TX_SUMMARY, port->portParams, first ? &stats->txPrev : &stats->txCur,
                     "parlan3 tx summary");
}

}  // namespace

Vnic *VnicCreate(u32 subType, const PortPrefs *prefs) {
    if (subType != PARLAN2 && subType != PARLAN3 && (*prefs & PREF_COALESCE) == 0) {
        LogMsg(2, "No vnic stats for nic of type %d\n", static_cast<i32>(subType));
        return nullptr;
    }
    Vnic *vnic = AllocRecord<Vnic>("Vnic struct");
    if (subType == PARLAN2) {
        vnic->parlan2Stats = AllocRecord<Parlan2Stats>("parlan2 stats");
    } else if (subType == PARLAN3) {
        vnic->parlan3Stats = AllocRecord<Parlan3Stats>("parlan3 stats");
    }
    return vnic;
}

KnfStatus VnicRead(Port *port, bool first) {
    if ((*port->prefs & PREF_COALESCE) != 0) {
        ReadCoalescing(port);
    }
    if ((*port->prefs & PREF_COALESCE_DETAIL) != 0) {
        ReadTolerated(port, KNF_NODE_PORT_TXWDT_STATS, PREF_COALESCE_DETAIL, &port->vnic->txWdtStats);
    }
    if ((*port->prefs & PREF_VNIC) == 0) {
        return 0;
    }
    if (Parlan2Stats *stats = port->vnic->parlan2Stats) {
        return ReadStats(port, KNF_NODE_PORT_PARLAN2_STATS, port->portParams, first ? &stats->prev : &stats->cur,
                         "parlan2 stats");
    }
    return port->vnic->parlan3Stats != nullptr ? ReadParlan3(port, first) : 0;
}

void VnicCleanup(Vnic *vnic) {
    if (vnic != nullptr) {
        std::free(vnic->parlan2Stats);
        std::free(vnic->parlan3Stats);
        std::free(vnic);
    }
}
