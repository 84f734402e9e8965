#include "corekit/linuxhost/host.h"
#include "corekit/linuxhost/host_nodes.h"

#include <algorithm>
#include <linux/netlink.h>
#include <net/if.h>

namespace {

constexpr int DEPTH = 8;          // of interfaces that belong to one another
constexpr u32 ADDRESS_SHARE = 8;  // a dump of addresses pays from one bridge in so many interfaces on
constexpr i64 PORT_HIDDEN = 1;
constexpr i64 PORT_PLAIN = 2;
constexpr u64 RX_MODE_PROMISCUOUS = 1;
constexpr u64 RX_MODE_ALL_MULTICAST = 2;

Outcome LoadLinks(LinuxHost *host) {
    Outcome outcome = NetlinkOpen(&host->route, NETLINK_ROUTE);
    if (outcome == FINE) {
        outcome = LinksLoad(&host->route, &host->links);
    }
    if (outcome != FINE) {
        TellOnce(&host->toldNetlink, "corekit: the kernel does not tell its network interfaces: %s\n",
                 StatusText(StatusOf(outcome)));
    }
    return outcome;
}

bool Contains(const std::vector<u32> &sorted, u32 value) {
    return std::binary_search(sorted.begin(), sorted.end(), value);
}

bool StandsOnSwitch(const Link &link) {
    return (link.kind == KIND_MACVLAN || link.kind == KIND_MACVTAP) && link.lower != 0;
}

bool OnDatapath(const LinuxHost &host, const Link &link) {
    return link.kind == KIND_SWITCH && host.datapath != 0 && link.index != host.datapath;
}

bool IsSwitch(const LinuxHost &host, const Link &link) {
    return link.kind == KIND_BRIDGE || (link.kind == KIND_SWITCH && link.master == 0 && !OnDatapath(host, link));
}

u32 SwitchAbove(const LinuxHost &host, const Link &link, int depth) {
    const Link *master = link.master != 0 ? LinksFind(host.links, link.master) : nullptr;
    if (master != nullptr) {  // a member of a bond is where its bond is
        return IsSwitch(host, *master) ? master->index : depth > 0 ? SwitchAbove(host, *master, depth - 1) : 0;
    }
    if (OnDatapath(host, link)) {
        return host.datapath;
    }
    if (IsSwitch(host, link) || Contains(host.lowers, link.index)) {
        return link.index;
    }
    return StandsOnSwitch(link) && LinksFind(host.links, link.lower) != nullptr ? link.lower : 0;
}

void FindLowers(LinuxHost *host) {
    host->lowers.clear();
    host->datapath = 0;
    for (const Link &link : host->links.rows) {
        if (!link.gone && StandsOnSwitch(link)) {
            host->lowers.push_back(link.lower);
        }
        if (!link.gone && link.kind == KIND_SWITCH && strcmp(link.name, DATAPATH) == 0) {
            host->datapath = link.index;
        }
    }
    std::sort(host->lowers.begin(), host->lowers.end());
}

void AddSwitch(LinuxHost *host, u32 index, const char *name) {
    SwitchEntry entry = {index, {}};
    memcpy(entry.name, name, std::min(strlen(name), sizeof entry.name - 1));
    host->switches.push_back(entry);
}

// Switches in the order of their devices, then the one that stands for none.
void FindSwitches(LinuxHost *host) {
    host->switches.clear();
    host->members.clear();
    for (const Link &link : host->links.rows) {
        if (link.gone) {
            continue;
        }
        host->members.push_back({HostSwitchOf(*host, link), link.index});
        if (IsSwitch(*host, link) || (Contains(host->lowers, link.index) && link.master == 0)) {
            AddSwitch(host, link.index, link.name);
        }
    }
    std::sort(host->members.begin(), host->members.end(), [](const Member &left, const Member &right) {
        return left.switchIndex != right.switchIndex ? left.switchIndex < right.switchIndex : left.index < right.index;
    });
    if (!host->members.empty() && host->members.front().switchIndex == 0) {
        AddSwitch(host, 0, NO_SWITCH);
    }
}

// What hangs on more than a link's own row, brought up to the present table.
void JoinLinks(LinuxHost *host) {
    if (host->linkChange != host->links.change) {
        host->linkChange = host->links.change;
        host->change++;
        HostFindParents(host);
        FindLowers(host);
        FindSwitches(host);
        if (host->links.overflown) {
            TellOnce(&host->toldNetlink, "corekit: more than %u interfaces: those beyond are left out\n", LINKS_MAX);
        }
    }
}

bool IsBridge(const Link &link) {
    return link.kind == KIND_BRIDGE || link.kind == KIND_SWITCH;
}

// Bridges alone are asked for: a dump takes a millisecond for 1,000 ports that may have no address at all.
void LoadAddresses(LinuxHost *host) {
    std::vector<u32> bridges;
    for (const Link &link : host->links.rows) {
        if (!link.gone && IsBridge(link)) {
            bridges.push_back(link.index);
        }
    }
    if (bridges.size() * ADDRESS_SHARE > host->links.rows.size()) {
        bridges = {0};
    }
    host->addresses.clear();
    for (u32 bridge : bridges) {
        size_t before = host->addresses.size();
        AddressesLoad(&host->route, bridge, &host->addresses);
        if (host->addresses.size() > before && host->addresses.back() != bridge) {
            break;  // of all interfaces, asked for or not
        }
    }
    std::sort(host->addresses.begin(), host->addresses.end());
}

bool Addressed(LinuxHost *host, u32 index) {
    if (!host->addressed) {
        host->addressed = true;
        LoadAddresses(host);
    }
    return Contains(host->addresses, index);
}

bool IsNic(const LinuxHost &host, const Link &link) {
    const Link *lower = link.kind == KIND_VLAN ? LinksFind(host.links, link.lower) : nullptr;
    return link.device[0] != 0 || (lower != nullptr && lower->device[0] != 0);
}

const HeldTap *Holder(LinuxHost *host, const Link &link) {
    if ((link.kind != KIND_TAP && link.kind != KIND_MACVTAP) || HostScan(host) != FINE) {
        return nullptr;
    }
    return GuestsFind(host->guests, link.name, link.index);
}

i64 TypeOf(LinuxHost *host, const Link &link, const HeldTap *tap) {
    if ((link.flags & IFF_LOOPBACK) != 0) {
        return PORT_HIDDEN;
    }
    if (tap != nullptr) {
        return PORT_VNIC;
    }
    if (IsBridge(link)) {
        return Addressed(host, link.index) ? PORT_HOST_STACK : PORT_PLAIN;
    }
    return IsNic(*host, link) ? PORT_UPLINK : PORT_PLAIN;
}

const char *SwitchName(const LinuxHost &host, u32 index) {
    const Link *link = index != 0 ? LinksFind(host.links, index) : nullptr;
    return link != nullptr ? link->name : NO_SWITCH;
}

Link *LinkOf(LinuxHost *host, int64_t index) {
    return index > 0 && index <= UINT32_MAX ? LinksFind(&host->links, static_cast<u32>(index)) : nullptr;
}

const u8 *GuestMac(LinuxHost *host, const Link &link, const HeldTap &tap) {
    if (link.kind == KIND_MACVTAP) {
        return link.mac;
    }
    if (tap.macTold) {
        return tap.mac;
    }
    if (!host->neighboured) {
        host->neighboured = true;
        host->learned.clear();
        LearnedLoad(&host->route, &host->learned);
    }
    const Learned *learned = LearnedFind(host->learned, link.index);
    return learned != nullptr ? learned->mac : tap.mac;
}

void PutMac(char *record, FieldLayout field, const u8 *mac) {
    memcpy(record + field.offset, mac, field.width);
}

// The world leader of a guest whose vcpus can be told; without them the caller would only find out that there are none.
u32 LeaderOf(const Guest &guest) {
    return guest.vcpus.empty() ? 0 : guest.pid;
}

void PutGuest(LinuxHost *host, const Link &link, const HeldTap &tap, char *record) {
    const Guest nobody = {};
    const Guest &guest = tap.guest != NO_GUEST ? host->guests.guests[tap.guest] : nobody;
    PutText(record, port_status::CLIENT_NAME, guest.name.empty() ? link.name : guest.name.c_str());
    Put(record, port_status::WORLD_LEADER, LeaderOf(guest));
    PutMac(record, port_status::VNIC_MAC, GuestMac(host, link, tap));
}

// What of the guests could not be told.
void TellScan(LinuxHost *host) {
    const Guests &guests = host->guests;
    if (guests.crowded != 0) {
        TellOnce(&host->toldCrowd, "corekit: process %u has more than %u descriptors: taps beyond are not seen\n",
                 guests.crowded, MAX_DESCRIPTORS);
    }
    auto tap =
        std::find_if(guests.taps.begin(), guests.taps.end(), [](const HeldTap &one) { return one.guest == NO_GUEST; });
    if (tap != guests.taps.end()) {
        std::string name = tap->index != 0 ? "macvtap " + std::to_string(tap->index) : "";
        if (tap->index == 0) {
            ParamAppendText(&name, ParamOf(std::string(tap->name)));
        }
        TellOnce(&host->toldTap, "corekit: %s is held by several guests, and named after none of them\n", name.c_str());
    }
}

}  // namespace

