// What the kernel tells of interfaces: one message each, at 4 to 5 us. The bridges' own list of their ports has shorter
// ones, but lacks the kind, and the kernel walks all interfaces anew for each piece of it: no gain at 1,000 ports, and
// a loss at 4,000. Owns nothing.
#pragma once

#include "corekit/linuxhost/netlink/socket.h"

#include <vector>

constexpr u32 LINKS_MAX = 262144;

// An interface from a message that tells all of it; false for every other message.
bool LinkParse(const nlmsghdr *message, Link *link);
// All interfaces, ascending by index, once each. INTERRUPTED: the list changed under way; what is missing may be there.
Outcome LinksDump(NetlinkSocket *socket, std::vector<Link> *found);
// One of them. GONE when there is none.
Outcome LinkAsk(NetlinkSocket *socket, u32 index, std::vector<Link> *found);
