// Queues of a NIC and the counters of its transmit queues, from the first of these that this kernel and driver have:
// the counters of the netdev family, the queue disciplines under "mq", and, for a single queue, the NIC's own counters,
// which the caller has. Nothing is kept but the number of a family. 30 us a NIC.
#pragma once

#include "corekit/linuxhost/netlink/socket.h"

#include <vector>

constexpr u32 QUEUES_MAX = 4096;  // of a NIC; a higher number is not believed

enum QueueKnown : u32 { QUEUE_PACKETS = 1, QUEUE_BYTES = 2, QUEUE_ERRORS = 4, QUEUE_STOPS = 8 };
enum QueueSource : u8 { QUEUES_UNTOLD, QUEUES_NETDEV, QUEUES_DISCIPLINES };

struct Families {
    bool asked = false;
    u16 netdev = 0;  // 0: this kernel has none
    u16 ethtool = 0;
};

struct QueueCount {
    u32 receive;
    u32 transmit;
};

// Not FINE when nobody tells.
Outcome QueuesCount(NetlinkSocket *generic, Families *families, u32 index, QueueCount *count);
// Which source tells of all `transmit` queues, by a first read of each; UNTOLD when none does.
QueueSource QueuesChoose(NetlinkSocket *generic, NetlinkSocket *route, Families *families, u32 index, u32 transmit);
// The counters of the transmit queues by number; a row that was not told has no bits in `known`.
Outcome QueuesRead(NetlinkSocket *socket, const Families &families, QueueSource source, u32 index,
                   std::vector<QueueCounters> *queues);