Outcome HostLinks(LinuxHost *host) {
    host->clock = host->now();
    if (host->loaded && host->clock - host->lookedAt < NOTICE_LOOK) {
        return FINE;
    }
    host->lookedAt = host->clock;
    Outcome outcome = FINE;
    if (!host->loaded) {
        // Without a socket for notices each look loads the table anew.
        NetlinkOpen(&host->notices, NETLINK_ROUTE, LINK_NOTICES);
        outcome = LoadLinks(host);
        host->loaded = outcome == FINE;
        HostMark(host);
    } else {
        bool deaf = host->notices.io.receive == nullptr;
        host->stale |= deaf || LinksNotices(&host->notices, &host->links) == INTERRUPTED;
        if (host->stale && LoadLinks(host) == FINE) {  // until then the table serves as it is
            host->stale = false;
            host->reloads++;
            HostMark(host);
        }
    }
    host->clock = host->now();  // what follows must not look older than it is
    JoinLinks(host);
    return outcome;
}

void HostForget(LinuxHost *host) {
    host->scanned = false;
    host->addressed = false;
    host->neighboured = false;
    host->lookedAt = 0;
    host->change++;
}

Outcome HostScan(LinuxHost *host) {
    if (host->scanned) {
        return FINE;
    }
    host->scanned = true;
    host->scans++;
    host->change++;
    Outcome outcome = GuestsScan(host->root, &host->guests);
    TellScan(host);
    return outcome;
}

