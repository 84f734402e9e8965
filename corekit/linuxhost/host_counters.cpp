#include "corekit/linuxhost/host.h"
#include "corekit/linuxhost/host_nodes.h"
#include "corekit/linuxhost/netlink/counters.h"

#include <algorithm>
#include <linux/netlink.h>
#include <unistd.h>

namespace {

constexpr u32 DUMP_SHARE = 8;  // a dump pays from one interface in so many on

bool BeganAgain(const LinkCounters &was, const LinkCounters &is) {
    bool counted = false;
    for (auto count :
         {&LinkCounters::rxPackets, &LinkCounters::txPackets, &LinkCounters::rxBytes, &LinkCounters::txBytes}) {
        if (was.*count != 0 && is.*count >= was.*count) {
            return false;
        }
        counted = counted || was.*count != 0;
    }
    return counted;
}

// Where no mark tells interfaces apart, one whose counts all began again while notices were lost is another one of its
// index. A NIC is left out, as its driver may begin again.
void KeepCounters(LinuxHost *host, u32 index, Port *port, const LinkCounters &counters) {
    bool doubtful = port->filled != 0 && port->reloads != host->reloads && BeganAgain(port->counters, counters);
    Link *link = doubtful ? LinksFind(&host->links, index) : nullptr;
    if (link != nullptr && link->mark == 0 && link->device[0] == 0) {
        LinksRenew(&host->links, link);
    }
    port->reloads = host->reloads;
    port->counters = counters;
    port->filled = host->counting.generation;
}

void KeepDumped(void *context, u32 index, const LinkCounters &counters) {
    auto *host = static_cast<LinuxHost *>(context);
    if (Port *port = HostFind(host, index, &host->dumped, &Port::dumpNext)) {
        KeepCounters(host, index, port, counters);
    }
}

// What a pass reads is known from the one before; ahead of the first one, from the ports that were asked for.
bool DumpPays(const LinuxHost &host) {
    const Pass &pass = host.counting;
    u64 wanted = pass.generation <= 1 ? host.ports.size() : pass.expected;
    return std::max<u64>(wanted, pass.reads) * DUMP_SHARE > host.members.size();
}

Outcome FillCounters(LinuxHost *host, u32 index, Port *port) {
    if (!host->whole && DumpPays(*host)) {
        host->whole = true;
        CountersDump(&host->route, {KeepDumped, host});
        host->counting.startedAt = host->now();
    }
    if (port->filled == host->counting.generation) {
        return FINE;
    }
    LinkCounters counters = {};
    Outcome outcome = CountersRead(&host->route, index, &counters);
    if (outcome != FINE && outcome != GONE) {
        outcome = CountersRead(&host->route, index, &counters);
    }
    if (outcome != FINE && outcome != GONE && port->filled != 0) {
        return FINE;  // as last told: a port that fails once is lost for good
    }
    if (outcome == FINE) {
        KeepCounters(host, index, port, counters);
    }
    return outcome;
}

void PutDirections(const LinkCounters &counters, bool swapped, char *record) {
    using namespace port_stats;
    u64 sentLost = counters.txDropped + counters.txErrors;
    u64 receivedLost = counters.rxDropped + counters.rxErrors;
    Put(record, TX_PKTS, swapped ? counters.rxPackets : counters.txPackets);
    Put(record, TX_BYTES, swapped ? counters.rxBytes : counters.txBytes);
    Put(record, TX_DROPPED, swapped ? receivedLost : sentLost);
    Put(record, RX_PKTS, swapped ? counters.txPackets : counters.rxPackets);
    Put(record, RX_BYTES, swapped ? counters.txBytes : counters.rxBytes);
    Put(record, RX_DROPPED, swapped ? sentLost : receivedLost);
}

const Link *NicLink(LinuxHost *host, const std::string &name) {
    for (const Link &link : host->links.rows) {
        if (!link.gone && name == link.name && HostJoin(host, link)->type == PORT_UPLINK) {
            return &link;
        }
    }
    return nullptr;
}

// The NIC that bore this name when it was first asked for; null when it went, or never was.
Nic *NicOf(LinuxHost *host, const std::string &name) {
    if (HostLinks(host) != FINE) {
        return nullptr;
    }
    for (auto &nic : host->nics) {
        const Link *link = name == nic->name ? LinksFind(host->links, nic->index) : nullptr;
        if (link != nullptr && link->birth == nic->birth) {
            return nic.get();
        }
    }
    const Link *link = NicLink(host, name);
    if (link == nullptr) {
        return nullptr;
    }
    auto nic = std::make_unique<Nic>();
    memcpy(nic->name, link->name, sizeof nic->name);
    nic->index = link->index;
    nic->birth = link->birth;
    nic->hardware = link->device[0] != 0 ? link->index : link->lower;
    host->nics.push_back(std::move(nic));
    return host->nics.back().get();
}

void ChooseQueues(LinuxHost *host, Nic *nic) {
    nic->chosen = true;
    nic->source = QueuesChoose(&host->generic, &host->route, &host->families, nic->hardware, nic->count.transmit);
    if (nic->source == QUEUES_UNTOLD && nic->count.transmit > 1) {
        TellOnce(&host->toldQueues, "corekit: %s does not tell counters of its transmit queues\n", nic->name);
    }
}

// A NIC whose kernel does not tell its queues has one of each. Queues that nobody counts are left out.
void CountQueues(LinuxHost *host, Nic *nic, u32 direction) {
    if (!PassJoin(&nic->counting, &nic->countServed[direction], host->now())) {
        return;
    }
    if (Outcome outcome = NetlinkOpen(&host->generic, NETLINK_GENERIC); outcome != FINE) {
        nic->count = {};
        TellOnce(&host->toldQueues, "corekit: the kernel does not tell the queues of NICs: %s\n",
                 StatusText(StatusOf(outcome)));
        return;
    }
    nic->counted = QueuesCount(&host->generic, &host->families, nic->hardware, &nic->count) == FINE;
    if (!nic->counted) {
        nic->count = {1, 1};
    }
    if (!nic->chosen) {
        ChooseQueues(host, nic);
    }
    if (nic->source == QUEUES_UNTOLD && nic->count.transmit > 1) {
        nic->count.transmit = 0;
    }
}

// A queue may begin again when the number of queues changes: what it had counted until then stays in.
void CarryQueues(Nic *nic) {
    nic->told.resize(std::max(nic->told.size(), nic->queues.size()));
    nic->before.resize(nic->told.size());
    for (size_t i = 0; i < nic->queues.size(); i++) {
        QueueCounters *queue = &nic->queues[i];
        for (auto count : {&QueueCounters::packets, &QueueCounters::errors, &QueueCounters::stops}) {
            u64 *told = &(nic->told[i].*count);
            u64 *before = &(nic->before[i].*count);
            if (queue->known != 0) {
                *before += queue->*count < *told ? *told : 0;
                *told = queue->*count;
                queue->*count += *before;
            }
        }
    }
}

Outcome ReadQueue(LinuxHost *host, Nic *nic, u32 queue, QueueCounters *counters) {
    nic->queueServed.resize(std::max<size_t>(nic->queueServed.size(), queue + 1));
    if (PassJoin(&nic->reading, &nic->queueServed[queue], host->now())) {
        NetlinkSocket *socket = nic->source == QUEUES_NETDEV ? &host->generic : &host->route;
        QueuesRead(socket, host->families, nic->source, nic->hardware, &nic->queues);
        CarryQueues(nic);
    }
    if (queue >= nic->queues.size() || nic->queues[queue].known == 0) {
        return GONE;
    }
    *counters = nic->queues[queue];
    return FINE;
}

// The only queue of a NIC carries what the NIC carries.
Outcome ReadOnlyQueue(LinuxHost *host, const Nic &nic, QueueCounters *counters) {
    LinkCounters link;
    Outcome outcome = CountersRead(&host->route, nic.hardware, &link);
    *counters = {link.txPackets, link.txBytes, link.txDropped + link.txErrors, 0, QUEUE_PACKETS | QUEUE_ERRORS};
    return outcome;
}

KnfStatus QueueInfoGet(LinuxHost *host, const Params &keys, u32 direction, char *record) {
    Nic *nic = NicOf(host, keys[0].text);
    if (nic == nullptr) {
        return STATUS_NOT_FOUND;
    }
    CountQueues(host, nic, direction);
    Put(record, queue_info::COUNT, direction == 0 ? nic->count.receive : nic->count.transmit);
    return STATUS_OK;
}

// "virtio_net virtio2". The link of the device names its driver; a device without one is named alone.
std::string DeviceText(const LinuxHost &host, const Link &link) {
    std::string device = link.device;
    std::string path = std::string("bus/") + link.bus + "/devices/" + device + "/driver";
    char target[256];
    bool plain = device.find('/') == std::string::npos && device.find("..") == std::string::npos;
    ssize_t length = plain ? readlinkat(host.root.sys, path.c_str(), target, sizeof target) : -1;
    if (length <= 0 || length == sizeof target) {
        return device;
    }
    std::string driver(target, static_cast<size_t>(length));
    return driver.substr(driver.rfind('/') + 1) + " " + device;
}

}  // namespace

