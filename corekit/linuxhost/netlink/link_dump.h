// What the kernel tells of interfaces: one whole message each, at 4 to 5 us; or, for ports of bridges, a short one at 2
// to 3 us that lacks the kind, which is then proven by a peer or asked of the driver. Owns nothing.
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
