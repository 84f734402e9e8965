#include "corekit/linuxhost/netlink/links.h"

#include "corekit/linuxhost/netlink/attributes.h"

#include <algorithm>
#include <cstring>
#include <linux/if_arp.h>
#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <sys/socket.h>

const u32 LINK_NOTICES = 1U << (RTNLGRP_LINK - 1);

namespace {

constexpr int TRIES = 5;  // for a dump that was interrupted

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
bool Parse(const nlmsghdr *message, Link *link) {
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

std::vector<Link>::iterator Place(std::vector<Link> *rows, u32 index) {
    if (rows->empty() || rows->back().index < index) {
        return rows->end();
    }
    return std::lower_bound(rows->begin(), rows->end(), index,
                            [](const Link &link, u32 wanted) { return link.index < wanted; });
}

bool SameButFlags(const Link &left, const Link &right) {
    return left.master == right.master && left.lower == right.lower && left.kind == right.kind &&
           left.gone == right.gone && memcmp(left.mac, right.mac, sizeof left.mac) == 0 &&
           strcmp(left.name, right.name) == 0 && strcmp(left.device, right.device) == 0;
}

// Another interface of the same index: its deletion was seen, or it has changed what an interface never changes.
bool Another(const Link &old, const Link &link) {
    return old.gone || old.kind != link.kind || old.type != link.type ||
           (strcmp(old.name, link.name) != 0 && memcmp(old.mac, link.mac, sizeof old.mac) != 0);
}

void Put(LinkTable *table, Link link) {
    auto at = Place(&table->rows, link.index);
    bool there = at != table->rows.end() && at->index == link.index;
    if (!there && table->rows.size() >= LINKS_MAX) {
        table->overflown = true;
        return;
    }
    link.birth = there ? at->birth : 0;
    if (there && !Another(*at, link)) {
        table->change += SameButFlags(*at, link) ? 0 : 1;
        *at = link;
        return;
    }
    link.birth = ++table->change;
    if (there) {
        *at = link;
    } else {
        table->rows.insert(at, link);
    }
}

void Remove(LinkTable *table, u32 index) {
    if (Link *link = LinksFind(table, index)) {
        link->gone = true;
        table->change++;
    }
}

void TakeDumped(void *context, const nlmsghdr *message) {
    auto *found = static_cast<std::vector<Link> *>(context);
    Link link;
    if (message->nlmsg_type == RTM_NEWLINK && found->size() <= LINKS_MAX && Parse(message, &link)) {
        found->push_back(link);
    }
}

void TakeNotice(void *context, const nlmsghdr *message) {
    Link link;
    if (!Parse(message, &link)) {
        return;
    }
    auto *table = static_cast<LinkTable *>(context);
    if (message->nlmsg_type == RTM_NEWLINK) {
        Put(table, link);
    } else if (message->nlmsg_type == RTM_DELLINK) {
        Remove(table, link.index);
    }
}

NetlinkRequest LinkRequest(u16 flags, u32 index) {
    ifinfomsg header = {};
    header.ifi_index = static_cast<int>(index);
    NetlinkRequest request = RequestOf(RTM_GETLINK, flags, &header, sizeof header);
    RequestAddU32(&request, IFLA_EXT_MASK, RTEXT_FILTER_SKIP_STATS);
    return request;
}

Outcome Dump(NetlinkSocket *socket, std::vector<Link> *found) {
    Outcome outcome = INTERRUPTED;
    for (int i = 0; i < TRIES && outcome == INTERRUPTED; i++) {
        found->clear();
        NetlinkRequest request = LinkRequest(NLM_F_DUMP, 0);
        outcome = NetlinkTalk(socket, &request, {TakeDumped, found});
    }
    return outcome;
}

bool StillThere(NetlinkSocket *socket, u32 index) {
    std::vector<Link> found;
    NetlinkRequest request = LinkRequest(0, index);
    return NetlinkTalk(socket, &request, {TakeDumped, &found}) != GONE;
}

}  // namespace

Outcome LinksLoad(NetlinkSocket *socket, LinkTable *table) {
    std::vector<Link> found;
    found.reserve(table->rows.size() + 16);
    Outcome outcome = Dump(socket, &found);
    if (outcome != FINE && outcome != INTERRUPTED) {
        return outcome;
    }
    std::sort(found.begin(), found.end(), [](const Link &left, const Link &right) { return left.index < right.index; });
    auto at = found.begin();
    for (const Link &old : std::vector<Link>(table->rows)) {
        at = std::find_if(at, found.end(), [&old](const Link &link) { return link.index >= old.index; });
        bool missing = at == found.end() || at->index != old.index;
        if (missing && !old.gone && (outcome == FINE || !StillThere(socket, old.index))) {
            Remove(table, old.index);
        }
    }
    for (const Link &link : found) {
        Put(table, link);
    }
    return FINE;
}

Link *LinksFind(LinkTable *table, u32 index) {
    auto at = Place(&table->rows, index);
    return at != table->rows.end() && at->index == index && !at->gone ? &*at : nullptr;
}

const Link *LinksFind(const LinkTable &table, u32 index) {
    return LinksFind(const_cast<LinkTable *>(&table), index);
}

Outcome LinksNotices(NetlinkSocket *notices, LinkTable *table) {
    return NetlinkNotices(notices, {TakeNotice, table});
}