bool HostSeenFromOutside(const Link &link) {
    return link.kind == KIND_TAP || link.kind == KIND_VETH;
}

Outcome HostCounters(LinuxHost *host, u32 index, u32 Port::*served, const LinkCounters **counters) {
    Port *port = HostPortOf(host, index);
    if (PassJoin(&host->counting, &(port->*served), host->clock)) {
        host->whole = false;
    }
    *counters = &port->counters;
    return port->filled == host->counting.generation ? FINE : FillCounters(host, index, port);
}

KnfStatus PortStatsGet(LinuxHost *host, const Params &keys, char *record) {
    const Link *link = HostPort(host, keys);
    const LinkCounters *counters = nullptr;
    if (link == nullptr) {
        return STATUS_NOT_FOUND;
    }
    u32 birth = link->birth;
    Outcome outcome = HostCounters(host, link->index, &Port::served, &counters);
    if (link->birth != birth) {
        return STATUS_NOT_FOUND;
    }
    if (outcome == FINE) {
        PutDirections(*counters, HostSeenFromOutside(*link), record);
    }
    return StatusOf(outcome);
}

KnfStatus NicPropertiesGet(LinuxHost *host, const Params &keys, char *record) {
    const Nic *nic = NicOf(host, keys[0].text);
    const Link *link = nic != nullptr ? LinksFind(host->links, nic->hardware) : nullptr;
    if (link == nullptr) {
        return STATUS_NOT_FOUND;
    }
    PutText(record, nic_properties::DEVICE, DeviceText(*host, *link).c_str());
    Put(record, nic_properties::PORT, nic->index);
    return STATUS_OK;
}

