// What only some ports need beside their link: which interfaces have an address of the host, and which address a bridge
// has learned behind a port. One dump each, at start and only when asked.
#pragma once

#include "corekit/linuxhost/netlink/socket.h"

#include <vector>

struct Learned {
    u32 index;  // of the port
    u8 mac[6];
};

constexpr u32 NEIGHBOURS_MAX = 1048576;

// Adds the indices of interfaces with an address that reaches beyond their own link, ascending, once each.
Outcome AddressesLoad(NetlinkSocket *socket, std::vector<u32> *indices);
// Adds what bridges learned behind their ports, ascending by port; static and local entries are left out.
Outcome LearnedLoad(NetlinkSocket *socket, std::vector<Learned> *learned);
// The one address learned behind a port; null for none, and for several.
const Learned *LearnedFind(const std::vector<Learned> &learned, u32 index);
