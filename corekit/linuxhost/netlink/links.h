// All interfaces of the namespace, by index. Dumps at start, 2 to 5 us an interface, then notices of changes. A link
// takes 104 bytes; a table holds at most LINKS_MAX, and a kernel that tells more is not believed.
#pragma once

#include "corekit/linuxhost/netlink/link_dump.h"

struct LinkTable {
    std::vector<Link> rows;  // ascending by index; those that are gone leave when they are a third of it
    u32 gone = 0;            // of these
    u32 change = 0;          // grows with whatever happens to a row but its flags
    bool overflown = false;  // there were more than LINKS_MAX
};

// Brings the table up to date by a dump. A link that an interrupted dump left out is asked for alone before it counts
// as gone. On a failure the table stays as it was.
Outcome LinksLoad(NetlinkSocket *socket, LinkTable *table);
// Null when it is gone or never was.
Link *LinksFind(LinkTable *table, u32 index);
const Link *LinksFind(const LinkTable &table, u32 index);
// The same where it was before, and is still as a rule.
const Link *LinksFind(const LinkTable &table, u32 index, u32 *row);
// From now on it is another interface than the one that had its index until now, which nobody saw go.
void LinksRenew(LinkTable *table, Link *link);
// Reads what waits on the socket of notices into the table. INTERRUPTED: some were lost, the table must be loaded.
Outcome LinksNotices(NetlinkSocket *notices, LinkTable *table);
// The groups of these notices, for NetlinkOpen.
extern const u32 LINK_NOTICES;