u32 HostSwitchOf(const LinuxHost &host, const Link &link) {
    return SwitchAbove(host, link, DEPTH);
}

Port *HostPortOf(LinuxHost *host, u32 index) {
    Port *port = HostFind(host, index, &host->read, &Port::readNext);
    if (port == nullptr) {
        port = &host->ports[index];
        port->index = index;
    }
    return port;
}

Port *HostJoin(LinuxHost *host, const Link &link) {
    Port *port = HostPortOf(host, link.index);
    if (port->joined != host->change) {
        // Who holds a tap is told by its name, which is right at the moment of the scan and may change behind it.
        if (!host->scanned || port->scan != host->scans || port->tapBirth != link.birth) {
            port->tap = Holder(host, link);
            port->scan = host->scans;
            port->tapBirth = link.birth;
        }
        port->type = TypeOf(host, link, port->tap);
        port->joined = host->change;
    }
    return port;
}

const Link *HostPort(LinuxHost *host, const Params &keys) {
    int64_t index = keys[1].number;
    if (HostLinks(host) != FINE || index <= 0 || index > UINT32_MAX) {
        return nullptr;
    }
    Port *port = HostFind(host, static_cast<u32>(index), &host->read, &Port::readNext);
    const Link *link = port != nullptr ? LinksFind(host->links, port->index, &port->row) : nullptr;
    if (link == nullptr || port->birth != link->birth || strcmp(keys[0].text.c_str(), port->switchName) != 0) {
        return nullptr;
    }
    if (port->stayed != host->change) {
        if (HostSwitchOf(*host, *link) != port->switchIndex) {
            return nullptr;
        }
        port->stayed = host->change;
    }
    return link;
}

