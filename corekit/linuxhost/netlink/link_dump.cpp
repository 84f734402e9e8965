#include "corekit/linuxhost/netlink/link_dump.h"

#include "corekit/linuxhost/netlink/attributes.h"

#include <algorithm>
#include <cstring>
#include <linux/if_arp.h>
#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <sys/socket.h>

namespace {

constexpr int TRIES = 5;     // for a dump that was interrupted
constexpr u32 SPACE = 8192;  // rows; a page that is never written to costs nothing

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
                              {"macvtap", KIND_MACVTAP}, {"bond", KIND_TEAM}, {"team", KIND_TEAM}, {"", KIND_NONE}};
// clang-format on

LinkKind KindOf(const char *name) {
    for (const KindName &kind : KINDS) {
        if (strcmp(kind.name, name) == 0) {
            return kind.kind;
        }
    }
    return KIND_OTHER;
}

void TakeLink(void *context, const nlmsghdr *message) {
    auto *found = static_cast<std::vector<Link> *>(context);
    Link link;
    if (message->nlmsg_type == RTM_NEWLINK && found->size() <= LINKS_MAX && LinkParse(message, &link)) {
        found->push_back(link);
    }
}

NetlinkRequest LinkRequest(u16 flags, u32 index) {
    ifinfomsg header = {};
    header.ifi_index = static_cast<int>(index);
    NetlinkRequest request = RequestOf(RTM_GETLINK, flags, &header, sizeof header);
    RequestAddU32(&request, IFLA_EXT_MASK, RTEXT_FILTER_SKIP_STATS);
    return request;
}

void Sort(std::vector<Link> *links) {
    auto byIndex = [](const Link &left, const Link &right) { return left.index < right.index; };
    auto same = [](const Link &left, const Link &right) { return left.index == right.index; };
    if (!std::is_sorted(links->begin(), links->end(), byIndex)) {
        std::stable_sort(links->begin(), links->end(), byIndex);
    }
    links->erase(std::unique(links->begin(), links->end(), same), links->end());
}

}  // namespace

bool LinkParse(const nlmsghdr *message, Link *link) {
    ifinfomsg header;
    std::string_view attributes;
    if (!MessageSplit(message, &header, sizeof header, &attributes) || header.ifi_index <= 0 ||
        header.ifi_family != AF_UNSPEC) {
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

Outcome LinksDump(NetlinkSocket *socket, std::vector<Link> *found) {
    found->reserve(SPACE);
    Outcome outcome = INTERRUPTED;
    for (int i = 0; i < TRIES && outcome == INTERRUPTED; i++) {
        found->clear();
        NetlinkRequest request = LinkRequest(NLM_F_DUMP, 0);
        outcome = NetlinkTalk(socket, &request, {TakeLink, found});
    }
    Sort(found);
    return outcome;
}

Outcome LinkAsk(NetlinkSocket *socket, u32 index, std::vector<Link> *found) {
    NetlinkRequest request = LinkRequest(0, index);
    return NetlinkTalk(socket, &request, {TakeLink, found});
}
