// What only some ports need beside their link: which interfaces have an address of the host, and which address a bridge
// has learned behind a port. Asked once, at start, and only where a port needs it.
#pragma once

#include "corekit/linuxhost/netlink/socket.h"

#include <vector>

struct Learned {
    u32 index;  // of the port
    u8 mac[6];
};

constexpr u32 NEIGHBOURS_MAX = 1048576;

// Adds the index of each address that reaches beyond its own link: of one interface, 3 us, or of all (0), 0.2 to 0.9 us
// each with and without addresses. Kernels before 5.0 give all in any case.
Outcome AddressesLoad(NetlinkSocket *socket, u32 index, std::vector<u32> *indices);
// Adds what bridges learned behind their ports, ascending by port; static and local entries are left out.
Outcome LearnedLoad(NetlinkSocket *socket, std::vector<Learned> *learned);
// The one address learned behind a port; null for none, and for several.
const Learned *LearnedFind(const std::vector<Learned> &learned, u32 index);