KnfStatus NicStatsGet(LinuxHost *host, const Params &keys, char *record) {
    const Nic *nic = NicOf(host, keys[0].text);
    const LinkCounters *counters = nullptr;
    Outcome outcome = nic != nullptr ? HostCounters(host, nic->hardware, &Port::servedNic, &counters) : GONE;
    if (outcome == FINE) {
        Put(record, nic_stats::RX_PKTS, counters->rxPackets);
        Put(record, nic_stats::TX_PKTS, counters->txPackets);
        Put(record, nic_stats::RX_BYTES, counters->rxBytes);
        Put(record, nic_stats::TX_BYTES, counters->txBytes);
        // Kinds of errors are parts of these sums, so the other places stay 0.
        Put(record, nic_stats::RX_ERRORS[0], counters->rxErrors);
        Put(record, nic_stats::RX_ERRORS[1], counters->rxDropped);
        Put(record, nic_stats::RX_ERRORS[2], counters->rxMissed);
        Put(record, nic_stats::TX_ERRORS[0], counters->txErrors);
        Put(record, nic_stats::TX_ERRORS[1], counters->txDropped);
    }
    return StatusOf(outcome);
}

KnfStatus RxqInfoGet(LinuxHost *host, const Params &keys, char *record) {
    return QueueInfoGet(host, keys, 0, record);
}

KnfStatus TxqInfoGet(LinuxHost *host, const Params &keys, char *record) {
    return QueueInfoGet(host, keys, 1, record);
}

KnfStatus TxqStatsGet(LinuxHost *host, const Params &keys, char *record) {
    Nic *nic = NicOf(host, keys[0].text);
    if (nic == nullptr || keys[1].number < 0 || keys[1].number >= QUEUES_MAX) {
        return STATUS_NOT_FOUND;
    }
    auto queue = static_cast<u32>(keys[1].number);
    bool only = nic->source == QUEUES_UNTOLD && nic->count.transmit == 1 && queue == 0;
    QueueCounters counters = {};
    Outcome outcome = only ? ReadOnlyQueue(host, *nic, &counters) : ReadQueue(host, nic, queue, &counters);
    Put(record, txq_stats::PKTS, counters.packets);
    Put(record, txq_stats::ERRORS, counters.errors);
    Put(record, txq_stats::STOPS, counters.stops);
    return StatusOf(outcome);
}

// No queue serves single ports of a switch.
KnfStatus RxqFilters(LinuxHost *host, const Params &keys, Params * /*entries*/) {
    return NicOf(host, keys[0].text) != nullptr ? STATUS_OK : STATUS_NOT_FOUND;
}