KnfStatus PortTypeGet(LinuxHost *host, const Params &keys, char *record) {
    Outcome outcome = HostLinks(host);
    Link *link = outcome == FINE ? LinkOf(host, keys[0].number) : nullptr;
    if (link == nullptr) {
        return outcome == FINE ? STATUS_NOT_FOUND : StatusOf(outcome);
    }
    HostMarkOne(host, link);
    Port *port = HostJoin(host, *link);
    port->birth = link->birth;
    port->switchIndex = HostSwitchOf(*host, *link);
    port->stayed = host->change;
    memset(port->switchName, 0, sizeof port->switchName);
    const char *name = SwitchName(*host, port->switchIndex);
    memcpy(port->switchName, name, std::min(strlen(name), sizeof port->switchName - 1));
    Put(record, port_type::TYPE, static_cast<u64>(port->type));
    PutText(record, port_type::SWITCH_NAME, port->switchName);
    return STATUS_OK;
}

KnfStatus PortStatusGet(LinuxHost *host, const Params &keys, char *record) {
    const Link *link = HostPort(host, keys);
    if (link == nullptr) {
        return STATUS_NOT_FOUND;
    }
    const Port &port = *HostJoin(host, *link);
    if (port.tap != nullptr) {
        PutGuest(host, *link, *port.tap, record);
    } else {
        PutText(record, port_status::CLIENT_NAME, link->name);
        PutMac(record, port_status::MAC, link->mac);
    }
    Put(record, port_status::FLAGS, port.type == PORT_UPLINK ? static_cast<u64>(PORT_FLAG_UPLINK) : 0);
    Put(record, port_status::RX_MODE,
        ((link->flags & IFF_PROMISC) != 0 ? RX_MODE_PROMISCUOUS : 0) |
            ((link->flags & IFF_ALLMULTI) != 0 ? RX_MODE_ALL_MULTICAST : 0));
    return STATUS_OK;
}

KnfStatus SwitchList(LinuxHost *host, const Params & /*keys*/, Params *entries) {
    HostForget(host);
    if (Outcome outcome = HostLinks(host); outcome != FINE) {
        return StatusOf(outcome);
    }
    for (const SwitchEntry &entry : host->switches) {
        host->shown.insert(entry.name);
        entries->push_back(ParamOf(std::string(entry.name)));
    }
    return STATUS_OK;
}

KnfStatus SwitchPorts(LinuxHost *host, const Params &keys, Params *entries) {
    if (Outcome outcome = HostLinks(host); outcome != FINE) {
        return StatusOf(outcome);
    }
    auto entry = std::find_if(host->switches.begin(), host->switches.end(),
                              [&](const SwitchEntry &one) { return keys[0].text == one.name; });
    if (entry == host->switches.end()) {
        return host->shown.count(keys[0].text) != 0 ? STATUS_OK : STATUS_NOT_FOUND;
    }
    host->shown.insert(entry->name);
    auto member = std::lower_bound(host->members.begin(), host->members.end(), entry->index,
                                   [](const Member &one, u32 index) { return one.switchIndex < index; });
    for (; member != host->members.end() && member->switchIndex == entry->index; ++member) {
        entries->push_back(ParamOf(int64_t{member->index}));
    }
    return STATUS_OK;
}
