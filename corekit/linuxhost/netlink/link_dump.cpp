#include "corekit/linuxhost/netlink/link_dump.h"

#include "corekit/linuxhost/netlink/attributes.h"

#include <algorithm>
#include <cstring>
#include <linux/if_arp.h>
#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <sys/socket.h>

namespace {

constexpr int TRIES = 5;        // for a dump that was interrupted
constexpr u32 SPACE = 8192;     // rows; a page that is never written to costs nothing
constexpr u32 NO_MASTER = ~0U;  // as a filter, from kernel 5.16 on; others find nothing
constexpr u32 PARTS_FROM = 64;  // interfaces; one dump is as cheap for fewer
constexpr u32 PORT_SHARE = 8;   // and where fewer of them are ports of bridges
constexpr u32 ALONE_SHARE = 8;  // one dump is cheaper when one in so many must be asked for alone

// What a message tells beside a Link.
struct LinkMessage {
    Link link;
    char kind[NAME_SIZE] = {};
    u32 foreign = 0;  // the namespace of the lower interface, when it is another one
    u32 mtu = 0;      // stands in whatever tells of a whole interface; wireless events lack it
};

// clang-format off
constexpr AttrField INFO_FIELDS[] = {{IFLA_INFO_KIND, ATTR_TEXT, ATTR_AT(LinkMessage, kind)}};
constexpr AttrField LINK_FIELDS[] = {
    {IFLA_IFNAME, ATTR_TEXT, ATTR_AT(LinkMessage, link.name)},
    {IFLA_ADDRESS, ATTR_STRUCT, ATTR_AT(LinkMessage, link.mac)},
    {IFLA_MASTER, ATTR_UINT, ATTR_AT(LinkMessage, link.master)},
    {IFLA_LINK, ATTR_UINT, ATTR_AT(LinkMessage, link.lower)},
    {IFLA_LINK_NETNSID, ATTR_UINT, ATTR_AT(LinkMessage, foreign)},
    {IFLA_PARENT_DEV_NAME, ATTR_TEXT, ATTR_AT(LinkMessage, link.device)},
    {IFLA_PARENT_DEV_BUS_NAME, ATTR_TEXT, ATTR_AT(LinkMessage, link.bus)},
    {IFLA_MTU, ATTR_UINT, ATTR_AT(LinkMessage, mtu)},
    {IFLA_LINKINFO, ATTR_NEST, 0, 0, INFO_FIELDS, 1},
};
constexpr u32 KNOWS_NAME = 1U << 0;
constexpr u32 KNOWS_MTU = 1U << 7;
constexpr u32 KNOWS_FOREIGN = 1U << 4;

struct KindName {
    const char *name;
    LinkKind kind;
};
constexpr KindName KINDS[] = {{"bridge", KIND_BRIDGE}, {"openvswitch", KIND_SWITCH}, {"tun", KIND_TAP},
                              {"veth", KIND_VETH}, {"vlan", KIND_VLAN}, {"macvlan", KIND_MACVLAN},
                              {"macvtap", KIND_MACVTAP}, {"", KIND_NONE}};
// clang-format on

LinkKind KindOf(const char *name) {
    for (const KindName &kind : KINDS) {
        if (strcmp(kind.name, name) == 0) {
            return kind.kind;
        }
    }
    return KIND_OTHER;
}

// False for a message that tells of no interface.
bool Parse(const nlmsghdr *message, u8 family, Link *link) {
    ifinfomsg header;
    std::string_view attributes;
    if (!MessageSplit(message, &header, sizeof header, &attributes) || header.ifi_index <= 0 ||
        header.ifi_family != family) {
        return false;
    }
    LinkMessage told;
    u32 known = AttrFill(LINK_FIELDS, attributes, &told);
    *link = told.link;
    link->index = static_cast<u32>(header.ifi_index);
    link->known = known;
    link->flags = header.ifi_flags;
    link->type = header.ifi_type;
    link->kind = KindOf(told.kind);
    if (link->type != ARPHRD_ETHER) {  // the address of a tunnel is none of this kind
        memset(link->mac, 0, sizeof link->mac);
    }
    if ((known & KNOWS_FOREIGN) != 0 || link->lower == link->index) {
        link->lower = 0;
    }
    return (known & KNOWS_NAME) != 0 && (known & KNOWS_MTU) != 0 && link->name[0] != 0;
}

void Take(std::vector<Link> *found, u8 family, const nlmsghdr *message) {
    Link link;
    if (message->nlmsg_type == RTM_NEWLINK && found->size() <= LINKS_MAX && Parse(message, family, &link)) {
        found->push_back(link);
    }
}

void TakeWhole(void *context, const nlmsghdr *message) {
    Take(static_cast<std::vector<Link> *>(context), AF_UNSPEC, message);
}

// A NIC with a bridge of its own has such a message too, often without a switch.
void TakePort(void *context, const nlmsghdr *message) {
    Take(static_cast<std::vector<Link> *>(context), AF_BRIDGE, message);
}

void TakeIndex(void *context, const nlmsghdr *message) {
    auto *present = static_cast<std::vector<u32> *>(context);
    if_stats_msg header;
    std::string_view rest;
    if (message->nlmsg_type == RTM_NEWSTATS && present->size() <= LINKS_MAX &&
        MessageSplit(message, &header, sizeof header, &rest)) {
        present->push_back(header.ifindex);
    }
}

NetlinkRequest LinkRequest(u16 flags, u32 index) {
    ifinfomsg header = {};
    header.ifi_index = static_cast<int>(index);
    NetlinkRequest request = RequestOf(RTM_GETLINK, flags, &header, sizeof header);
    RequestAddU32(&request, IFLA_EXT_MASK, RTEXT_FILTER_SKIP_STATS);
    return request;
}

Outcome DumpWhole(NetlinkSocket *socket, std::vector<Link> *found) {
    Outcome outcome = INTERRUPTED;
    for (int i = 0; i < TRIES && outcome == INTERRUPTED; i++) {
        found->clear();
        NetlinkRequest request = LinkRequest(NLM_F_DUMP, 0);
        outcome = NetlinkTalk(socket, &request, {TakeWhole, found});
    }
    return outcome;
}

Outcome DumpPorts(NetlinkSocket *socket, std::vector<Link> *ports) {
    ifinfomsg header = {};
    header.ifi_family = AF_BRIDGE;
    NetlinkRequest request = RequestOf(RTM_GETLINK, NLM_F_DUMP, &header, sizeof header);
    return NetlinkTalk(socket, &request, {TakePort, ports});
}

Outcome DumpOthers(NetlinkSocket *socket, std::vector<Link> *others) {
    NetlinkRequest request = LinkRequest(NLM_F_DUMP, 0);
    RequestAddU32(&request, IFLA_MASTER, NO_MASTER);
    return NetlinkTalk(socket, &request, {TakeWhole, others});
}

// The shortest list of all interfaces: counters that hardly any has.
Outcome DumpIndices(NetlinkSocket *socket, std::vector<u32> *present) {
    if_stats_msg header = {};
    header.filter_mask = IFLA_STATS_FILTER_BIT(IFLA_STATS_LINK_XSTATS);
    NetlinkRequest request = RequestOf(RTM_GETSTATS, NLM_F_DUMP, &header, sizeof header);
    return NetlinkTalk(socket, &request, {TakeIndex, present});
}

bool Before(const Link &link, u32 index) {
    return link.index < index;
}

const Link *Find(const std::vector<Link> &links, u32 index) {
    auto at = std::lower_bound(links.begin(), links.end(), index, Before);
    return at != links.end() && at->index == index ? &*at : nullptr;
}

void Sort(std::vector<Link> *links) {
    auto byIndex = [](const Link &left, const Link &right) { return left.index < right.index; };
    auto same = [](const Link &left, const Link &right) { return left.index == right.index; };
    if (!std::is_sorted(links->begin(), links->end(), byIndex)) {
        std::stable_sort(links->begin(), links->end(), byIndex);
    }
    links->erase(std::unique(links->begin(), links->end(), same), links->end());
}

// The kind of a port of a bridge, of whose message it is no part. The peer of a veth is a veth. For others the driver
// tells, by a name that only this kind has. What stands in IFLA_LINK may be of another namespace, so it is kept only
// where the peer says the same. False: the port must be asked for alone.
bool ProveKind(const NetlinkSocket &socket, const std::vector<Link> &others, Link *port) {
    if (port->master == 0) {
        return false;
    }
    const Link *peer = port->lower != 0 ? Find(others, port->lower) : nullptr;
    if (peer != nullptr && peer->kind == KIND_VETH && peer->lower == port->index) {
        port->kind = KIND_VETH;
        return true;
    }
    char driver[NAME_SIZE] = {};
    if (!socket.io.driver(socket.io.context, port->name, driver)) {
        return false;
    }
    port->lower = 0;
    port->kind = strcmp(driver, "veth") == 0 ? KIND_VETH : strcmp(driver, "tun") == 0 ? KIND_TAP : KIND_OTHER;
    return port->kind != KIND_OTHER;
}

// Ports of bridges by their short messages, what is on no switch by a whole one, and the rest alone: members of bonds
// and the like, and ports whose kind is not proven. UNSUPPORTED where one dump of all serves as well or better.
Outcome DumpParts(NetlinkSocket *socket, std::vector<Link> *found) {
    std::vector<u32> rest;
    std::vector<Link> ports;
    if (socket->io.driver == nullptr || DumpIndices(socket, &rest) != FINE || rest.size() < PARTS_FROM ||
        DumpPorts(socket, &ports) != FINE || ports.size() * PORT_SHARE < rest.size() ||
        DumpOthers(socket, found) != FINE) {
        return UNSUPPORTED;
    }
    Sort(&ports);
    Sort(found);
    for (Link &port : ports) {
        port.gone = Find(*found, port.index) != nullptr || !ProveKind(*socket, *found, &port);
    }
    std::erase_if(ports, [](const Link &port) { return port.gone; });
    found->insert(found->end(), ports.begin(), ports.end());
    Sort(found);
    std::erase_if(rest, [&](u32 index) { return Find(*found, index) != nullptr; });
    Outcome outcome = rest.size() * ALONE_SHARE > found->size() ? UNSUPPORTED : FINE;
    for (size_t i = 0; i < rest.size() && outcome == FINE; i++) {
        outcome = LinkAsk(socket, rest[i], found);
        outcome = outcome == GONE ? FINE : outcome;
    }
    return outcome;
}

}  // namespace

bool LinkParse(const nlmsghdr *message, Link *link) {
    return Parse(message, AF_UNSPEC, link);
}

Outcome LinksDump(NetlinkSocket *socket, std::vector<Link> *found) {
    found->reserve(SPACE);
    Outcome outcome = DumpParts(socket, found);
    if (outcome != FINE) {
        outcome = DumpWhole(socket, found);
    }
    Sort(found);
    return outcome;
}

Outcome LinkAsk(NetlinkSocket *socket, u32 index, std::vector<Link> *found) {
    NetlinkRequest request = LinkRequest(0, index);
    return NetlinkTalk(socket, &request, {TakeWhole, found});
}
