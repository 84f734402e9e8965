// All interfaces of the namespace, by index. One dump at start, about 5 us an interface, then notices of changes. A
// link takes 120 bytes; a table holds at most LINKS_MAX, and a kernel that tells more is not believed.
#pragma once

#include "corekit/linuxhost/netlink/socket.h"

#include <vector>

constexpr u32 LINKS_MAX = 262144;

struct LinkTable {
    std::vector<Link> rows;  // ascending by index, with those that are gone
    u32 change = 0;          // grows with whatever happens to a row but its flags
    bool overflown = false;  // there were more than LINKS_MAX
};

// Brings the table up to date by a dump. A link that an interrupted dump left out is asked for alone before it counts
// as gone. On a failure the table stays as it was.
Outcome LinksLoad(NetlinkSocket *socket, LinkTable *table);
// Null when it is gone or never was.
Link *LinksFind(LinkTable *table, u32 index);
const Link *LinksFind(const LinkTable &table, u32 index);
// Reads what waits on the socket of notices into the table. INTERRUPTED: some were lost, the table must be loaded.
Outcome LinksNotices(NetlinkSocket *notices, LinkTable *table);
// The groups of these notices, for NetlinkOpen.
extern const u32 LINK_NOTICES;
