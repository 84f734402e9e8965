// Payload bytes of all TCP connections of the namespace, which no counter of the host tells: the sum over the living
// sockets, and the last word of each that ended, which the kernel gives by a notice. 2 us a socket and reading; asking
// makes the kernel load a module, so nothing is opened before the first reading.
#pragma once

#include "corekit/linuxhost/netlink/socket.h"

#include <vector>

constexpr u32 SOCKETS_MAX = 262144;  // 8 MiB; a host with more has no totals

// What a socket told last. It stays until its end is told: one that is closed but still held by its process is in no
// dump.
struct TcpSocket {
    u64 cookie;
    TcpTotals totals;
};

struct TcpSockets {
    NetlinkSocket requests;
    NetlinkSocket notices;
    std::vector<TcpSocket> living;  // ascending by cookie
    std::vector<TcpSocket> ended;   // told since the last reading
    TcpTotals past{};               // of those that ended
};

// Counts from the first reading on.
Outcome TcpSocketsRead(TcpSockets *sockets, TcpTotals *totals);
