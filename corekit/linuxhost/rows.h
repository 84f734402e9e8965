// What the rooms of the Linux host hand to each other: the answers that a look at the kernel can have, and the rows of
// its network tables. Plain values; a row lives in the table that its room keeps.
#pragma once

#include "interface/types.h"

#include <cerrno>
#include <cstdarg>
#include <cstdint>
#include <cstdio>

enum Outcome : u8 {
    FINE,
    GONE,         // that one thing is no longer there: it costs one row, quietly
    UNSUPPORTED,  // this kernel, driver or build lacks it: the feature is off
    REFUSED,      // not for this user
    INTERRUPTED,  // changed while it was read: ask again
    BROKEN,       // anything else; costs the record that was asked for, never a pass
};

constexpr Outcome ErrnoOutcome(int error) {
    switch (error) {
    case 0:
        return FINE;
    case ENODEV:
    case ENOENT:
    case ESRCH:
    case ENXIO:
        return GONE;
    case EOPNOTSUPP:
    case ENOSYS:
    case EPROTONOSUPPORT:
    case EAFNOSUPPORT:
        return UNSUPPORTED;
    case EPERM:
    case EACCES:
        return REFUSED;
    case EINTR:
    case EAGAIN:
        return INTERRUPTED;
    default:
        return BROKEN;
    }
}

constexpr u32 NAME_SIZE = 16;  // of an interface's name: up to 15 bytes of any value but 0 and '/'

// What an interface was made as, where it matters here. A NIC has no kind.
enum LinkKind : u8 {
    KIND_NONE,
    KIND_OTHER,
    KIND_BRIDGE,
    KIND_SWITCH,
    KIND_TAP,
    KIND_VETH,
    KIND_VLAN,
    KIND_TEAM,  // or bond
    KIND_MACVLAN,
    KIND_MACVTAP
};

// An interface.
struct Link {
    u32 index = 0;   // never 0 in a table
    u32 birth = 0;   // the change of its table that first showed it: an index used again is another link
    u32 known = 0;   // bit n: row n of the table of attributes in links.cpp was told
    u32 flags = 0;   // IFF_
    u32 master = 0;  // index of the bridge, bond or the like that it belongs to; 0: none
    u32 lower = 0;   // index of the interface that it stands on, in this namespace; 0: none
    LinkKind kind = KIND_NONE;
    bool gone = false;  // kept so that a later link of this index is known as another one
    u16 type = 0;       // ARPHRD_
    u8 mac[6] = {};
    char name[NAME_SIZE] = {};
    char device[32] = {};  // the parent device, as "0000:31:00.0"; empty for what is no NIC
    char bus[12] = {};     // the parent device's bus, as "pci"
    u64 mark = 0;          // what only this interface has, ever; 0: not told
};

// Running counters of one interface, from its own point of view.
struct LinkCounters {
    u64 rxPackets, txPackets, rxBytes, txBytes, rxErrors, txErrors, rxDropped, txDropped, rxMissed;
};

// Of a transmit queue. What `known` lacks was not measured.
struct QueueCounters {
    u64 packets, bytes, errors, stops;
    u32 known;
};

// Payload bytes of all TCP connections since the first read, and segments that brought payload.
struct TcpTotals {
    u64 bytesSent, bytesReceived, segmentsReceived;
};

// For what a user should know once in a run: writes the line to standard error, unless `*told` is set, and sets it.
__attribute__((format(printf, 2, 3))) inline void TellOnce(bool *told, const char *format, ...) {
    if (*told) {
        return;
    }
    *told = true;
    va_list arguments;
    va_start(arguments, format);
    vfprintf(stderr, format, arguments);
    va_end(arguments);
}
