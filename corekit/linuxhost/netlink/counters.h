// Running counters of interfaces: of all by one dump, 0.3 to 1 us each, or of one by a request, 4 to 6 us.
#pragma once

#include "corekit/linuxhost/netlink/socket.h"

struct CounterReader {
    void (*row)(void *context, u32 index, const LinkCounters &counters);
    void *context;
};

// INTERRUPTED: an interface came or went meanwhile; what was told is good, and what is missing may still be there.
Outcome CountersDump(NetlinkSocket *socket, const CounterReader &reader);
// GONE when there is no such interface.
Outcome CountersRead(NetlinkSocket *socket, u32 index, LinkCounters *counters);
